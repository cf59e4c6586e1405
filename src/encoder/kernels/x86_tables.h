#pragma once

#include "encoder/kernels/Kernels.h"

// The tables of x86 processors: each the one given with the entries replaced that are faster.
namespace zolt {

Kernels with_sse2(const Kernels& base);
Kernels with_avx2(const Kernels& base);
Kernels with_avx512(const Kernels& base);

// Their colour conversions.
Kernels with_sse2_color(const Kernels& base);
Kernels with_avx2_color(const Kernels& base);

}  // namespace zolt
