#pragma once

#include <cstdint>
#include <optional>

namespace zolt {

// How the samples of a picture stand for colours: the values of ITU-T H.264 Tables E-3, E-4 and
// E-5.
struct ColourDescription {
    static constexpr int kUnspecified = 2;

    int colour_primaries = kUnspecified;
    int transfer_characteristics = kUnspecified;
    int matrix_coefficients = kUnspecified;
    std::optional<bool> video_full_range;  // nothing where the input does not tell
};

// What a player has to know of pictures beside their size and format.
struct VideoTraits {
    ColourDescription colour;
    // Width to height of a sample; 0 to 0 where the input does not tell.
    std::int32_t sar_width = 0;
    std::int32_t sar_height = 0;
    // Degrees clockwise by which a player turns the pictures: 0, 90, 180 or 270.
    int rotation = 0;
    // The top left part that a player shows; 0 for all of the picture.
    int shown_width = 0;
    int shown_height = 0;
};

}  // namespace zolt
