#pragma once

#include <cstdint>
#include <cstring>

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

// Eight bytes, the most significant first.
inline void store_big_endian(std::uint8_t* bytes, std::uint64_t value) {
#if defined(__GNUC__) && __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
    value = __builtin_bswap64(value);
    std::memcpy(bytes, &value, sizeof value);
#else
    for (int i = 0; i < 8; ++i) {
        bytes[i] = static_cast<std::uint8_t>(value >> (56 - 8 * i));
    }
#endif
}
inline std::uint64_t load_big_endian(const std::uint8_t* bytes) {
    std::uint64_t value = 0;
#if defined(__GNUC__) && __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
    std::memcpy(&value, bytes, sizeof value);
    value = __builtin_bswap64(value);
#else
    for (int i = 0; i < 8; ++i) {
        value = value << 8 | bytes[i];
    }
#endif
    return value;
}

}  // namespace zolt
