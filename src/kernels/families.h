#pragma once

#include "kernels/Kernels.h"

// One file holds the kernels of a family for an instruction set; its last function puts them into a
// table, by name.
namespace zolt {

namespace scalar {
void fill_search(Kernels& table);
void fill_prediction(Kernels& table);
void fill_residual(Kernels& table);
void fill_intra(Kernels& table);
void fill_deblock(Kernels& table);
void fill_color(Kernels& table);
}  // namespace scalar

namespace sse2 {
void fill_search(Kernels& table);
void fill_prediction(Kernels& table);
void fill_residual(Kernels& table);
void fill_intra(Kernels& table);
void fill_deblock(Kernels& table);
void fill_color(Kernels& table);
}  // namespace sse2

namespace avx2 {
void fill_search(Kernels& table);
void fill_prediction(Kernels& table);
void fill_residual(Kernels& table);
void fill_intra(Kernels& table);
void fill_intra4(Kernels& table);
void fill_deblock(Kernels& table);
void fill_color(Kernels& table);
}  // namespace avx2

// Families that gain little by wider vectors are left to the AVX2 table, and so are those kernels
// whose time is that of loading their candidates, 16 samples at a time.
namespace avx512 {
void fill_search(Kernels& table);
void fill_prediction(Kernels& table);
void fill_residual(Kernels& table);
void fill_intra4(Kernels& table);
}  // namespace avx512

}  // namespace zolt
