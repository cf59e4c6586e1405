#pragma once

#include <cstdint>

namespace zolt {

// A level of Table A-1.
struct AvcLevel {
    std::uint32_t level_idc;
    bool is_1b;  // which shares the level_idc of level 1.1 in Baseline, Main and Extended profile

    // What a stream asks of a decoder.
    struct Needs {
        std::uint32_t width_in_mbs;
        std::uint32_t height_in_mbs;
        std::uint32_t dec_frame_buffering;  // frames
        double frames_per_second;
        std::int64_t bit_rate_kbs;  // 0: not known, no level is refused for it
    };

    // The lowest level whose limits for Baseline, Main and Extended profile (clause A.3.1) hold the
    // needs; level 6.2 where none does.
    static AvcLevel lowest(const Needs& needs);
};

}  // namespace zolt
