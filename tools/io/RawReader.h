#pragma once

#include "io/ByteReader.h"
#include "io/FrameSource.h"

namespace zolt {

// Bare pictures, one after the other, in a format that the input itself does not state.
class RawReader : public FrameSource {
public:
    RawReader(ByteReader input, const PictureFormat& format);

    std::string name() const override { return input_.name(); }
    PictureFormat format() const override { return format_; }
    bool states_format() const override { return false; }
    std::optional<FrameRate> frame_rate() const override { return std::nullopt; }
    std::optional<std::int64_t> frames_left() const override;
    bool read(std::vector<unsigned char>& sample) override;
    void interrupt() override { input_.interrupt(); }

private:
    ByteReader input_;
    PictureFormat format_;
    std::int64_t frames_read_ = 0;
};

}  // namespace zolt
