// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file and
// of avx512.h, so that no inline function that other files share is emitted with instructions that
// an older processor lacks.
#include "kernels/avx512.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::ptrdiff_t;
using std::uint8_t;

// ---- Reference planes ----

// Half samples from pairs of neighbours: E and F, G and H, I and J, interleaved.
__m512i half_samples(__m512i ef, __m512i gh, __m512i ij) {
    const __m512i first = _mm512_set1_epi16(static_cast<short>(0xfb01));  // 1, -5
    const __m512i middle = _mm512_set1_epi16(0x1414);                     // 20, 20
    const __m512i last = _mm512_set1_epi16(0x01fb);                       // -5, 1
    const __m512i sum = _mm512_add_epi16(
        _mm512_add_epi16(_mm512_maddubs_epi16(ef, first), _mm512_maddubs_epi16(ij, last)),
        _mm512_maddubs_epi16(gh, middle));
    return _mm512_mulhrs_epi16(sum, _mm512_set1_epi16(1 << 10));  // (sum + 16) >> 5
}

// Writes a row of count samples, 64 at a time: half(x, mask) makes those from x on, of which the
// mask says which ones the row has.
template <typename Half>
[[gnu::always_inline]] inline void make_row(uint8_t* dst, int count, Half half) {
    int x = 0;
    for (; x <= count - 64; x += 64) {
        store_64(dst + x, half(x, ~__mmask64{0}));
    }
    if (x < count) {
        const __mmask64 rest = (__mmask64{1} << (count - x)) - 1;
        _mm512_mask_storeu_epi8(dst + x, rest, half(x, rest));
    }
}

void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    make_row(dst, count, [=](int x, __mmask64 mask) {
        const auto row = [=](int y) { return _mm512_maskz_loadu_epi8(mask, src + x + y * stride); };
        const __m512i e = row(-2), f = row(-1), g = row(0), h = row(1), i = row(2), j = row(3);
        return _mm512_packus_epi16(
            half_samples(_mm512_unpacklo_epi8(e, f), _mm512_unpacklo_epi8(g, h),
                         _mm512_unpacklo_epi8(i, j)),
            half_samples(_mm512_unpackhi_epi8(e, f), _mm512_unpackhi_epi8(g, h),
                         _mm512_unpackhi_epi8(i, j)));
    });
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    const __m512i interleave =
        _mm512_broadcast_i32x4(_mm_setr_epi8(0, 8, 1, 9, 2, 10, 3, 11, 4, 12, 5, 13, 6, 14, 7, 15));
    make_row(dst, count, [=](int x, __mmask64 mask) {
        // Samples in even places, then in odd ones: their neighbours stand in pairs as they are. If
        // the last sample is an even one, its pairs end one sample beyond the mask.
        const __mmask64 even_mask = mask | mask << 1;
        const auto even_at = [=](int n) { return _mm512_maskz_loadu_epi8(even_mask, src + x + n); };
        const auto odd_at = [=](int n) { return _mm512_maskz_loadu_epi8(mask, src + x + n); };
        const __m512i even = half_samples(even_at(-2), even_at(0), even_at(2));
        const __m512i odd = half_samples(odd_at(-1), odd_at(1), odd_at(3));
        return _mm512_shuffle_epi8(_mm512_packus_epi16(even, odd), interleave);
    });
}

// ---- Inter prediction ----

void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    const __m512i columns = _mm512_set1_epi16(static_cast<short>((8 - fx) | fx << 8));
    const __m512i upper_weight = _mm512_set1_epi16(static_cast<short>(8 - fy));
    const __m512i lower_weight = _mm512_set1_epi16(static_cast<short>(fy));
    const __m512i pairs =
        _mm512_broadcast_i32x4(_mm_setr_epi8(0, 1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8));
    // Rows y of Cb and Cr, then rows y + 4.
    __m512i row[5];
    for (int y = 0; y < 5; ++y) {
        const ptrdiff_t at = y * stride, later = (y + 4) * stride;
        const __m512i samples = join(join(load_16(u + at), load_16(v + at)),
                                     join(load_16(u + later), load_16(v + later)));
        row[y] = _mm512_maddubs_epi16(_mm512_shuffle_epi8(samples, pairs), columns);
    }
    const auto between = [=](__m512i upper, __m512i lower) {
        const __m512i sum = _mm512_add_epi16(_mm512_mullo_epi16(upper, upper_weight),
                                             _mm512_mullo_epi16(lower, lower_weight));
        return _mm512_srli_epi16(_mm512_add_epi16(sum, _mm512_set1_epi16(32)), 6);
    };
    // Rows 0 and 1 of Cb, of Cr, rows 4 and 5 of either; then the rows two below.
    const __m512i first = _mm512_packus_epi16(between(row[0], row[1]), between(row[1], row[2]));
    const __m512i second = _mm512_packus_epi16(between(row[2], row[3]), between(row[3], row[4]));
    store_64(pred,
             _mm512_permutex2var_epi64(first, _mm512_setr_epi64(0, 1, 8, 9, 4, 5, 12, 13), second));
    store_64(pred + 64, _mm512_permutex2var_epi64(
                            first, _mm512_setr_epi64(2, 3, 10, 11, 6, 7, 14, 15), second));
}

}  // namespace

void avx512::fill_prediction(Kernels& table) {
    table.half_vertical_row = half_vertical_row;
    table.half_horizontal_row = half_horizontal_row;
    table.chroma_8x8 = chroma_8x8;
}

}  // namespace zolt
