#pragma once

#include "kernels/Kernels.h"
#include "kernels/avx2.h"

// What code_chroma of the files compiled for AVX2 and for AVX-512 shares (avx2.h). The chroma DC
// coefficients of both components stand in one vector of 32-bit values: those of the four blocks of
// Cb in the low lane, of Cr in the high one.
namespace zolt {
namespace {

// The 2x2 transform of clause 8.5.11.1.
inline __m256i hadamard_2x2(__m256i c) {
    const __m256i last_two = _mm256_setr_epi32(1, 1, -1, -1, 1, 1, -1, -1);
    const __m256i odd = _mm256_setr_epi32(1, -1, 1, -1, 1, -1, 1, -1);
    c = _mm256_add_epi32(_mm256_shuffle_epi32(c, _MM_SHUFFLE(1, 0, 3, 2)),
                         _mm256_sign_epi32(c, last_two));
    return _mm256_add_epi32(_mm256_shuffle_epi32(c, _MM_SHUFFLE(2, 3, 0, 1)),
                            _mm256_sign_epi32(c, odd));
}

// Writes the eight levels of the coefficients to levels and replaces the coefficients by what
// clause 8.5.11.2 makes of them. Returns the mask of the levels that are not 0.
inline std::uint32_t code_chroma_dc(__m256i* dc, const Quantizer& quantizer, std::int16_t* levels) {
    const __m256i f = hadamard_2x2(*dc);
    const __m256i magnitude = _mm256_abs_epi32(f);
    const __m256i beyond = _mm256_cmpgt_epi32(magnitude, _mm256_set1_epi32(quantizer.dc_dead_zone));
    if (_mm256_testz_si256(beyond, beyond)) {
        store_16(levels, _mm_setzero_si128());
        *dc = _mm256_setzero_si256();
        return 0;
    }
    // 16-bit factors of values that have 16 bits, the sign included: products of pairs with 0.
    const __m256i products = _mm256_madd_epi16(magnitude, _mm256_set1_epi32(quantizer.forward[0]));
    const __m256i rounded =
        _mm256_srl_epi32(_mm256_add_epi32(products, _mm256_set1_epi32(2 * quantizer.rounding)),
                         _mm_cvtsi32_si128(quantizer.shift + 1));
    const __m256i level =
        _mm256_sign_epi32(_mm256_min_epi32(rounded, _mm256_set1_epi32(kMaxLevel)), f);
    const __m256i scaled = _mm256_madd_epi16(level, _mm256_set1_epi32(quantizer.dequant[0]));
    *dc = _mm256_srai_epi32(hadamard_2x2(scaled), 1);

    const __m128i words = _mm_packs_epi32(low_lane(level), high_lane(level));
    store_16(levels, words);
    const __m128i zeros = _mm_cmpeq_epi16(words, _mm_setzero_si128());
    return ~static_cast<std::uint32_t>(_mm_movemask_epi8(_mm_packs_epi16(zeros, zeros))) & 0xff;
}

// Both components' prediction as their reconstruction.
inline void copy_prediction(const Chroma& chroma) {
    for (int c = 0; c < 2; ++c) {
        for (int y = 0; y < 8; ++y) {
            store_8(chroma.dst[c] + y * chroma.dst_stride, load_8(chroma.pred + 64 * c + 8 * y));
        }
    }
}

// Rows y and y + 4 of a component's reconstruction.
inline void store_two_rows(const Chroma& chroma, int component, int y, __m128i samples) {
    std::uint8_t* const row = chroma.dst[component] + y * chroma.dst_stride;
    store_8(row, samples);
    store_8(row + 4 * chroma.dst_stride, _mm_unpackhi_epi64(samples, samples));
}

}  // namespace
}  // namespace zolt
