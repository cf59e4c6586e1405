// Compiled for AVX2: nothing but intrinsics and functions of this file, so that no inline function
// that other files share is emitted with instructions that an older processor lacks.
#include <immintrin.h>

#include "kernels/deblock_simd.h"
#include "kernels/x86_tables.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::int8_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

__m128i load_16(const void* p) {
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}
__m128i load_8(const void* p) {
    return _mm_loadl_epi64(static_cast<const __m128i*>(p));
}
__m256i load_32(const void* p) {
    return _mm256_loadu_si256(static_cast<const __m256i*>(p));
}
__m256i load_aligned(const void* p) {
    return _mm256_load_si256(static_cast<const __m256i*>(p));
}
void store_16(void* p, __m128i v) {
    _mm_storeu_si128(static_cast<__m128i*>(p), v);
}
void store_8(void* p, __m128i v) {
    _mm_storel_epi64(static_cast<__m128i*>(p), v);
}
void store_32(void* p, __m256i v) {
    _mm256_storeu_si256(static_cast<__m256i*>(p), v);
}

// Two vectors of 16 bytes, the first in the low lane.
__m256i join(__m128i low, __m128i high) {
    return _mm256_inserti128_si256(_mm256_castsi128_si256(low), high, 1);
}
__m128i high_lane(__m256i v) {
    return _mm256_extracti128_si256(v, 1);
}
__m128i low_lane(__m256i v) {
    return _mm256_castsi256_si128(v);
}

// ---- Distortion of the motion search ----

__m256i odd_columns() {
    return _mm256_set1_epi16(static_cast<short>(0xff00));
}

// 16 samples of two rows of a block that are eight apart.
__m256i two_rows(const uint8_t* row, ptrdiff_t stride) {
    return join(load_16(row), load_16(row + 8 * stride));
}

// Checkerboard rows n and n + 4 from block rows 2n, 2n + 8 and 2n + 1, 2n + 9; row: row 2n.
__m256i checkerboard(const uint8_t* row, ptrdiff_t stride) {
    return _mm256_blendv_epi8(two_rows(row, stride), two_rows(row + stride, stride), odd_columns());
}
__m256i arranged_checkerboard(const uint8_t* block, int n) {
    return load_aligned(block + 256 + 32 * n);
}

void arrange_block(const uint8_t* src, ptrdiff_t stride, uint8_t* block) {
    for (int n = 0; n < 4; ++n, src += 2 * stride) {
        const __m256i even = two_rows(src, stride);
        const __m256i odd = two_rows(src + stride, stride);
        store_32(block + 64 * n, even);
        store_32(block + 64 * n + 32, odd);
        store_32(block + 256 + 32 * n, _mm256_blendv_epi8(even, odd, odd_columns()));
    }
}

// Packs four vectors of 64-bit sums: sum n in 16-bit lane n of every 64 bits. They are below 2^14,
// so that the four of a vector, added later, stay below 2^16.
__m256i pack_sums(const __m256i* sums) {
    const __m256i pair = _mm256_or_si256(sums[0], _mm256_slli_epi64(sums[1], 16));
    return _mm256_or_si256(
        pair, _mm256_or_si256(_mm256_slli_epi64(sums[2], 32), _mm256_slli_epi64(sums[3], 48)));
}

