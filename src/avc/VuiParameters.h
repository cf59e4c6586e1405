#pragma once

#include <cstdint>
#include <optional>

namespace zolt {

class BitStreamWriter;

// The part of the VUI parameters that players use, named as in clause E.1.1. A group that is not
// there is not written, and players then assume what they like.
struct VuiParameters {
    static constexpr std::uint32_t kUnspecified = 2;

    // Width to height of a sample; 0 to 0: not known.
    std::uint32_t sar_width = 0;
    std::uint32_t sar_height = 0;

    // How samples stand for colours: Tables E-3, E-4 and E-5; no range is the limited one.
    std::optional<bool> video_full_range_flag;
    std::uint32_t colour_primaries = kUnspecified;
    std::uint32_t transfer_characteristics = kUnspecified;
    std::uint32_t matrix_coefficients = kUnspecified;

    // Seconds of half a frame as a fraction; 0: not known. The flag: frames come at that rate
    // exactly.
    std::uint32_t num_units_in_tick = 0;
    std::uint32_t time_scale = 0;
    bool fixed_frame_rate_flag = false;

    // Frames: those that come later in output order than in decoding order, and those that a
    // decoder has to hold. Without them players wait for reordering that may never come.
    std::uint32_t max_num_reorder_frames = 0;
    std::uint32_t max_dec_frame_buffering = 1;

    // Writes vui_parameters().
    void write(BitStreamWriter& bits) const;
};

}  // namespace zolt
