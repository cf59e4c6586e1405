#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace zolt_test {

// A source of planar 4:2:0 pictures: width x height luma samples, then Cb and Cr of (width / 2) x
// (height / 2) each.
struct Sequence {
    std::string name;
    int width;
    int height;
    int pictures;
    std::function<void(int n, std::uint8_t* picture)> draw;

    std::size_t picture_size() const {
        return static_cast<std::size_t>(width) * static_cast<std::size_t>(height) +
               2 * (static_cast<std::size_t>(width / 2) * static_cast<std::size_t>(height / 2));
    }
};

// Kinds of generated sequences: "gradient" (moving), "zoom" (into a texture), "noise", "still",
// "cut" (every fifth picture), "flat", "fade" (to black and back), "pan" and "drop" (40 pels a
// picture sideways and down), "checker" (samples and blocks of 0 and 255 that change places). They
// are made with integers only, so that they are the same on every platform.
const std::vector<std::string>& generated_kinds();
Sequence generated(const std::string& kind, int width, int height, int pictures);

// One of the lossless clips in the folder that the environment variable ZOLT_TEST_CLIPS names.
struct Clip {
    const char* name;
    const char* file;
    int width, height, pictures;
};
const std::vector<Clip>& clips();
// `count` pictures of a clip from picture `first` on, decoded by ffmpeg and held in memory. Throws
// std::runtime_error when they cannot be had.
Sequence load_clip(const std::string& folder, const Clip& clip, int first, int count);

}  // namespace zolt_test