// two_rows_of(n): block rows n and n + 8 of what the block is compared with.
template <typename TwoRowsOf>
[[gnu::always_inline]] inline void add_phases(const uint8_t* block, TwoRowsOf two_rows_of,
                                              int* sums) {
    const __m256i even_columns = _mm256_set1_epi16(0x00ff);
    // All columns of even rows, phase 0 of them, all columns of odd rows, phase 2 of them.
    __m256i parts[4] = {_mm256_setzero_si256(), _mm256_setzero_si256(), _mm256_setzero_si256(),
                        _mm256_setzero_si256()};
    for (int n = 0; n < 8; ++n) {
        const __m256i a = load_aligned(block + 32 * n);
        const __m256i b = two_rows_of(n);
        __m256i* part = parts + 2 * (n & 1);
        part[0] = _mm256_add_epi32(part[0], _mm256_sad_epu8(a, b));
        part[1] = _mm256_add_epi32(part[1], _mm256_sad_epu8(_mm256_and_si256(a, even_columns),
                                                            _mm256_and_si256(b, even_columns)));
    }
    const __m256i packed = pack_sums(parts);
    const __m128i lanes = _mm_add_epi16(low_lane(packed), high_lane(packed));
    const __m128i totals = _mm_cvtepu16_epi32(_mm_add_epi16(lanes, _mm_srli_si128(lanes, 8)));
    const int even = _mm_cvtsi128_si32(totals), phase_0 = _mm_extract_epi32(totals, 1);
    const int odd = _mm_extract_epi32(totals, 2), phase_2 = _mm_extract_epi32(totals, 3);
    sums[0] = phase_0;
    sums[1] = phase_0 + odd - phase_2;
    sums[2] = phase_0 + odd;
    sums[3] = even + odd;
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(
        block, [=](int n) { return two_rows(ref + n * stride, stride); }, sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(
        block,
        [=](int n) {
            return _mm256_avg_epu8(two_rows(a + n * stride, stride),
                                   two_rows(b + n * stride, stride));
        },
        sums);
}

void add_sad(__m256i* sum, __m256i a, __m256i b) {
    *sum = _mm256_add_epi32(*sum, _mm256_sad_epu8(a, b));
}

// Bit n: sum n is below limit n.
uint32_t below_limits(const __m256i* sums, const int32_t* limits) {
    const __m256i a = pack_sums(sums), b = pack_sums(sums + 4);
    const __m256i lanes =
        _mm256_add_epi16(_mm256_unpacklo_epi64(a, b), _mm256_unpackhi_epi64(a, b));
    const __m256i totals = _mm256_cvtepu16_epi32(_mm_add_epi16(low_lane(lanes), high_lane(lanes)));
    return static_cast<uint32_t>(
        _mm256_movemask_ps(_mm256_castsi256_ps(_mm256_cmpgt_epi32(load_32(limits), totals))));
}

// The sums below are cleared one by one: g++ 12 keeps an array that `= {}` clears in memory.

uint32_t first_phases_below_x4(const uint8_t* block, const uint8_t* const* refs, ptrdiff_t stride,
                               const int32_t* limits) {
    __m256i sums[4] = {_mm256_setzero_si256(), _mm256_setzero_si256(), _mm256_setzero_si256(),
                       _mm256_setzero_si256()};
    for (int n = 0; n < 4; ++n) {
        const __m256i current = arranged_checkerboard(block, n);
        for (int i = 0; i < 4; ++i) {
            add_sad(sums + i, current, checkerboard(refs[i] + 2 * n * stride, stride));
        }
    }
    const __m256i packed = pack_sums(sums);
    const __m128i lanes = _mm_add_epi16(low_lane(packed), high_lane(packed));
    const __m128i totals = _mm_cvtepu16_epi32(_mm_add_epi16(lanes, _mm_srli_si128(lanes, 8)));
    return static_cast<uint32_t>(
        _mm_movemask_ps(_mm_castsi128_ps(_mm_cmpgt_epi32(load_16(limits), totals))));
}

// The checkerboards of a block and of the block one row above, n = 0, 1, 2, 3 in turn: rows that
// both have are read once.
class CheckerboardPair {
public:
    CheckerboardPair(const uint8_t* block, ptrdiff_t stride)
        : m_row(block), m_stride(stride), m_above(two_rows(block - stride, stride)) {}

    void next(__m256i* here, __m256i* above) {
        const __m256i even = two_rows(m_row, m_stride);
        const __m256i odd = two_rows(m_row + m_stride, m_stride);
        *here = _mm256_blendv_epi8(even, odd, odd_columns());
        *above = _mm256_blendv_epi8(m_above, even, odd_columns());
        m_above = odd;
        m_row += 2 * m_stride;
    }

private:
    const uint8_t* m_row;
    ptrdiff_t m_stride;
    __m256i m_above;
};

uint32_t first_phases_below_half(const uint8_t* block, const HalfSamples& at, ptrdiff_t stride,
                                 const int32_t* limits) {
    __m256i sums[8];
    for (__m256i& sum : sums) {
        sum = _mm256_setzero_si256();
    }
    CheckerboardPair vertical(at.vertical, stride);
    CheckerboardPair right(at.centre, stride), left(at.centre - 1, stride);
    for (int n = 0; n < 4; ++n) {
        __m256i boards[8];  // in the order of half_candidates()
        vertical.next(boards, boards + 1);
        boards[2] = checkerboard(at.horizontal + 2 * n * stride, stride);
        boards[3] = checkerboard(at.horizontal - 1 + 2 * n * stride, stride);
        right.next(boards + 4, boards + 6);
        left.next(boards + 5, boards + 7);
        const __m256i current = arranged_checkerboard(block, n);
        for (int i = 0; i < 8; ++i) {
            add_sad(sums + i, current, boards[i]);
        }
    }
    return below_limits(sums, limits);
}

uint32_t first_phases_below_star(const uint8_t* block, const uint8_t* centre,
                                 const uint8_t* const* refs, ptrdiff_t stride,
                                 const int32_t* limits) {
    __m256i sums[8];
    for (__m256i& sum : sums) {
        sum = _mm256_setzero_si256();
    }
    for (int n = 0; n < 4; ++n) {
        const __m256i current = arranged_checkerboard(block, n);
        const __m256i c = checkerboard(centre + 2 * n * stride, stride);
        for (int i = 0; i < 8; ++i) {
            add_sad(sums + i, current,
                    _mm256_avg_epu8(c, checkerboard(refs[i] + 2 * n * stride, stride)));
        }
    }
    return below_limits(sums, limits);
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    __m256i sums[8];
    for (__m256i& sum : sums) {
        sum = _mm256_setzero_si256();
    }
    for (int n = 0; n < 4; ++n) {
        const __m256i current = arranged_checkerboard(block, n);
        const __m256i c = checkerboard(centre + 2 * n * stride, stride);
        __m256i sides[4];
        for (int i = 0; i < 4; ++i) {
            sides[i] = checkerboard(refs[i] + 2 * n * stride, stride);
            add_sad(sums + i, current, _mm256_avg_epu8(c, sides[i]));
        }
        for (int i = 0; i < 4; ++i) {
            add_sad(sums + 4 + i, current,
                    _mm256_avg_epu8(sides[kCrossPairs[i][0]], sides[kCrossPairs[i][1]]));
        }
    }
    return below_limits(sums, limits);
}

// ---- Reference planes ----

// Half samples from pairs of neighbours: E and F, G and H, I and J, interleaved.
__m256i half_samples(__m256i ef, __m256i gh, __m256i ij) {
    const __m256i first = _mm256_set1_epi16(static_cast<short>(0xfb01));  // 1, -5
    const __m256i middle = _mm256_set1_epi16(0x1414);                     // 20, 20
    const __m256i last = _mm256_set1_epi16(0x01fb);                       // -5, 1
    const __m256i sum = _mm256_add_epi16(
        _mm256_add_epi16(_mm256_maddubs_epi16(ef, first), _mm256_maddubs_epi16(ij, last)),
        _mm256_maddubs_epi16(gh, middle));
    return _mm256_mulhrs_epi16(sum, _mm256_set1_epi16(1 << 10));  // (sum + 16) >> 5
}

// 32 half samples below those at p.
__m256i half_vertical(const uint8_t* p, ptrdiff_t stride) {
    const __m256i e = load_32(p - 2 * stride), f = load_32(p - stride), g = load_32(p);
    const __m256i h = load_32(p + stride), i = load_32(p + 2 * stride), j = load_32(p + 3 * stride);
    return _mm256_packus_epi16(half_samples(_mm256_unpacklo_epi8(e, f), _mm256_unpacklo_epi8(g, h),
                                            _mm256_unpacklo_epi8(i, j)),
                               half_samples(_mm256_unpackhi_epi8(e, f), _mm256_unpackhi_epi8(g, h),
                                            _mm256_unpackhi_epi8(i, j)));
}

// Pairs of neighbours in either lane, of which the first begins at byte n.
__m256i neighbours(__m256i samples, int n) {
    const __m256i pairs =
        _mm256_broadcastsi128_si256(_mm_setr_epi8(0, 1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8));
    return _mm256_shuffle_epi8(samples,
                               _mm256_add_epi8(pairs, _mm256_set1_epi8(static_cast<char>(n))));
}

// 32 half samples right of those at p.
__m256i half_horizontal(const uint8_t* p) {
    // The samples that the first eight of a lane need are 0..12 of `left`, those of the others are
    // 3..15 of `right`; so nothing beyond the last tap is read.
    const __m256i left = load_32(p - 2), right = load_32(p + 3);
    return _mm256_packus_epi16(
        half_samples(neighbours(left, 0), neighbours(left, 2), neighbours(left, 4)),
        half_samples(neighbours(right, 3), neighbours(right, 5), neighbours(right, 7)));
}

// Rows of count >= 32 half samples; the last step overlaps the one before it.
void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    if (count < 32) {
        scalar_kernels().half_vertical_row(src, stride, dst, count);
        return;
    }
    for (int x = 0; x < count - 32; x += 32) {
        store_32(dst + x, half_vertical(src + x, stride));
    }
    store_32(dst + count - 32, half_vertical(src + count - 32, stride));
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    if (count < 32) {
        scalar_kernels().half_horizontal_row(src, dst, count);
        return;
    }
    for (int x = 0; x < count - 32; x += 32) {
        store_32(dst + x, half_horizontal(src + x));
    }
    store_32(dst + count - 32, half_horizontal(src + count - 32));
}

// ---- Inter prediction ----

void copy_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    for (int y = 0; y < 16; y += 2) {
        store_32(pred + 16 * y, join(load_16(src + y * stride), load_16(src + (y + 1) * stride)));
    }
}

void average_16x16(uint8_t* pred, const uint8_t* a, ptrdiff_t a_stride, const uint8_t* b,
                   ptrdiff_t b_stride) {
    for (int y = 0; y < 16; ++y) {
        store_16(pred + 16 * y, _mm_avg_epu8(load_16(a + y * a_stride), load_16(b + y * b_stride)));
    }
}

// (outer - 5 * middle + 20 * inner + 512) >> 10 with 32-bit sums.
__m256i centre_samples(__m256i outer, __m256i middle, __m256i inner) {
    const __m256i ones = _mm256_set1_epi16(1);
    const __m256i outer_middle = _mm256_set1_epi32(static_cast<int>(0xfffb0001u));  // 1, -5
    const __m256i inner_rounding = _mm256_set1_epi32(512 << 16 | 20);
    const __m256i low =
        _mm256_add_epi32(_mm256_madd_epi16(_mm256_unpacklo_epi16(outer, middle), outer_middle),
                         _mm256_madd_epi16(_mm256_unpacklo_epi16(inner, ones), inner_rounding));
    const __m256i high =
        _mm256_add_epi32(_mm256_madd_epi16(_mm256_unpackhi_epi16(outer, middle), outer_middle),
                         _mm256_madd_epi16(_mm256_unpackhi_epi16(inner, ones), inner_rounding));
    return _mm256_packs_epi32(_mm256_srai_epi32(low, 10), _mm256_srai_epi32(high, 10));
}

