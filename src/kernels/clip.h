#pragma once

#include <cstdint>

namespace zolt {

// Clip1 of clause 5.7 for 8-bit samples.
constexpr std::uint8_t clip_sample(int value) {
    return static_cast<std::uint8_t>(value < 0 ? 0 : value > 255 ? 255 : value);
}

}  // namespace zolt
