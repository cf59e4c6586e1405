#pragma once

#include "kernels/Kernels.h"

// The tables of x86 processors: each takes a table and replaces the entries that it has faster
// functions for.
namespace zolt {

Kernels with_sse2(const Kernels& base);
Kernels with_avx2(const Kernels& base);
Kernels with_avx512(const Kernels& base);

// Their colour conversions.
Kernels with_sse2_color(const Kernels& base);
Kernels with_avx2_color(const Kernels& base);

}  // namespace zolt