// Unrounded vertical sums from six rows, as 16-bit lanes.
__m256i vertical_sums(const __m256i* r) {
    const __m256i t = _mm256_sub_epi16(_mm256_slli_epi16(_mm256_add_epi16(r[2], r[3]), 2),
                                       _mm256_add_epi16(r[1], r[4]));
    return _mm256_add_epi16(_mm256_add_epi16(_mm256_add_epi16(r[0], r[5]), t),
                            _mm256_slli_epi16(t, 2));
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    // Columns -2..13, and columns 6..21, from six rows that move down.
    __m256i left[6], right[6];
    const auto load_row = [&](int slot, int y) {
        const uint8_t* row = src + y * stride;
        left[slot] = _mm256_cvtepu8_epi16(load_16(row - 2));
        right[slot] = join(high_lane(left[slot]), _mm_cvtepu8_epi16(load_8(row + 14)));
    };
    for (int i = 0; i < 5; ++i) {
        load_row(i, i - 2);
    }
    for (int y = 0; y < 16; ++y) {
        load_row(5, y + 3);
        const __m256i a = vertical_sums(left);
        const __m256i b = vertical_sums(right);
        // Sums that start n columns later.
        const __m256i a1 = _mm256_alignr_epi8(b, a, 2), a2 = _mm256_alignr_epi8(b, a, 4);
        const __m256i a3 = _mm256_alignr_epi8(b, a, 6), a4 = _mm256_alignr_epi8(b, a, 8);
        const __m256i a5 = _mm256_alignr_epi8(b, a, 10);
        const __m256i samples = centre_samples(_mm256_add_epi16(a, a5), _mm256_add_epi16(a1, a4),
                                               _mm256_add_epi16(a2, a3));
        store_16(pred + 16 * y, _mm_packus_epi16(low_lane(samples), high_lane(samples)));
        for (int i = 0; i < 5; ++i) {
            left[i] = left[i + 1];
            right[i] = right[i + 1];
        }
    }
}

// Cb in the low lane, Cr in the high one.
void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    const __m256i columns = _mm256_set1_epi16(static_cast<short>((8 - fx) | fx << 8));
    const __m256i upper_weight = _mm256_set1_epi16(static_cast<short>(8 - fy));
    const __m256i lower_weight = _mm256_set1_epi16(static_cast<short>(fy));
    const auto horizontal = [&](int y) {
        const __m256i row = join(load_16(u + y * stride), load_16(v + y * stride));
        return _mm256_maddubs_epi16(neighbours(row, 0), columns);
    };
    __m256i upper = horizontal(0);
    for (int y = 0; y < 8; ++y) {
        const __m256i lower = horizontal(y + 1);
        const __m256i sum = _mm256_add_epi16(_mm256_mullo_epi16(upper, upper_weight),
                                             _mm256_mullo_epi16(lower, lower_weight));
        const __m256i rounded = _mm256_srli_epi16(_mm256_add_epi16(sum, _mm256_set1_epi16(32)), 6);
        const __m256i samples = _mm256_packus_epi16(rounded, rounded);
        store_8(pred + 8 * y, low_lane(samples));
        store_8(pred + 64 + 8 * y, high_lane(samples));
        upper = lower;
    }
}

// ---- Residual ----

// Forward core transform across four vectors.
void forward_butterfly(__m256i* v) {
    const __m256i s = _mm256_add_epi16(v[0], v[3]);
    const __m256i d = _mm256_sub_epi16(v[0], v[3]);
    const __m256i t = _mm256_add_epi16(v[1], v[2]);
    const __m256i u = _mm256_sub_epi16(v[1], v[2]);
    v[0] = _mm256_add_epi16(s, t);
    v[1] = _mm256_add_epi16(_mm256_add_epi16(d, d), u);
    v[2] = _mm256_sub_epi16(s, t);
    v[3] = _mm256_sub_epi16(d, _mm256_add_epi16(u, u));
}

// Inverse core transform across four vectors.
void inverse_butterfly(__m256i* v) {
    const __m256i e = _mm256_add_epi16(v[0], v[2]);
    const __m256i f = _mm256_sub_epi16(v[0], v[2]);
    const __m256i g = _mm256_sub_epi16(_mm256_srai_epi16(v[1], 1), v[3]);
    const __m256i h = _mm256_add_epi16(v[1], _mm256_srai_epi16(v[3], 1));
    v[0] = _mm256_add_epi16(e, h);
    v[1] = _mm256_add_epi16(f, g);
    v[2] = _mm256_sub_epi16(f, g);
    v[3] = _mm256_sub_epi16(e, h);
}

// Transposes the four 4x4 blocks that stand side by side in four vectors.
void transpose_four(__m256i* v) {
    const __m256i a = _mm256_unpacklo_epi16(v[0], v[1]);
    const __m256i b = _mm256_unpackhi_epi16(v[0], v[1]);
    const __m256i c = _mm256_unpacklo_epi16(v[2], v[3]);
    const __m256i d = _mm256_unpackhi_epi16(v[2], v[3]);
    const __m256i even_01 = _mm256_unpacklo_epi32(a, c);
    const __m256i even_23 = _mm256_unpackhi_epi32(a, c);
    const __m256i odd_01 = _mm256_unpacklo_epi32(b, d);
    const __m256i odd_23 = _mm256_unpackhi_epi32(b, d);
    v[0] = _mm256_unpacklo_epi64(even_01, odd_01);
    v[1] = _mm256_unpackhi_epi64(even_01, odd_01);
    v[2] = _mm256_unpacklo_epi64(even_23, odd_23);
    v[3] = _mm256_unpackhi_epi64(even_23, odd_23);
}

// Puts 16 coefficients kept column by column into zig-zag order (Kernels.h, zigzag.h).
__m256i zigzag(__m256i v) {
    constexpr char x = -1;              // from the other lane
    const __m128i low = low_lane(v);    // positions 0..7
    const __m128i high = high_lane(v);  // positions 8..15
    // Order 0 4 1 2 5 8 12 9, then 6 3 7 10 13 14 11 15.
    const __m128i first = _mm_or_si128(
        _mm_shuffle_epi8(low, _mm_setr_epi8(0, 1, 8, 9, 2, 3, 4, 5, 10, 11, x, x, x, x, x, x)),
        _mm_shuffle_epi8(high, _mm_setr_epi8(x, x, x, x, x, x, x, x, x, x, 0, 1, 8, 9, 2, 3)));
    const __m128i second = _mm_or_si128(
        _mm_shuffle_epi8(low, _mm_setr_epi8(12, 13, 6, 7, 14, 15, x, x, x, x, x, x, x, x, x, x)),
        _mm_shuffle_epi8(high,
                         _mm_setr_epi8(x, x, x, x, x, x, 4, 5, 10, 11, 12, 13, 6, 7, 14, 15)));
    return join(first, second);
}

// A quantiser in vectors.
struct VectorQuantizer {
    __m256i forward, dequant, rounding, largest;
    __m128i shift;

