#include "kernels/families.h"
#include "kernels/sse2.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

__m128i even_columns() {
    return _mm_set1_epi16(0x00ff);
}

// A checkerboard row from an even row and the odd row below it.
__m128i checkerboard(__m128i even, __m128i odd) {
    return _mm_or_si128(_mm_and_si128(even, even_columns()), _mm_andnot_si128(even_columns(), odd));
}
__m128i checkerboard(const uint8_t* row, ptrdiff_t stride) {
    return checkerboard(load(row), load(row + stride));
}

// Where row n of an arranged block's samples and of its checkerboard stands.
constexpr int block_row(int n) {
    return 32 * (n & 7) + 16 * (n >> 3);
}
constexpr int checkerboard_row(int n) {
    return 256 + 32 * (n & 3) + 16 * (n >> 2);
}

void arrange_block(const uint8_t* src, ptrdiff_t stride, uint8_t* block) {
    for (int n = 0; n < 8; ++n) {
        const __m128i even = load(src + 2 * n * stride);
        const __m128i odd = load(src + (2 * n + 1) * stride);
        store(block + block_row(2 * n), even);
        store(block + block_row(2 * n + 1), odd);
        store(block + checkerboard_row(n), checkerboard(even, odd));
    }
}

int add_halves(__m128i sum) {
    return _mm_cvtsi128_si32(_mm_add_epi32(sum, _mm_srli_si128(sum, 8)));
}

// row(n): row n of what the block is compared with.
template <typename Row>
void add_phases(const uint8_t* block, Row row, int* sums) {
    __m128i all[2], even[2];  // all and the even columns, of even and of odd rows
    for (int parity = 0; parity < 2; ++parity) {
        all[parity] = even[parity] = _mm_setzero_si128();
        for (int n = parity; n < 16; n += 2) {
            const __m128i a = load_aligned(block + block_row(n));
            const __m128i b = row(n);
            all[parity] = _mm_add_epi32(all[parity], _mm_sad_epu8(a, b));
            even[parity] = _mm_add_epi32(
                even[parity],
                _mm_sad_epu8(_mm_and_si128(a, even_columns()), _mm_and_si128(b, even_columns())));
        }
    }
    sums[0] = add_halves(even[0]);
    sums[2] = sums[0] + add_halves(all[1]);
    sums[1] = sums[2] - add_halves(even[1]);
    sums[3] = add_halves(all[0]) + sums[2] - sums[0];
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(
        block, [=](int n) { return load(ref + n * stride); }, sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(
        block, [=](int n) { return _mm_avg_epu8(load(a + n * stride), load(b + n * stride)); },
        sums);
}

// Whether the SAD of the checkerboard and rows(n), row n of another one, is below the limit.
template <typename Rows>
bool first_phases_below(const uint8_t* block, Rows rows, int32_t limit) {
    __m128i sum = _mm_setzero_si128();
    for (int n = 0; n < 8; ++n) {
        sum = _mm_add_epi32(sum, _mm_sad_epu8(load_aligned(block + checkerboard_row(n)), rows(n)));
    }
    return add_halves(sum) < limit;
}

template <int kCount>
uint32_t first_phases_below(const uint8_t* block, const uint8_t* const* refs, ptrdiff_t stride,
                            const int32_t* limits) {
    uint32_t below = 0;
    for (int i = 0; i < kCount; ++i) {
        const auto rows = [=](int n) { return checkerboard(refs[i] + 2 * n * stride, stride); };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

uint32_t first_phases_below_half(const uint8_t* block, const HalfSamples& at, ptrdiff_t stride,
                                 const int32_t* limits) {
    const uint8_t* refs[8];
    half_candidates(at, stride, refs);
    return first_phases_below<8>(block, refs, stride, limits);
}

void gather_checkerboard(const uint8_t* src, ptrdiff_t stride, __m128i* rows) {
    for (int n = 0; n < 8; ++n) {
        rows[n] = checkerboard(src + 2 * n * stride, stride);
    }
}

uint32_t first_phases_below_star(const uint8_t* block, const uint8_t* centre,
                                 const uint8_t* const* refs, ptrdiff_t stride,
                                 const int32_t* limits) {
    __m128i c[8];
    gather_checkerboard(centre, stride, c);
    uint32_t below = 0;
    for (int i = 0; i < 8; ++i) {
        const auto rows = [&](int n) {
            return _mm_avg_epu8(c[n], checkerboard(refs[i] + 2 * n * stride, stride));
        };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    __m128i boards[5][8];  // the four, and the centre
    for (int i = 0; i < 4; ++i) {
        gather_checkerboard(refs[i], stride, boards[i]);
    }
    gather_checkerboard(centre, stride, boards[4]);
    uint32_t below = 0;
    for (int i = 0; i < 8; ++i) {
        const __m128i* a = boards[i < 4 ? 4 : kCrossPairs[i - 4][0]];
        const __m128i* b = boards[i < 4 ? i : kCrossPairs[i - 4][1]];
        const auto rows = [=](int n) { return _mm_avg_epu8(a[n], b[n]); };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

}  // namespace

void sse2::fill_search(Kernels& table) {
    table.arrange_block = arrange_block;
    table.phase_sads = phase_sads;
    table.phase_sads_average = phase_sads_average;
    table.first_phases_below_x4 = first_phases_below<4>;
    table.first_phases_below_half = first_phases_below_half;
    table.first_phases_below_star = first_phases_below_star;
    table.first_phases_below_cross = first_phases_below_cross;
}

}  // namespace zolt
