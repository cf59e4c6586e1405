#pragma once

#include <emmintrin.h>

// The 4x4 Hadamard transform of 32-bit values in four vectors, for the SSE2 kernels.
namespace zolt {
namespace {

// Across the four vectors, frequencies in ascending order (clause 8.5.10).
inline void hadamard_butterfly(__m128i* v) {
    const __m128i a = _mm_add_epi32(v[0], v[1]);
    const __m128i b = _mm_sub_epi32(v[0], v[1]);
    const __m128i c = _mm_add_epi32(v[2], v[3]);
    const __m128i d = _mm_sub_epi32(v[2], v[3]);
    v[0] = _mm_add_epi32(a, c);
    v[1] = _mm_sub_epi32(a, c);
    v[2] = _mm_sub_epi32(b, d);
    v[3] = _mm_add_epi32(b, d);
}

// Exchanges rows and columns.
inline void transpose_32(__m128i* v) {
    const __m128i a = _mm_unpacklo_epi32(v[0], v[1]);
    const __m128i b = _mm_unpackhi_epi32(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi32(v[2], v[3]);
    const __m128i d = _mm_unpackhi_epi32(v[2], v[3]);
    v[0] = _mm_unpacklo_epi64(a, c);
    v[1] = _mm_unpackhi_epi64(a, c);
    v[2] = _mm_unpacklo_epi64(b, d);
    v[3] = _mm_unpackhi_epi64(b, d);
}

// Leaves the transform's columns in the vectors.
inline void hadamard_4x4(__m128i* v) {
    hadamard_butterfly(v);
    transpose_32(v);
    hadamard_butterfly(v);
}

}  // namespace
}  // namespace zolt