    explicit VectorQuantizer(const Quantizer& q)
        : forward(load_aligned(q.forward)),
          dequant(load_aligned(q.dequant)),
          rounding(_mm256_set1_epi32(q.rounding)),
          largest(_mm256_set1_epi16(kMaxLevel)),
          shift(_mm_cvtsi32_si128(q.shift)) {}

    // Quantises a block; returns the mask of its levels.
    uint16_t quantize(__m256i c, int16_t* coefs, int16_t* scan) const {
        const __m256i magnitude = _mm256_abs_epi16(c);
        const __m256i low = _mm256_mullo_epi16(magnitude, forward);
        const __m256i high = _mm256_mulhi_epu16(magnitude, forward);
        const __m256i first =
            _mm256_srl_epi32(_mm256_add_epi32(_mm256_unpacklo_epi16(low, high), rounding), shift);
        const __m256i second =
            _mm256_srl_epi32(_mm256_add_epi32(_mm256_unpackhi_epi16(low, high), rounding), shift);
        const __m256i level =
            _mm256_sign_epi16(_mm256_min_epi16(_mm256_packs_epi32(first, second), largest), c);
        store_32(coefs, _mm256_mullo_epi16(level, dequant));
        const __m256i in_order = zigzag(level);
        store_32(scan, in_order);
        const __m128i bytes = _mm_packs_epi16(low_lane(in_order), high_lane(in_order));
        const int zeros = _mm_movemask_epi8(_mm_cmpeq_epi8(bytes, _mm_setzero_si128()));
        return static_cast<uint16_t>(~zeros);
    }
};

// Codes four blocks from the rows of their residual, blocks 0 and 1 in the low lane. kStep: how
// many blocks after block 0 block 2 stands in coefs, scan, nonzero and dc. Returns the mask of the
// coded ones, by that order too.
template <int kStep>
[[gnu::always_inline]] inline uint32_t code_four(__m256i* v, const Quantizer& quantizer,
                                                 int16_t* dc, int16_t* coefs, int16_t* scan,
                                                 uint16_t* nonzero) {
    constexpr int kPlace[4] = {0, 1, kStep, kStep + 1};
    forward_butterfly(v);
    transpose_four(v);
    forward_butterfly(v);  // now vector j holds column j, 64 bits a block
    if (dc) {
        dc[0] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 0));
        dc[1] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 4));
        dc[kStep] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 8));
        dc[kStep + 1] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 12));
        v[0] = _mm256_and_si256(v[0], _mm256_set1_epi64x(~0xffffLL));
    }
    __m256i beyond = _mm256_setzero_si256();
    for (int j = 0; j < 4; ++j) {
        const __m256i dead_zone = _mm256_broadcastq_epi64(load_8(quantizer.dead_zone + 4 * j));
        beyond = _mm256_or_si256(beyond, _mm256_cmpgt_epi16(_mm256_abs_epi16(v[j]), dead_zone));
    }
    const __m256i none = _mm256_cmpeq_epi64(beyond, _mm256_setzero_si256());
    const unsigned coded =
        ~static_cast<unsigned>(_mm256_movemask_pd(_mm256_castsi256_pd(none))) & 0xf;
    for (const int place : kPlace) {
        nonzero[place] = 0;
        if (dc) {
            store_32(coefs + 16 * place, _mm256_setzero_si256());
        }
    }
    if (coded == 0) {
        return 0;
    }
    const __m256i even_01 = _mm256_unpacklo_epi64(v[0], v[1]);
    const __m256i even_23 = _mm256_unpacklo_epi64(v[2], v[3]);
    const __m256i odd_01 = _mm256_unpackhi_epi64(v[0], v[1]);
    const __m256i odd_23 = _mm256_unpackhi_epi64(v[2], v[3]);
    const __m256i blocks[4] = {_mm256_permute2x128_si256(even_01, even_23, 0x20),
                               _mm256_permute2x128_si256(odd_01, odd_23, 0x20),
                               _mm256_permute2x128_si256(even_01, even_23, 0x31),
                               _mm256_permute2x128_si256(odd_01, odd_23, 0x31)};
    const VectorQuantizer vectors(quantizer);
    for (unsigned rest = coded; rest != 0; rest &= rest - 1) {
        const int b = __builtin_ctz(rest);
        const int place = kPlace[b];
        nonzero[place] = vectors.quantize(blocks[b], coefs + 16 * place, scan + 16 * place);
    }
    return (coded & 3) | (coded >> 2) << kStep;
}

// First block in decoding order of block row r of a 16x16 block (Figure 6-10); its neighbours to
// the right are 1, 4 and 5 blocks later.
constexpr int first_in_row(int r) {
    return 2 * (r & 1) + 8 * (r >> 1);
}

uint32_t code_residual_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                             const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                             uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int r = 0; r < 4; ++r, src += 4 * stride, pred += 64) {
        __m256i v[4];
        for (int y = 0; y < 4; ++y) {
            v[y] = _mm256_sub_epi16(_mm256_cvtepu8_epi16(load_16(src + y * stride)),
                                    _mm256_cvtepu8_epi16(load_16(pred + 16 * y)));
        }
        const int first = first_in_row(r);
        coded |= code_four<4>(v, quantizer, dc ? dc + first : nullptr, coefs + 16 * first,
                              scan + 16 * first, nonzero + first)
                 << first;
    }
    return coded;
}

// Rows y and y + 4 of an 8x8 block, one in each lane.
__m256i two_rows_of_8(const uint8_t* p, ptrdiff_t stride) {
    return _mm256_cvtepu8_epi16(_mm_unpacklo_epi64(load_8(p), load_8(p + 4 * stride)));
}

uint32_t code_residual_8x8(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    __m256i v[4];
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm256_sub_epi16(two_rows_of_8(src + y * stride, stride),
                                two_rows_of_8(pred + 8 * y, 8));
    }
    return code_four<2>(v, quantizer, dc, coefs, scan, nonzero);
}

// Rows y and y + 1 of a 4x4 block.
__m128i two_rows_of_4(const uint8_t* p, ptrdiff_t stride) {
    int32_t upper, lower;
    __builtin_memcpy(&upper, p, sizeof upper);
    __builtin_memcpy(&lower, p + stride, sizeof lower);
    return _mm_cvtepu8_epi16(_mm_insert_epi32(_mm_cvtsi32_si128(upper), lower, 1));
}

// Forward core transform across the rows or the columns of a block: v01 holds 0 and 1, v23 holds 2
// and 3, before and after.
void forward_butterfly(__m128i* v01, __m128i* v23) {
    const __m128i v32 = _mm_shuffle_epi32(*v23, _MM_SHUFFLE(1, 0, 3, 2));
    const __m128i st = _mm_add_epi16(*v01, v32);  // 0 + 3, 1 + 2
    const __m128i du = _mm_sub_epi16(*v01, v32);  // 0 - 3, 1 - 2
    const __m128i ss = _mm_unpacklo_epi64(st, du), tu = _mm_unpackhi_epi64(st, du);
    // s + t and 2d + u; s - t and d - 2u.
    const __m128i sd = _mm_add_epi16(ss, _mm_slli_si128(_mm_srli_si128(ss, 8), 8));
    const __m128i twice_u = _mm_add_epi16(tu, _mm_slli_si128(_mm_srli_si128(tu, 8), 8));
    *v01 = _mm_add_epi16(sd, tu);
    *v23 = _mm_sub_epi16(ss, twice_u);
}

