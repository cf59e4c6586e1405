#pragma once

#include <emmintrin.h>

#include <cstdint>
#include <cstring>

// Loads, stores and small operations of the SSE2 kernels.
namespace zolt {
namespace {

inline __m128i load(const void* p) {
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}
inline __m128i load_aligned(const void* p) {
    return _mm_load_si128(static_cast<const __m128i*>(p));
}
inline __m128i load_8(const void* p) {
    return _mm_loadl_epi64(static_cast<const __m128i*>(p));
}
inline __m128i load_4(const void* p) {
    std::int32_t value;
    std::memcpy(&value, p, sizeof value);
    return _mm_cvtsi32_si128(value);
}
inline void store(void* p, __m128i v) {
    _mm_storeu_si128(static_cast<__m128i*>(p), v);
}
inline void store_8(void* p, __m128i v) {
    _mm_storel_epi64(static_cast<__m128i*>(p), v);
}
inline void store_4(void* p, __m128i v) {
    const std::int32_t value = _mm_cvtsi128_si32(v);
    std::memcpy(p, &value, sizeof value);
}

inline __m128i widen_low(__m128i samples) {
    return _mm_unpacklo_epi8(samples, _mm_setzero_si128());
}
inline __m128i widen_high(__m128i samples) {
    return _mm_unpackhi_epi8(samples, _mm_setzero_si128());
}
inline __m128i absolute_16(__m128i v) {
    return _mm_max_epi16(v, _mm_sub_epi16(_mm_setzero_si128(), v));
}
inline __m128i absolute_32(__m128i v) {
    const __m128i sign = _mm_srai_epi32(v, 31);
    return _mm_sub_epi32(_mm_xor_si128(v, sign), sign);
}

}  // namespace
}  // namespace zolt
