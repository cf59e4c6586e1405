#pragma once

#include "kernels/avx2.h"

// The same of the files compiled for AVX-512.
namespace zolt {
namespace {

inline __m512i load_64(const void* p) {
    return _mm512_loadu_si512(p);
}
inline void store_64(void* p, __m512i v) {
    _mm512_storeu_si512(p, v);
}

inline __m512i join(__m256i low, __m256i high) {
    return _mm512_inserti64x4(_mm512_castsi256_si512(low), high, 1);
}
inline __m256i low_half(__m512i v) {
    return _mm512_castsi512_si256(v);
}
inline __m256i high_half(__m512i v) {
    return _mm512_extracti64x4_epi64(v, 1);
}

// Clipped to samples.
inline __m256i to_samples(__m512i v) {
    return _mm512_cvtusepi16_epi8(_mm512_max_epi16(v, _mm512_setzero_si512()));
}

}  // namespace
}  // namespace zolt
