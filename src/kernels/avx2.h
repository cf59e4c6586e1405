#pragma once

#include <immintrin.h>

#include <cstddef>
#include <cstdint>

// Loads, stores and small operations of the files compiled for AVX2. Internal to each file, as a
// function that the linker keeps one of may be called on any processor.
namespace zolt {
namespace {

inline __m128i load_16(const void* p) {
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}
inline __m128i load_8(const void* p) {
    return _mm_loadl_epi64(static_cast<const __m128i*>(p));
}
inline __m256i load_32(const void* p) {
    return _mm256_loadu_si256(static_cast<const __m256i*>(p));
}
inline __m256i load_aligned(const void* p) {
    return _mm256_load_si256(static_cast<const __m256i*>(p));
}
inline void store_16(void* p, __m128i v) {
    _mm_storeu_si128(static_cast<__m128i*>(p), v);
}
inline void store_8(void* p, __m128i v) {
    _mm_storel_epi64(static_cast<__m128i*>(p), v);
}
inline void store_32(void* p, __m256i v) {
    _mm256_storeu_si256(static_cast<__m256i*>(p), v);
}

// Two vectors of 16 bytes, the first in the low lane.
inline __m256i join(__m128i low, __m128i high) {
    return _mm256_inserti128_si256(_mm256_castsi128_si256(low), high, 1);
}
inline __m128i high_lane(__m256i v) {
    return _mm256_extracti128_si256(v, 1);
}
inline __m128i low_lane(__m256i v) {
    return _mm256_castsi256_si128(v);
}

// Puts 16 coefficients kept column by column, positions 0..7 and 8..15, into zig-zag order
// (Kernels.h, zigzag.h): 0 4 1 2 5 8 12 9, then 6 3 7 10 13 14 11 15.
inline void zigzag(__m128i low, __m128i high, __m128i* first, __m128i* second) {
    constexpr char x = -1;  // from the other vector
    *first = _mm_or_si128(
        _mm_shuffle_epi8(low, _mm_setr_epi8(0, 1, 8, 9, 2, 3, 4, 5, 10, 11, x, x, x, x, x, x)),
        _mm_shuffle_epi8(high, _mm_setr_epi8(x, x, x, x, x, x, x, x, x, x, 0, 1, 8, 9, 2, 3)));
    *second = _mm_or_si128(
        _mm_shuffle_epi8(low, _mm_setr_epi8(12, 13, 6, 7, 14, 15, x, x, x, x, x, x, x, x, x, x)),
        _mm_shuffle_epi8(high,
                         _mm_setr_epi8(x, x, x, x, x, x, 4, 5, 10, 11, 12, 13, 6, 7, 14, 15)));
}

}  // namespace
}  // namespace zolt
