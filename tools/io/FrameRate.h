#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace zolt {

// Frames per second as a fraction of positive 31-bit numbers.
struct FrameRate {
    std::int64_t numerator = 30;
    std::int64_t denominator = 1;

    // "25", "30000/1001", "30000:1001" or "29.97" (taken as the exact decimal, at most six places).
    // Nothing when `text` is none of these, or not above zero.
    static std::optional<FrameRate> parse(std::string_view text);

    double per_second() const;

    // Time in microseconds of frame `index` (0..2^32 - 1), rounded down; it stays in range
    // whatever the rate.
    std::int64_t sample_time(std::int64_t index) const;

    // "25" or "30000/1001".
    std::string to_string() const;
};

}  // namespace zolt