// Exchanges rows and columns of a block, two rows a vector.
void transpose_4x4(__m128i* v01, __m128i* v23) {
    const __m128i a = _mm_unpacklo_epi16(*v01, *v23);  // rows 0 and 2
    const __m128i b = _mm_unpackhi_epi16(*v01, *v23);  // rows 1 and 3
    *v01 = _mm_unpacklo_epi16(a, b);
    *v23 = _mm_unpackhi_epi16(a, b);
}

uint32_t code_residual_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    __m128i v01 = _mm_sub_epi16(two_rows_of_4(src, stride), two_rows_of_4(pred, 4));
    __m128i v23 =
        _mm_sub_epi16(two_rows_of_4(src + 2 * stride, stride), two_rows_of_4(pred + 8, 4));
    forward_butterfly(&v01, &v23);
    transpose_4x4(&v01, &v23);
    forward_butterfly(&v01, &v23);
    const __m256i c = join(v01, v23);
    const __m256i beyond =
        _mm256_cmpgt_epi16(_mm256_abs_epi16(c), load_aligned(quantizer.dead_zone));
    if (_mm256_testz_si256(beyond, beyond)) {
        *nonzero = 0;
        return 0;
    }
    *nonzero = VectorQuantizer(quantizer).quantize(c, coefs, scan);
    return 1;
}

// Sums of the magnitudes of 16 coefficients, in eight parts.
__m256i magnitudes(__m256i coefs) {
    return _mm256_madd_epi16(_mm256_abs_epi16(coefs), _mm256_set1_epi16(1));
}

// Rows of the residual of four blocks, blocks 0 and 1 in the low lane. Returns false when 16-bit
// sums might not be exact: no sum of the inverse transform, rounding included, exceeds the sum of
// a block's magnitudes.
[[gnu::always_inline]] inline bool inverse_four(const __m256i* b, __m256i* rows) {
    constexpr int kLargestSum = 32767 - 32;
    const __m256i parts = _mm256_hadd_epi32(_mm256_hadd_epi32(magnitudes(b[0]), magnitudes(b[1])),
                                            _mm256_hadd_epi32(magnitudes(b[2]), magnitudes(b[3])));
    const __m128i sums = _mm_add_epi32(low_lane(parts), high_lane(parts));
    if (_mm_movemask_epi8(_mm_cmpgt_epi32(sums, _mm_set1_epi32(kLargestSum))) != 0) {
        return false;
    }
    const __m256i even_01 = _mm256_permute2x128_si256(b[0], b[2], 0x20);
    const __m256i even_23 = _mm256_permute2x128_si256(b[0], b[2], 0x31);
    const __m256i odd_01 = _mm256_permute2x128_si256(b[1], b[3], 0x20);
    const __m256i odd_23 = _mm256_permute2x128_si256(b[1], b[3], 0x31);
    rows[0] = _mm256_unpacklo_epi64(even_01, odd_01);
    rows[1] = _mm256_unpackhi_epi64(even_01, odd_01);
    rows[2] = _mm256_unpacklo_epi64(even_23, odd_23);
    rows[3] = _mm256_unpackhi_epi64(even_23, odd_23);
    inverse_butterfly(rows);
    transpose_four(rows);
    inverse_butterfly(rows);
    for (int y = 0; y < 4; ++y) {
        rows[y] = _mm256_srai_epi16(_mm256_add_epi16(rows[y], _mm256_set1_epi16(32)), 6);
    }
    return true;
}

__m256i block_or_zero(const int16_t* coefs, uint32_t mask, int block) {
    return mask >> block & 1 ? load_aligned(coefs + 16 * block) : _mm256_setzero_si256();
}

void reconstruct_16x16(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                       ptrdiff_t stride) {
    for (int r = 0; r < 4; ++r) {
        const uint8_t* row_pred = pred + 64 * r;
        uint8_t* row_dst = dst + 4 * r * stride;
        const int first = first_in_row(r);
        if ((mask >> first & 0x33) == 0) {
            for (int y = 0; y < 4; ++y) {
                store_16(row_dst + y * stride, load_16(row_pred + 16 * y));
            }
            continue;
        }
        const __m256i blocks[4] = {
            block_or_zero(coefs, mask, first), block_or_zero(coefs, mask, first + 1),
            block_or_zero(coefs, mask, first + 4), block_or_zero(coefs, mask, first + 5)};
        __m256i rows[4];
        if (!inverse_four(blocks, rows)) {
            scalar_kernels().reconstruct_16x16(coefs, mask, pred, dst, stride);
            return;
        }
        for (int y = 0; y < 4; ++y) {
            const __m256i sum =
                _mm256_add_epi16(rows[y], _mm256_cvtepu8_epi16(load_16(row_pred + 16 * y)));
            store_16(row_dst + y * stride, _mm_packus_epi16(low_lane(sum), high_lane(sum)));
        }
    }
}

void reconstruct_8x8(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                     ptrdiff_t stride) {
    if (mask == 0) {
        for (int y = 0; y < 8; ++y) {
            store_8(dst + y * stride, load_8(pred + 8 * y));
        }
        return;
    }
    const __m256i blocks[4] = {block_or_zero(coefs, mask, 0), block_or_zero(coefs, mask, 1),
                               block_or_zero(coefs, mask, 2), block_or_zero(coefs, mask, 3)};
    __m256i rows[4];
    if (!inverse_four(blocks, rows)) {
        scalar_kernels().reconstruct_8x8(coefs, mask, pred, dst, stride);
        return;
    }
    for (int y = 0; y < 4; ++y) {
        const __m256i sum = _mm256_add_epi16(rows[y], two_rows_of_8(pred + 8 * y, 8));
        const __m128i samples = _mm_packus_epi16(low_lane(sum), high_lane(sum));
        store_8(dst + y * stride, samples);
        store_8(dst + (y + 4) * stride, _mm_srli_si128(samples, 8));
    }
}

// ---- Features of the intra decisions ----

void block_sums(const uint8_t* src, ptrdiff_t stride, int32_t* sums) {
    const __m256i byte_ones = _mm256_set1_epi8(1);
    const __m256i ones = _mm256_set1_epi16(1);
    for (int block_row = 0; block_row < 4; ++block_row, src += 4 * stride) {
        const __m256i upper = join(load_16(src), load_16(src + stride));
        const __m256i lower = join(load_16(src + 2 * stride), load_16(src + 3 * stride));
        const __m256i pairs = _mm256_add_epi16(_mm256_maddubs_epi16(upper, byte_ones),
                                               _mm256_maddubs_epi16(lower, byte_ones));
        const __m256i quads = _mm256_madd_epi16(pairs, ones);
        store_16(sums + 4 * block_row, _mm_add_epi32(low_lane(quads), high_lane(quads)));
    }
}

// 4-point Hadamard transform across four vectors.
void hadamard(__m128i* v) {
    const __m128i a = _mm_add_epi32(v[0], v[1]);
    const __m128i b = _mm_sub_epi32(v[0], v[1]);
    const __m128i c = _mm_add_epi32(v[2], v[3]);
    const __m128i d = _mm_sub_epi32(v[2], v[3]);
    v[0] = _mm_add_epi32(a, c);
    v[1] = _mm_add_epi32(b, d);
    v[2] = _mm_sub_epi32(a, c);
    v[3] = _mm_sub_epi32(b, d);
}

