#pragma once

#include <cstdint>

namespace zolt {

// What an element has coded since it was started.
struct CodingTally {
    std::uint64_t pictures = 0;
    std::uint64_t key_frames = 0;
    std::uint64_t bits = 0;         // of the pictures' NAL units
    std::int64_t microseconds = 0;  // for which the pictures are shown

    double kilobits_per_second() const {
        constexpr double kMicrosecondsPerMillisecond = 1000;
        return microseconds > 0 ? static_cast<double>(bits) * kMicrosecondsPerMillisecond /
                                      static_cast<double>(microseconds)
                                : 0;
    }
};

}  // namespace zolt
