#pragma once

#include <cstdint>

namespace zolt {

// The seconds of one tick of a clock, as a fraction of positive numbers.
struct TimeBase {
    std::int64_t numerator = 1;
    std::int64_t denominator = 1000000;
};

// When a picture is shown and for how long, in ticks; a duration of 0 is not known.
struct PictureTime {
    std::int64_t start = 0;
    std::int64_t duration = 0;
};

// Microseconds of a number of ticks, rounded down; it stays in range whatever the clock.
std::int64_t microseconds(std::int64_t ticks, const TimeBase& base);

}  // namespace zolt
