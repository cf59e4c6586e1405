#include "kernels/families.h"
#include "kernels/sse2.h"

namespace zolt {
namespace {

using std::int16_t;
using std::ptrdiff_t;
using std::uint8_t;

// ---- Reference planes ----

// (E - 5F + 20G + 20H - 5I + J + 16) >> 5 in 16-bit lanes.
__m128i half_sample(__m128i outer, __m128i middle, __m128i inner) {
    const __m128i t = _mm_sub_epi16(_mm_slli_epi16(inner, 2), middle);  // 4 * inner - middle
    const __m128i sum = _mm_add_epi16(_mm_add_epi16(outer, t), _mm_slli_epi16(t, 2));
    return _mm_srai_epi16(_mm_add_epi16(sum, _mm_set1_epi16(16)), 5);
}

// 16 half samples between p[0] and p[step].
__m128i half_samples(const uint8_t* p, ptrdiff_t step) {
    const __m128i e = load(p - 2 * step), f = load(p - step), g = load(p);
    const __m128i h = load(p + step), i = load(p + 2 * step), j = load(p + 3 * step);
    const __m128i low = half_sample(_mm_add_epi16(widen_low(e), widen_low(j)),
                                    _mm_add_epi16(widen_low(f), widen_low(i)),
                                    _mm_add_epi16(widen_low(g), widen_low(h)));
    const __m128i high = half_sample(_mm_add_epi16(widen_high(e), widen_high(j)),
                                     _mm_add_epi16(widen_high(f), widen_high(i)),
                                     _mm_add_epi16(widen_high(g), widen_high(h)));
    return _mm_packus_epi16(low, high);
}

// A row of count >= 16 half samples; the last step overlaps the one before it.
void half_row(const uint8_t* src, ptrdiff_t step, uint8_t* dst, int count) {
    for (int x = 0; x < count - 16; x += 16) {
        store(dst + x, half_samples(src + x, step));
    }
    store(dst + count - 16, half_samples(src + count - 16, step));
}

void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    if (count < 16) {
        scalar_kernels().half_vertical_row(src, stride, dst, count);
        return;
    }
    half_row(src, stride, dst, count);
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    if (count < 16) {
        scalar_kernels().half_horizontal_row(src, dst, count);
        return;
    }
    half_row(src, 1, dst, count);
}

// ---- Inter prediction ----

void copy_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    for (int y = 0; y < 16; ++y) {
        store(pred + 16 * y, load(src + y * stride));
    }
}

void average_16x16(uint8_t* pred, const uint8_t* a, ptrdiff_t a_stride, const uint8_t* b,
                   ptrdiff_t b_stride) {
    for (int y = 0; y < 16; ++y) {
        store(pred + 16 * y, _mm_avg_epu8(load(a + y * a_stride), load(b + y * b_stride)));
    }
}

// Unrounded vertical sums of 8 samples.
__m128i vertical_sums(const uint8_t* p, ptrdiff_t stride) {
    const __m128i outer =
        _mm_add_epi16(widen_low(load_8(p - 2 * stride)), widen_low(load_8(p + 3 * stride)));
    const __m128i middle =
        _mm_add_epi16(widen_low(load_8(p - stride)), widen_low(load_8(p + 2 * stride)));
    const __m128i inner = _mm_add_epi16(widen_low(load_8(p)), widen_low(load_8(p + stride)));
    const __m128i t = _mm_sub_epi16(_mm_slli_epi16(inner, 2), middle);
    return _mm_add_epi16(_mm_add_epi16(outer, t), _mm_slli_epi16(t, 2));
}

// (outer - 5 * middle + 20 * inner + 512) >> 10 with 32-bit sums.
__m128i centre_samples(__m128i outer, __m128i middle, __m128i inner) {
    const __m128i ones = _mm_set1_epi16(1);
    const __m128i outer_middle = _mm_set1_epi32(static_cast<int>(0xfffb0001u));  // 1, -5
    const __m128i inner_rounding = _mm_set1_epi32(512 << 16 | 20);
    const __m128i low =
        _mm_add_epi32(_mm_madd_epi16(_mm_unpacklo_epi16(outer, middle), outer_middle),
                      _mm_madd_epi16(_mm_unpacklo_epi16(inner, ones), inner_rounding));
    const __m128i high =
        _mm_add_epi32(_mm_madd_epi16(_mm_unpackhi_epi16(outer, middle), outer_middle),
                      _mm_madd_epi16(_mm_unpackhi_epi16(inner, ones), inner_rounding));
    return _mm_packs_epi32(_mm_srai_epi32(low, 10), _mm_srai_epi32(high, 10));
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    alignas(16) int16_t sums[24];  // columns -2..21, of which the last three are not used
    for (int y = 0; y < 16; ++y) {
        const uint8_t* row = src + y * stride - 2;
        _mm_store_si128(reinterpret_cast<__m128i*>(sums), vertical_sums(row, stride));
        _mm_store_si128(reinterpret_cast<__m128i*>(sums + 8), vertical_sums(row + 8, stride));
        store(sums + 13, vertical_sums(row + 13, stride));
        __m128i half[2];
        for (int x = 0; x < 2; ++x) {
            const int16_t* s = sums + 8 * x;
            half[x] = centre_samples(_mm_add_epi16(load(s), load(s + 5)),
                                     _mm_add_epi16(load(s + 1), load(s + 4)),
                                     _mm_add_epi16(load(s + 2), load(s + 3)));
        }
        store(pred + 16 * y, _mm_packus_epi16(half[0], half[1]));
    }
}

void chroma_component(uint8_t* pred, const uint8_t* src, ptrdiff_t stride, int fx, int fy) {
    const __m128i left = _mm_set1_epi16(static_cast<short>(8 - fx));
    const __m128i right = _mm_set1_epi16(static_cast<short>(fx));
    const __m128i upper_weight = _mm_set1_epi16(static_cast<short>(8 - fy));
    const __m128i lower_weight = _mm_set1_epi16(static_cast<short>(fy));
    // Column 8 is read only through the 8 samples that start at column 1.
    const auto horizontal = [&](const uint8_t* row) {
        return _mm_add_epi16(_mm_mullo_epi16(widen_low(load_8(row)), left),
                             _mm_mullo_epi16(widen_low(load_8(row + 1)), right));
    };
    __m128i upper = horizontal(src);
    for (int y = 0; y < 8; ++y) {
        const __m128i lower = horizontal(src + (y + 1) * stride);
        const __m128i sum = _mm_add_epi16(_mm_mullo_epi16(upper, upper_weight),
                                          _mm_mullo_epi16(lower, lower_weight));
        const __m128i rounded = _mm_srli_epi16(_mm_add_epi16(sum, _mm_set1_epi16(32)), 6);
        store_8(pred + 8 * y, _mm_packus_epi16(rounded, rounded));
        upper = lower;
    }
}

void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    chroma_component(pred, u, stride, fx, fy);
    chroma_component(pred + 64, v, stride, fx, fy);
}

}  // namespace

void sse2::fill_prediction(Kernels& table) {
    table.half_vertical_row = half_vertical_row;
    table.half_horizontal_row = half_horizontal_row;
    table.copy_16x16 = copy_16x16;
    table.average_16x16 = average_16x16;
    table.centre_16x16 = centre_16x16;
    table.chroma_8x8 = chroma_8x8;
}

}  // namespace zolt
