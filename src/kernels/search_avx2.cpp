// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h, so that no
// inline function that other files share is emitted with instructions that an older processor
// lacks.
#include "kernels/avx2.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

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

}  // namespace

void avx2::fill_search(Kernels& table) {
    table.arrange_block = arrange_block;
    table.phase_sads = phase_sads;
    table.phase_sads_average = phase_sads_average;
    table.first_phases_below_x4 = first_phases_below_x4;
    table.first_phases_below_half = first_phases_below_half;
    table.first_phases_below_star = first_phases_below_star;
    table.first_phases_below_cross = first_phases_below_cross;
}

}  // namespace zolt
