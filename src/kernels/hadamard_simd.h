#pragma once

#include <emmintrin.h>

#include <cstdint>

// The 4x4 Hadamard transform of 32-bit values in four vectors. Internal to each file, as a function
// that the linker keeps one of may be called on any processor.
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

// Kernels::hadamard_energy by the fastest way to take magnitudes.
template <__m128i (*absolute)(__m128i)>
void hadamard_energy_by(const std::int32_t* values, std::int32_t* energy) {
    __m128i v[4];
    for (int i = 0; i < 4; ++i) {
        v[i] = _mm_loadu_si128(reinterpret_cast<const __m128i*>(values + 4 * i));
    }
    hadamard_4x4(v);  // now vector j holds horizontal frequency j, lane i vertical frequency i
    for (__m128i& row : v) {
        row = _mm_srli_epi32(_mm_add_epi32(absolute(row), _mm_set1_epi32(8)), 4);
    }
    const __m128i others = _mm_add_epi32(_mm_add_epi32(v[1], v[2]), v[3]);
    const __m128i low = _mm_unpacklo_epi32(v[0], others);   // lanes 0 of both, lanes 1 of both
    const __m128i high = _mm_unpackhi_epi32(v[0], others);  // lanes 2, lanes 3
    const __m128i sums =
        _mm_add_epi32(_mm_add_epi32(_mm_srli_si128(low, 8), high), _mm_srli_si128(high, 8));
    _mm_storeu_si128(reinterpret_cast<__m128i*>(energy), _mm_unpacklo_epi64(low, sums));
}

}  // namespace
}  // namespace zolt