void hadamard_energy(const int32_t* values, int32_t* energy) {
    __m128i v[4] = {load_16(values), load_16(values + 4), load_16(values + 8),
                    load_16(values + 12)};
    hadamard(v);
    const __m128i a = _mm_unpacklo_epi32(v[0], v[1]), b = _mm_unpackhi_epi32(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi32(v[2], v[3]), d = _mm_unpackhi_epi32(v[2], v[3]);
    v[0] = _mm_unpacklo_epi64(a, c);
    v[1] = _mm_unpackhi_epi64(a, c);
    v[2] = _mm_unpacklo_epi64(b, d);
    v[3] = _mm_unpackhi_epi64(b, d);
    hadamard(v);  // now vector j holds horizontal frequency j, lane i vertical frequency i
    for (__m128i& row : v) {
        row = _mm_srli_epi32(_mm_add_epi32(_mm_abs_epi32(row), _mm_set1_epi32(8)), 4);
    }
    const __m128i others = _mm_add_epi32(_mm_add_epi32(v[1], v[2]), v[3]);
    const __m128i low = _mm_unpacklo_epi32(v[0], others);   // lanes 0 of both, lanes 1 of both
    const __m128i high = _mm_unpackhi_epi32(v[0], others);  // lanes 2, lanes 3
    const __m128i sums =
        _mm_add_epi32(_mm_add_epi32(_mm_srli_si128(low, 8), high), _mm_srli_si128(high, 8));
    store_16(energy, _mm_unpacklo_epi64(low, sums));
}

// ---- Intra 4x4 prediction ----

// The predictions of clause 8.3.1.2 in the order of their modes, from the neighbours L, K, J, I, M,
// A..H. Every row of a directional mode is made of neighbours, of two in a row averaged, and of
// three in a row filtered.
void predict_4x4_modes(const uint8_t* neighbours_at, int dc, __m128i* modes) {
    constexpr char x = -1;  // from the other vector
    const __m128i n = load_16(neighbours_at);
    const __m128i before =
        _mm_shuffle_epi8(n, _mm_setr_epi8(0, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 12, 12));
    const __m128i after =
        _mm_shuffle_epi8(n, _mm_setr_epi8(1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 12, 12, 12, 12));
    const __m128i two = _mm_avg_epu8(n, after);  // (n[i] + n[i + 1] + 1) >> 1
    const __m128i odd = _mm_and_si128(_mm_xor_si128(before, after), _mm_set1_epi8(1));
    // (n[i - 1] + 2 n[i] + n[i + 1] + 2) >> 2
    const __m128i three = _mm_avg_epu8(n, _mm_sub_epi8(_mm_avg_epu8(before, after), odd));
    const auto mix = [=](__m128i from_two, __m128i from_three) {
        return _mm_or_si128(_mm_shuffle_epi8(two, from_two), _mm_shuffle_epi8(three, from_three));
    };
    modes[0] = _mm_shuffle_epi8(n, _mm_set1_epi32(0x08070605));
    modes[1] = _mm_shuffle_epi8(n, _mm_setr_epi8(3, 3, 3, 3, 2, 2, 2, 2, 1, 1, 1, 1, 0, 0, 0, 0));
    modes[2] = _mm_set1_epi8(static_cast<char>(dc));
    modes[3] = _mm_shuffle_epi8(
        three, _mm_setr_epi8(6, 7, 8, 9, 7, 8, 9, 10, 8, 9, 10, 11, 9, 10, 11, 12));
    modes[4] =
        _mm_shuffle_epi8(three, _mm_setr_epi8(4, 5, 6, 7, 3, 4, 5, 6, 2, 3, 4, 5, 1, 2, 3, 4));
    modes[5] = mix(_mm_setr_epi8(4, 5, 6, 7, x, x, x, x, x, 4, 5, 6, x, x, x, x),
                   _mm_setr_epi8(x, x, x, x, 4, 5, 6, 7, 3, x, x, x, 2, 4, 5, 6));
    modes[6] = mix(_mm_setr_epi8(3, x, x, x, 2, x, 3, x, 1, x, 2, x, 0, x, 1, x),
                   _mm_setr_epi8(x, 4, 5, 6, x, 3, x, 4, x, 2, x, 3, x, 1, x, 2));
    modes[7] = mix(_mm_setr_epi8(5, 6, 7, 8, x, x, x, x, 6, 7, 8, 9, x, x, x, x),
                   _mm_setr_epi8(x, x, x, x, 6, 7, 8, 9, x, x, x, x, 7, 8, 9, 10));
    const __m128i last =
        _mm_shuffle_epi8(n, _mm_setr_epi8(x, x, x, x, x, x, x, x, x, x, 0, 0, 0, 0, 0, 0));
    modes[8] = _mm_or_si128(mix(_mm_setr_epi8(2, x, 1, x, 1, x, 0, x, 0, x, x, x, x, x, x, x),
                                _mm_setr_epi8(x, 2, x, 1, x, 1, x, 0, x, 0, x, x, x, x, x, x)),
                            last);
}

// The distortions of two predictions at the four phases, as 16-bit values in the low half of either
// lane; rows 0, 1 and 2, 3 of the block are in both lanes.
__m256i phase_satds(__m256i src_01, __m256i src_23, __m128i a, __m128i b) {
    const __m256i rows_01 =
        _mm256_sub_epi16(src_01, _mm256_cvtepu8_epi16(_mm_unpacklo_epi64(a, b)));
    const __m256i rows_23 =
        _mm256_sub_epi16(src_23, _mm256_cvtepu8_epi16(_mm_unpackhi_epi64(a, b)));
    const __m256i sums = _mm256_abs_epi16(_mm256_add_epi16(rows_01, rows_23));
    const __m256i differences = _mm256_abs_epi16(_mm256_sub_epi16(rows_01, rows_23));
    // |a + b| + |a - b| = 2 max(|a|, |b|), a and b two columns apart.
    const __m256i largest =
        _mm256_add_epi16(_mm256_max_epi16(sums, _mm256_srli_epi64(sums, 32)),
                         _mm256_max_epi16(differences, _mm256_srli_epi64(differences, 32)));
    return _mm256_shuffle_epi32(_mm256_add_epi16(largest, largest), _MM_SHUFFLE(3, 1, 2, 0));
}

void intra_4x4_modes(const uint8_t* src, ptrdiff_t stride, const uint8_t* neighbours_at, int dc,
                     uint8_t* preds, int16_t* distortion) {
    __m128i modes[9];
    predict_4x4_modes(neighbours_at, dc, modes);
    for (int mode = 0; mode < 9; ++mode) {
        store_16(preds + 16 * mode, modes[mode]);
    }
    const __m256i src_01 = _mm256_broadcastsi128_si256(two_rows_of_4(src, stride));
    const __m256i src_23 = _mm256_broadcastsi128_si256(two_rows_of_4(src + 2 * stride, stride));
    __m256i d[4];  // modes n and n + 4
    for (int n = 0; n < 4; ++n) {
        d[n] = phase_satds(src_01, src_23, modes[n], modes[n + 4]);
    }
    const __m256i d01 = _mm256_unpacklo_epi16(d[0], d[1]);
    const __m256i d23 = _mm256_unpacklo_epi16(d[2], d[3]);
    constexpr int kLanesBySide = _MM_SHUFFLE(3, 1, 2, 0);
    const __m256i first = _mm256_permute4x64_epi64(_mm256_unpacklo_epi32(d01, d23), kLanesBySide);
    const __m256i last = _mm256_permute4x64_epi64(_mm256_unpackhi_epi32(d01, d23), kLanesBySide);
    const __m128i d8 = low_lane(phase_satds(src_01, src_23, modes[8], modes[8]));
    const __m128i first_value = _mm_setr_epi16(-1, 0, 0, 0, 0, 0, 0, 0);
    const auto store_phase = [=](int phase, __m128i eight, __m128i ninth) {
        store_16(distortion + 16 * phase, eight);
        store_16(distortion + 16 * phase + 8, _mm_and_si128(ninth, first_value));
    };
    store_phase(0, low_lane(first), d8);
    store_phase(1, high_lane(first), _mm_srli_epi64(d8, 16));
    store_phase(2, low_lane(last), _mm_srli_epi64(d8, 32));
    store_phase(3, high_lane(last), _mm_srli_epi64(d8, 48));
}

// ---- Deblocking ----

// Sixteen lines of an edge.
struct Lanes {
    __m256i v;

    static Lanes load(const uint8_t* p) { return {_mm256_cvtepu8_epi16(load_16(p))}; }
    void store(uint8_t* p) const { store_16(p, _mm_packus_epi16(low_lane(v), high_lane(v))); }
    static Lanes splat(int value) { return {_mm256_set1_epi16(static_cast<short>(value))}; }

    friend Lanes operator+(Lanes a, Lanes b) { return {_mm256_add_epi16(a.v, b.v)}; }
    friend Lanes operator-(Lanes a, Lanes b) { return {_mm256_sub_epi16(a.v, b.v)}; }
    friend Lanes operator*(Lanes a, Lanes b) { return {_mm256_mullo_epi16(a.v, b.v)}; }
    friend Lanes operator&(Lanes a, Lanes b) { return {_mm256_and_si256(a.v, b.v)}; }
    static Lanes andnot(Lanes a, Lanes b) { return {_mm256_andnot_si256(a.v, b.v)}; }
    static Lanes less(Lanes a, Lanes b) { return {_mm256_cmpgt_epi16(b.v, a.v)}; }
    static Lanes min(Lanes a, Lanes b) { return {_mm256_min_epi16(a.v, b.v)}; }
    static Lanes max(Lanes a, Lanes b) { return {_mm256_max_epi16(a.v, b.v)}; }
    static Lanes average(Lanes a, Lanes b) { return {_mm256_avg_epu16(a.v, b.v)}; }
    static Lanes shift_right(Lanes a, int n) { return {_mm256_srai_epi16(a.v, n)}; }
    static Lanes absolute_difference(Lanes a, Lanes b) {
        return {_mm256_abs_epi16(_mm256_sub_epi16(a.v, b.v))};
    }
    static Lanes select(Lanes mask, Lanes a, Lanes b) {
        return {_mm256_blendv_epi8(b.v, a.v, mask.v)};
    }
    static bool any(Lanes a) { return !_mm256_testz_si256(a.v, a.v); }
};

// tC0 of 16 lines; lines: the segment of each.
Lanes line_tc0(const int8_t* tc0, uint32_t strengths, __m128i lines) {
    int32_t by_strength;
    __builtin_memcpy(&by_strength, tc0, sizeof by_strength);
    const __m128i segments = _mm_shuffle_epi8(_mm_cvtsi32_si128(by_strength),
                                              _mm_cvtsi32_si128(static_cast<int>(strengths)));
    return {_mm256_cvtepi8_epi16(_mm_shuffle_epi8(segments, lines))};
}

// The samples p3..q3 around a luma edge of 16 lines.
struct LumaLines {
    Lanes p3, p2, p1, p0, q0, q1, q2, q3;

    bool filter(int alpha, int beta, const int8_t* tc0, uint32_t strengths) {
        return filter_luma(p2, p1, p0, q0, q1, q2, alpha, beta,
                           line_tc0(tc0, strengths,
                                    _mm_setr_epi8(0, 0, 0, 0, 1, 1, 1, 1, 2, 2, 2, 2, 3, 3, 3, 3)));
    }
    bool filter_strong(int alpha, int beta) {
        return filter_luma_strong(p3, p2, p1, p0, q0, q1, q2, q3, alpha, beta);
    }
};

LumaLines luma_rows(const uint8_t* pix, ptrdiff_t stride) {
    const auto row = [=](int y) { return Lanes::load(pix + y * stride); };
    return {row(-4), row(-3), row(-2), row(-1), row(0), row(1), row(2), row(3)};
}

// Eight columns of 16 lines, transposed.
LumaLines luma_columns(const uint8_t* pix, ptrdiff_t stride) {
    const uint8_t* src = pix - 4;
    __m128i a[8];  // rows i and i + 8 interleaved
    for (int i = 0; i < 8; ++i) {
        a[i] = _mm_unpacklo_epi8(load_8(src + i * stride), load_8(src + (i + 8) * stride));
    }
    __m128i b[8];
    for (int i = 0; i < 4; ++i) {
        b[2 * i] = _mm_unpacklo_epi8(a[i], a[i + 4]);
        b[2 * i + 1] = _mm_unpackhi_epi8(a[i], a[i + 4]);
    }
    // b[2i + h]: rows i, i + 4, i + 8, i + 12 of columns 4h..4h + 3.
    __m128i columns[8];
    for (int h = 0; h < 2; ++h) {
        const __m128i even_low = _mm_unpacklo_epi8(b[h], b[4 + h]);
        const __m128i even_high = _mm_unpackhi_epi8(b[h], b[4 + h]);
        const __m128i odd_low = _mm_unpacklo_epi8(b[2 + h], b[6 + h]);
        const __m128i odd_high = _mm_unpackhi_epi8(b[2 + h], b[6 + h]);
        columns[4 * h] = _mm_unpacklo_epi8(even_low, odd_low);
        columns[4 * h + 1] = _mm_unpackhi_epi8(even_low, odd_low);
        columns[4 * h + 2] = _mm_unpacklo_epi8(even_high, odd_high);
        columns[4 * h + 3] = _mm_unpackhi_epi8(even_high, odd_high);
    }
    const auto lanes = [&](int i) { return Lanes{_mm256_cvtepu8_epi16(columns[i])}; };
    return {lanes(0), lanes(1), lanes(2), lanes(3), lanes(4), lanes(5), lanes(6), lanes(7)};
}

// The samples of 16 lines at two places of the edge, one in each half.
__m256i two_samples(Lanes a, Lanes b) {
    return _mm256_permute4x64_epi64(_mm256_packus_epi16(a.v, b.v), _MM_SHUFFLE(3, 1, 2, 0));
}

// Stores columns n, n + 1, n + 2 and n + 3 of 16 lines.
void store_four_columns(uint8_t* p, ptrdiff_t stride, __m256i first, __m256i last) {
    const __m128i low_01 = _mm_unpacklo_epi8(low_lane(first), high_lane(first));
    const __m128i high_01 = _mm_unpackhi_epi8(low_lane(first), high_lane(first));
    const __m128i low_23 = _mm_unpacklo_epi8(low_lane(last), high_lane(last));
    const __m128i high_23 = _mm_unpackhi_epi8(low_lane(last), high_lane(last));
    const __m128i lines[4] = {
        _mm_unpacklo_epi16(low_01, low_23), _mm_unpackhi_epi16(low_01, low_23),
        _mm_unpacklo_epi16(high_01, high_23), _mm_unpackhi_epi16(high_01, high_23)};
    for (int i = 0; i < 4; ++i, p += 4 * stride) {
        const int32_t samples[4] = {_mm_cvtsi128_si32(lines[i]), _mm_extract_epi32(lines[i], 1),
                                    _mm_extract_epi32(lines[i], 2), _mm_extract_epi32(lines[i], 3)};
        for (int y = 0; y < 4; ++y) {
            __builtin_memcpy(p + y * stride, samples + y, sizeof *samples);
        }
    }
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    LumaLines lines = luma_rows(pix, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        lines.p1.store(pix - 2 * stride);
        lines.p0.store(pix - stride);
        lines.q0.store(pix);
        lines.q1.store(pix + stride);
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    LumaLines lines = luma_rows(pix, stride);
    if (lines.filter_strong(alpha, beta)) {
        lines.p2.store(pix - 3 * stride);
        lines.p1.store(pix - 2 * stride);
        lines.p0.store(pix - stride);
        lines.q0.store(pix);
        lines.q1.store(pix + stride);
        lines.q2.store(pix + 2 * stride);
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    LumaLines lines = luma_columns(pix, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_four_columns(pix - 2, stride, two_samples(lines.p1, lines.p0),
                           two_samples(lines.q0, lines.q1));
    }
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    LumaLines lines = luma_columns(pix, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_four_columns(pix - 4, stride, two_samples(lines.p3, lines.p2),
                           two_samples(lines.p1, lines.p0));
        store_four_columns(pix, stride, two_samples(lines.q0, lines.q1),
                           two_samples(lines.q2, lines.q3));
    }
}

// The samples p1, p0, q0, q1 around a chroma edge: eight lines of Cb, then of Cr.
struct ChromaLines {
    Lanes p1, p0, q0, q1;

    bool filter(int alpha, int beta, const int8_t* tc0, uint32_t strengths) {
        return filter_chroma(
            p1, p0, q0, q1, alpha, beta,
            line_tc0(tc0, strengths,
                     _mm_setr_epi8(0, 0, 1, 1, 2, 2, 3, 3, 0, 0, 1, 1, 2, 2, 3, 3)));
    }
    bool filter_strong(int alpha, int beta) {
        return filter_chroma_strong(p1, p0, q0, q1, alpha, beta);
    }
};

ChromaLines chroma_rows(const uint8_t* u, const uint8_t* v, ptrdiff_t stride) {
    const auto row = [=](int y) {
        const __m128i samples = _mm_unpacklo_epi64(load_8(u + y * stride), load_8(v + y * stride));
        return Lanes{_mm256_cvtepu8_epi16(samples)};
    };
    return {row(-2), row(-1), row(0), row(1)};
}

void store_chroma_rows(const ChromaLines& lines, uint8_t* u, uint8_t* v, ptrdiff_t stride) {
    // p0 and q0 of Cb in the low lane, of Cr in the high one.
    const __m256i samples = _mm256_packus_epi16(lines.p0.v, lines.q0.v);
    store_8(u - stride, low_lane(samples));
    store_8(u, _mm_srli_si128(low_lane(samples), 8));
    store_8(v - stride, high_lane(samples));
    store_8(v, _mm_srli_si128(high_lane(samples), 8));
}

// Columns p1..q1 of four lines, one after the other.
__m128i four_lines(const uint8_t* p, ptrdiff_t stride) {
    const auto line = [=](int y) {
        int32_t samples;
        __builtin_memcpy(&samples, p + y * stride, sizeof samples);
        return samples;
    };
    const __m128i lines = _mm_insert_epi32(
        _mm_insert_epi32(_mm_insert_epi32(_mm_cvtsi32_si128(line(0)), line(1), 1), line(2), 2),
        line(3), 3);
    return _mm_shuffle_epi8(lines,
                            _mm_setr_epi8(0, 4, 8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15));
}

ChromaLines chroma_columns(const uint8_t* u, const uint8_t* v, ptrdiff_t stride) {
    const __m128i u0 = four_lines(u - 2, stride), u4 = four_lines(u - 2 + 4 * stride, stride);
    const __m128i v0 = four_lines(v - 2, stride), v4 = four_lines(v - 2 + 4 * stride, stride);
    const __m128i u_p = _mm_unpacklo_epi32(u0, u4), u_q = _mm_unpackhi_epi32(u0, u4);
    const __m128i v_p = _mm_unpacklo_epi32(v0, v4), v_q = _mm_unpackhi_epi32(v0, v4);
    return {{_mm256_cvtepu8_epi16(_mm_unpacklo_epi64(u_p, v_p))},
            {_mm256_cvtepu8_epi16(_mm_unpackhi_epi64(u_p, v_p))},
            {_mm256_cvtepu8_epi16(_mm_unpacklo_epi64(u_q, v_q))},
            {_mm256_cvtepu8_epi16(_mm_unpackhi_epi64(u_q, v_q))}};
}

// Stores the eight pairs of samples in `pairs`, one a line.
void store_pairs(uint8_t* p, ptrdiff_t stride, __m128i pairs) {
    alignas(16) uint16_t values[8];
    _mm_store_si128(reinterpret_cast<__m128i*>(values), pairs);
    for (int y = 0; y < 8; ++y) {
        __builtin_memcpy(p + y * stride, values + y, sizeof *values);
    }
}

void store_chroma_columns(const ChromaLines& lines, uint8_t* u, uint8_t* v, ptrdiff_t stride) {
    const __m256i samples = _mm256_packus_epi16(lines.p0.v, lines.q0.v);
    const __m256i pairs = _mm256_unpacklo_epi8(samples, _mm256_srli_si256(samples, 8));
    store_pairs(u - 1, stride, low_lane(pairs));
    store_pairs(v - 1, stride, high_lane(pairs));
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    ChromaLines lines = chroma_rows(u, v, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_chroma_rows(lines, u, v, stride);
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    ChromaLines lines = chroma_rows(u, v, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_chroma_rows(lines, u, v, stride);
    }
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    ChromaLines lines = chroma_columns(u, v, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_chroma_columns(lines, u, v, stride);
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    ChromaLines lines = chroma_columns(u, v, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_chroma_columns(lines, u, v, stride);
    }
}

}  // namespace

Kernels with_avx2(const Kernels& base) {
    Kernels k = base;
    k.name = "avx2";
    k.arrange_block = arrange_block;
    k.phase_sads = phase_sads;
    k.phase_sads_average = phase_sads_average;
    k.first_phases_below_x4 = first_phases_below_x4;
    k.first_phases_below_half = first_phases_below_half;
    k.first_phases_below_star = first_phases_below_star;
    k.first_phases_below_cross = first_phases_below_cross;
    k.half_vertical_row = half_vertical_row;
    k.half_horizontal_row = half_horizontal_row;
    k.copy_16x16 = copy_16x16;
    k.average_16x16 = average_16x16;
    k.centre_16x16 = centre_16x16;
    k.chroma_8x8 = chroma_8x8;
    k.code_residual_16x16 = code_residual_16x16;
    k.code_residual_8x8 = code_residual_8x8;
    k.code_residual_4x4 = code_residual_4x4;
    k.reconstruct_16x16 = reconstruct_16x16;
    k.reconstruct_8x8 = reconstruct_8x8;
    k.block_sums = block_sums;
    k.hadamard_energy = hadamard_energy;
    k.intra_4x4_modes = intra_4x4_modes;
    k.deblock_luma_vertical = deblock_luma_vertical;
    k.deblock_luma_horizontal = deblock_luma_horizontal;
    k.deblock_chroma_vertical = deblock_chroma_vertical;
    k.deblock_chroma_horizontal = deblock_chroma_horizontal;
    k.deblock_luma_vertical_strong = deblock_luma_vertical_strong;
    k.deblock_luma_horizontal_strong = deblock_luma_horizontal_strong;
    k.deblock_chroma_vertical_strong = deblock_chroma_vertical_strong;
    k.deblock_chroma_horizontal_strong = deblock_chroma_horizontal_strong;
    return k;
}

}  // namespace zolt
