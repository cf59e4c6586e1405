#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdlib>

#include "kernels/Kernels.h"

// The chroma DC coefficients of one component, for tables without vectors of them.
namespace zolt {

// The 2x2 transform of clause 8.5.11.1.
inline void hadamard_2x2(const int* c, int* f) {
    f[0] = c[0] + c[1] + c[2] + c[3];
    f[1] = c[0] - c[1] + c[2] - c[3];
    f[2] = c[0] + c[1] - c[2] - c[3];
    f[3] = c[0] - c[1] - c[2] + c[3];
}

// Level of a DC value: the rounding offset is doubled and the shift one larger than for AC.
inline int quantize_dc(int value, const Quantizer& quantizer) {
    const int magnitude = std::min(
        (std::abs(value) * quantizer.forward[0] + 2 * quantizer.rounding) >> (quantizer.shift + 1),
        kMaxLevel);
    return value < 0 ? -magnitude : magnitude;
}

// Codes the constant coefficients dc of a component's four blocks: writes their levels, and what
// clause 8.5.11.2 makes of them to the constant coefficients of the blocks in coefs. Returns the
// mask of the levels that are not 0.
inline std::uint32_t code_chroma_dc(const std::int16_t* dc, const Quantizer& quantizer,
                                    std::int16_t* levels, std::int16_t* coefs) {
    int c[4] = {dc[0], dc[1], dc[2], dc[3]};
    int f[4];
    hadamard_2x2(c, f);
    std::uint32_t nonzero = 0;
    for (int n = 0; n < 4; ++n) {
        const int level = quantize_dc(f[n], quantizer);
        levels[n] = static_cast<std::int16_t>(level);
        nonzero |= (level != 0 ? 1u : 0u) << n;
        c[n] = level * quantizer.dequant[0];
    }
    hadamard_2x2(c, f);
    for (int b = 0; b < 4; ++b) {
        coefs[16 * b] = static_cast<std::int16_t>(f[b] >> 1);
    }
    return nonzero;
}

}  // namespace zolt
