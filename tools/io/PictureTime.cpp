#include "io/PictureTime.h"

#include <algorithm>
#include <limits>

namespace zolt {

std::int64_t microseconds(std::int64_t ticks, const TimeBase& base) {
    constexpr std::int64_t kPerSecond = 1000000;
    constexpr std::int64_t kMaxSeconds = std::numeric_limits<std::int64_t>::max() / kPerSecond - 1;
    // ticks * numerator / denominator seconds, split so that no product leaves 64 bits: only an
    // absurdly slow clock has times that do.
    const std::int64_t limit = std::numeric_limits<std::int64_t>::max() / base.numerator;
    const std::int64_t scaled = std::clamp(ticks, -limit, limit) * base.numerator;
    std::int64_t seconds = scaled / base.denominator;
    std::int64_t rest = scaled % base.denominator;
    if (rest < 0) {
        rest += base.denominator;
        --seconds;
    }
    return std::clamp(seconds, -kMaxSeconds, kMaxSeconds) * kPerSecond +
           rest * kPerSecond / base.denominator;
}

}  // namespace zolt
