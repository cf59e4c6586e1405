#pragma once

#include <cstdint>

namespace zolt {

// Coefficient position, column by column, of zig-zag index 0..15 (frame scan, Table 8-2).
constexpr std::uint8_t kZigzag[16] = {0, 4, 1, 2, 5, 8, 12, 9, 6, 3, 7, 10, 13, 14, 11, 15};

}  // namespace zolt
