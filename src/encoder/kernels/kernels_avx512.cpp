// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file, so
// that no inline function that other files share is emitted with instructions that an older
// processor lacks. Entries that gain little by wider vectors are left to the AVX2 table, among them
// those whose time is that of loading their candidates, 16 samples at a time.
#include <immintrin.h>

#include "encoder/kernels/x86_tables.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

__m128i load_16(const void* p) {
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}
__m512i load_64(const void* p) {
    return _mm512_loadu_si512(p);
}
void store_16(void* p, __m128i v) {
    _mm_storeu_si128(static_cast<__m128i*>(p), v);
}
void store_64(void* p, __m512i v) {
    _mm512_storeu_si512(p, v);
}

__m256i join(__m128i low, __m128i high) {
    return _mm256_inserti128_si256(_mm256_castsi128_si256(low), high, 1);
}
__m512i join(__m256i low, __m256i high) {
    return _mm512_inserti64x4(_mm512_castsi256_si512(low), high, 1);
}
__m256i low_half(__m512i v) {
    return _mm512_castsi512_si256(v);
}
__m256i high_half(__m512i v) {
    return _mm512_extracti64x4_epi64(v, 1);
}

// Clipped to samples.
__m256i to_samples(__m512i v) {
    return _mm512_cvtusepi16_epi8(_mm512_max_epi16(v, _mm512_setzero_si512()));
}

// ---- Distortion of the motion search ----

constexpr __mmask64 kOddColumns = 0xaaaaaaaaaaaaaaaa;

// 16 samples of four rows of a block: the one at row, the one `step` below, and those 8 below
// either.
__m512i four_rows(const uint8_t* row, ptrdiff_t stride, int step) {
    const uint8_t* later = row + step * stride;
    return join(join(load_16(row), load_16(row + 8 * stride)),
                join(load_16(later), load_16(later + 8 * stride)));
}

