#pragma once

#include <cstdint>

namespace zolt {

// Number of bits of value up to its highest set bit; 0 for 0.
inline int bit_length(std::uint32_t value) {
#if defined(__GNUC__)
    return value ? 32 - __builtin_clz(value) : 0;
#else
    int length = 0;
    for (; value; value >>= 1) {
        ++length;
    }
    return length;
#endif
}

// Position of the lowest set bit of value, which is not 0.
inline int lowest_bit(std::uint32_t value) {
#if defined(__GNUC__)
    return __builtin_ctz(value);
#else
    return bit_length(value & (0u - value)) - 1;
#endif
}

}  // namespace zolt
