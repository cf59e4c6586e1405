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

// Rows y and y + 1 of a 4x4 block.
inline __m128i two_rows_of_4(const std::uint8_t* p, std::ptrdiff_t stride) {
    std::int32_t upper, lower;
    __builtin_memcpy(&upper, p, sizeof upper);
    __builtin_memcpy(&lower, p + stride, sizeof lower);
    return _mm_cvtepu8_epi16(_mm_insert_epi32(_mm_cvtsi32_si128(upper), lower, 1));
}

}  // namespace
}  // namespace zolt