// four_rows_of(n): rows n, n + 8, n + 1 and n + 9 of what the block is compared with.
template <typename FourRowsOf>
[[gnu::always_inline]] inline void add_phases(const uint8_t* block, FourRowsOf four_rows_of,
                                              int* sums) {
    // Even rows in the low half, odd rows in the high one: all columns, and phases 0 and 2.
    __m512i all = _mm512_setzero_si512(), even_columns = _mm512_setzero_si512();
    for (int n = 0; n < 8; n += 2) {
        const __m512i a = load_64(block + 32 * n);
        const __m512i b = four_rows_of(n);
        all = _mm512_add_epi32(all, _mm512_sad_epu8(a, b));
        even_columns = _mm512_add_epi32(
            even_columns, _mm512_sad_epu8(a, _mm512_mask_blend_epi8(kOddColumns, b, a)));
    }
    const __m512i parts = _mm512_or_si512(all, _mm512_slli_epi64(even_columns, 32));
    const __m512i lanes = _mm512_add_epi32(parts, _mm512_bsrli_epi128(parts, 8));
    const __m256i rows =
        _mm256_add_epi32(low_half(_mm512_shuffle_i64x2(lanes, lanes, _MM_SHUFFLE(0, 0, 2, 0))),
                         low_half(_mm512_shuffle_i64x2(lanes, lanes, _MM_SHUFFLE(0, 0, 3, 1))));
    const int even = _mm256_extract_epi32(rows, 0), phase_0 = _mm256_extract_epi32(rows, 1);
    const int odd = _mm256_extract_epi32(rows, 4), phase_2 = _mm256_extract_epi32(rows, 5);
    sums[0] = phase_0;
    sums[1] = phase_0 + odd - phase_2;
    sums[2] = phase_0 + odd;
    sums[3] = even + odd;
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(
        block, [=](int n) { return four_rows(ref + n * stride, stride, 1); }, sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(
        block,
        [=](int n) {
            return _mm512_avg_epu8(four_rows(a + n * stride, stride, 1),
                                   four_rows(b + n * stride, stride, 1));
        },
        sums);
}

// Phases 0 and 1 of a block, as the second part of an arranged block has them: checkerboard rows 0,
// 4, 1, 5, and 2, 6, 3, 7.
struct Checkerboard {
    __m512i first, second;
};

Checkerboard arranged_checkerboard(const uint8_t* block) {
    return {load_64(block + 256), load_64(block + 320)};
}

Checkerboard checkerboard(const uint8_t* ref, ptrdiff_t stride) {
    const auto half = [=](const uint8_t* row) {
        return _mm512_mask_blend_epi8(kOddColumns, four_rows(row, stride, 2),
                                      four_rows(row + stride, stride, 2));
    };
    return {half(ref), half(ref + 4 * stride)};
}

__m512i sad_of_average(const Checkerboard& block, const Checkerboard& a, const Checkerboard& b) {
    return _mm512_add_epi32(_mm512_sad_epu8(block.first, _mm512_avg_epu8(a.first, b.first)),
                            _mm512_sad_epu8(block.second, _mm512_avg_epu8(a.second, b.second)));
}

// Adds up four vectors of 64-bit sums that are each below 2^13: sum n in 16-bit lane n of either
// half of a lane.
__m512i pack_sums(const __m512i* sums) {
    return _mm512_or_si512(
        _mm512_or_si512(sums[0], _mm512_slli_epi64(sums[1], 16)),
        _mm512_or_si512(_mm512_slli_epi64(sums[2], 32), _mm512_slli_epi64(sums[3], 48)));
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    const Checkerboard current = arranged_checkerboard(block);
    const Checkerboard c = checkerboard(centre, stride);
    Checkerboard sides[4];
    __m512i sums[8];
    for (int i = 0; i < 4; ++i) {
        sides[i] = checkerboard(refs[i], stride);
        sums[i] = sad_of_average(current, c, sides[i]);
    }
    for (int i = 0; i < 4; ++i) {
        sums[4 + i] = sad_of_average(current, sides[kCrossPairs[i][0]], sides[kCrossPairs[i][1]]);
    }
    const __m512i a = pack_sums(sums), b = pack_sums(sums + 4);
    const __m512i lanes =
        _mm512_add_epi16(_mm512_unpacklo_epi64(a, b), _mm512_unpackhi_epi64(a, b));
    const __m256i pairs = _mm256_add_epi16(low_half(lanes), high_half(lanes));
    const __m256i totals = _mm256_cvtepu16_epi32(
        _mm_add_epi16(_mm256_castsi256_si128(pairs), _mm256_extracti128_si256(pairs, 1)));
    return _mm256_cmpgt_epi32_mask(_mm256_loadu_si256(reinterpret_cast<const __m256i*>(limits)),
                                   totals);
}

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

// Unrounded vertical sums from six rows, as 16-bit lanes.
__m512i vertical_sums(const __m512i* r) {
    const __m512i t = _mm512_sub_epi16(_mm512_slli_epi16(_mm512_add_epi16(r[2], r[3]), 2),
                                       _mm512_add_epi16(r[1], r[4]));
    return _mm512_add_epi16(_mm512_add_epi16(_mm512_add_epi16(r[0], r[5]), t),
                            _mm512_slli_epi16(t, 2));
}

// (outer - 5 * middle + 20 * inner + 512) >> 10 with 32-bit sums.
__m512i centre_samples(__m512i outer, __m512i middle, __m512i inner) {
    const __m512i ones = _mm512_set1_epi16(1);
    const __m512i outer_middle = _mm512_set1_epi32(static_cast<int>(0xfffb0001u));  // 1, -5
    const __m512i inner_rounding = _mm512_set1_epi32(512 << 16 | 20);
    const __m512i low =
        _mm512_add_epi32(_mm512_madd_epi16(_mm512_unpacklo_epi16(outer, middle), outer_middle),
                         _mm512_madd_epi16(_mm512_unpacklo_epi16(inner, ones), inner_rounding));
    const __m512i high =
        _mm512_add_epi32(_mm512_madd_epi16(_mm512_unpackhi_epi16(outer, middle), outer_middle),
                         _mm512_madd_epi16(_mm512_unpackhi_epi16(inner, ones), inner_rounding));
    return _mm512_packs_epi32(_mm512_srai_epi32(low, 10), _mm512_srai_epi32(high, 10));
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    // Rows y and y + 8 in the halves: columns -2..13, and columns 6..21, from six rows that move
    // down.
    __m512i left[6], right[6];
    const auto load_row = [&](int slot, int y) {
        const uint8_t* row = src + y * stride;
        const uint8_t* later = row + 8 * stride;
        left[slot] = _mm512_cvtepu8_epi16(join(load_16(row - 2), load_16(later - 2)));
        right[slot] = _mm512_cvtepu8_epi16(join(load_16(row + 6), load_16(later + 6)));
    };
    for (int i = 0; i < 5; ++i) {
        load_row(i, i - 2);
    }
    for (int y = 0; y < 8; ++y) {
        load_row(5, y + 3);
        const __m512i a = vertical_sums(left);
        const __m512i b = vertical_sums(right);
        // Sums that start n columns later.
        const __m512i a1 = _mm512_alignr_epi8(b, a, 2), a2 = _mm512_alignr_epi8(b, a, 4);
        const __m512i a3 = _mm512_alignr_epi8(b, a, 6), a4 = _mm512_alignr_epi8(b, a, 8);
        const __m512i a5 = _mm512_alignr_epi8(b, a, 10);
        const __m512i samples = centre_samples(_mm512_add_epi16(a, a5), _mm512_add_epi16(a1, a4),
                                               _mm512_add_epi16(a2, a3));
        const __m256i rows = to_samples(samples);
        store_16(pred + 16 * y, _mm256_castsi256_si128(rows));
        store_16(pred + 16 * y + 128, _mm256_extracti128_si256(rows, 1));
        for (int i = 0; i < 5; ++i) {
            left[i] = left[i + 1];
            right[i] = right[i + 1];
        }
    }
}

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

Kernels with_avx512(const Kernels& base) {
    Kernels k = base;
    k.name = "avx512";
    k.phase_sads = phase_sads;
    k.phase_sads_average = phase_sads_average;
    k.first_phases_below_cross = first_phases_below_cross;
    k.half_vertical_row = half_vertical_row;
    k.half_horizontal_row = half_horizontal_row;
    k.centre_16x16 = centre_16x16;
    k.chroma_8x8 = chroma_8x8;
    return k;
}

}  // namespace zolt
