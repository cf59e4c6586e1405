#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "io/FrameSource.h"

namespace zolt {

// The built-in moving test picture: a textured background that drifts by fractions of a sample and
// a disc with a texture of its own that bounces between the borders. Made with integer arithmetic
// from nothing but size and frame number, so it is the same everywhere.
class SyntheticSource : public FrameSource {
public:
    static constexpr std::string_view kName = "synthetic";

    struct Settings {
        int width = 352;
        int height = 288;
        std::optional<FrameRate> frame_rate;  // nothing unless the input's name states one
        std::int64_t frames = 300;
    };

    // Whether `input` names this source rather than a file.
    static bool recognises(std::string_view input);

    // Reads "synthetic[:WxH[@FPS[:FRAMES]]]". Throws a UsageError when it is anything else.
    static Settings parse(std::string_view input);

    explicit SyntheticSource(const Settings& settings);

    std::string name() const override { return std::string(kName); }
    PictureFormat format() const override;
    std::optional<FrameRate> frame_rate() const override { return settings_.frame_rate; }
    std::optional<std::int64_t> frames_left() const override { return settings_.frames - next_; }
    bool read(std::vector<unsigned char>& sample) override;
    void interrupt() override {}

private:
    struct Disc {
        std::int64_t x, y, radius;
        bool contains(std::int64_t at_x, std::int64_t at_y) const {
            return (at_x - x) * (at_x - x) + (at_y - y) * (at_y - y) < radius * radius;
        }
    };

    Disc disc_at(std::int64_t frame) const;
    void draw_luma(unsigned char* plane, const Disc& disc) const;
    void draw_chroma(unsigned char* plane, const Disc& disc, int direction) const;

    Settings settings_;
    std::vector<unsigned char> texture_;  // kTextureSide x kTextureSide, repeats without a seam
    std::int64_t next_ = 0;               // number of the next frame
};

}  // namespace zolt
