// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file and
// of avx512.h, so that no inline function that other files share is emitted with instructions that
// an older processor lacks.
#include "kernels/avx512.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

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

// Packs four vectors of 64-bit sums: sum n in 16-bit lane n of every 64 bits. They are below 2^13,
// so that the eight of a vector, added later, stay below 2^16.
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

}  // namespace

void avx512::fill_search(Kernels& table) {
    table.phase_sads = phase_sads;
    table.phase_sads_average = phase_sads_average;
    table.first_phases_below_cross = first_phases_below_cross;
}

}  // namespace zolt
