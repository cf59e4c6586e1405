#pragma once

#include <cstdint>

#include "kernels/Kernels.h"

// Constant tables that more than one unit of the engine reads.
namespace zolt {

// Column and row, in 4x4 blocks, of luma block k in decoding order (Figure 6-10); the first four
// entries also place the 4x4 blocks of a chroma component.
constexpr std::uint8_t luma_scan_i[16] = {0, 1, 0, 1, 2, 3, 2, 3, 0, 1, 0, 1, 2, 3, 2, 3};
constexpr std::uint8_t luma_scan_j[16] = {0, 0, 1, 1, 0, 0, 1, 1, 2, 2, 3, 3, 2, 2, 3, 3};

// Rate weight by max(QP - 12, 0).
constexpr std::uint8_t QP2QUANT[40] = {1,  1,  1,  1,  2,  2,  2,  2,  3,  3,  3,  4,  4,  4,
                                       5,  6,  6,  7,  8,  9,  10, 11, 13, 14, 16, 18, 20, 23,
                                       25, 29, 32, 36, 40, 45, 51, 57, 64, 72, 81, 91};

// Chroma QP by luma QP (Table 8-15, chroma_qp_index_offset 0).
constexpr std::uint8_t QP_SCALE_CR[52] = {0,  1,  2,  3,  4,  5,  6,  7,  8,  9,  10, 11, 12,
                                          13, 14, 15, 16, 17, 18, 19, 20, 21, 22, 23, 24, 25,
                                          26, 27, 28, 29, 29, 30, 31, 32, 32, 33, 34, 34, 35,
                                          35, 36, 36, 37, 37, 37, 38, 38, 38, 39, 39, 39, 39};

// The quantiser of a QP, with the rounding of intra or of inter macroblocks.
const Quantizer& intra_quantizer(int qp);
const Quantizer& inter_quantizer(int qp);

}  // namespace zolt
