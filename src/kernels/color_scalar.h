#pragma once

#include "kernels/Kernels.h"

// The colour conversions of the scalar table, for the tables that leave narrow rows to them too.
namespace zolt {

void scalar_rgb32_rows_to_iyuv(const std::uint8_t* upper, const std::uint8_t* lower, RgbOffsets at,
                               IyuvRows to, int width);
void scalar_rgb24_rows_to_iyuv(const std::uint8_t* upper, const std::uint8_t* lower, RgbOffsets at,
                               IyuvRows to, int width);
void scalar_ayuv_rows_to_iyuv(const std::uint8_t* upper, const std::uint8_t* lower, IyuvRows to,
                              int width);
void scalar_yuy2_rows_to_iyuv(const std::uint8_t* upper, const std::uint8_t* lower, IyuvRows to,
                              int width);

}  // namespace zolt
