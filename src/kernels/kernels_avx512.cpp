// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file, so
// that no inline function that other files share is emitted with instructions that an older
// processor lacks. Entries that gain little by wider vectors are left to the AVX2 table, among them
// those whose time is that of loading their candidates, 16 samples at a time.
#include <immintrin.h>

#include "kernels/x86_tables.h"
#include "kernels/zigzag.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::ptrdiff_t;
using std::uint16_t;
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
void store_32(void* p, __m256i v) {
    _mm256_storeu_si256(static_cast<__m256i*>(p), v);
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

// ---- Residual ----

// Samples of rows y and y + 4 of a 16x16 block, in the halves.
__m512i two_rows(const uint8_t* row, ptrdiff_t stride) {
    return _mm512_cvtepu8_epi16(join(load_16(row), load_16(row + 4 * stride)));
}

// Forward core transform across four vectors.
void forward_butterfly(__m512i* v) {
    const __m512i s = _mm512_add_epi16(v[0], v[3]);
    const __m512i d = _mm512_sub_epi16(v[0], v[3]);
    const __m512i t = _mm512_add_epi16(v[1], v[2]);
    const __m512i u = _mm512_sub_epi16(v[1], v[2]);
    v[0] = _mm512_add_epi16(s, t);
    v[1] = _mm512_add_epi16(_mm512_add_epi16(d, d), u);
    v[2] = _mm512_sub_epi16(s, t);
    v[3] = _mm512_sub_epi16(d, _mm512_add_epi16(u, u));
}

// Inverse core transform across four vectors.
void inverse_butterfly(__m512i* v) {
    const __m512i e = _mm512_add_epi16(v[0], v[2]);
    const __m512i f = _mm512_sub_epi16(v[0], v[2]);
    const __m512i g = _mm512_sub_epi16(_mm512_srai_epi16(v[1], 1), v[3]);
    const __m512i h = _mm512_add_epi16(v[1], _mm512_srai_epi16(v[3], 1));
    v[0] = _mm512_add_epi16(e, h);
    v[1] = _mm512_add_epi16(f, g);
    v[2] = _mm512_sub_epi16(f, g);
    v[3] = _mm512_sub_epi16(e, h);
}

// Transposes the eight 4x4 blocks that stand side by side in four vectors.
void transpose_eight(__m512i* v) {
    const __m512i a = _mm512_unpacklo_epi16(v[0], v[1]);
    const __m512i b = _mm512_unpackhi_epi16(v[0], v[1]);
    const __m512i c = _mm512_unpacklo_epi16(v[2], v[3]);
    const __m512i d = _mm512_unpackhi_epi16(v[2], v[3]);
    const __m512i even_01 = _mm512_unpacklo_epi32(a, c);
    const __m512i even_23 = _mm512_unpackhi_epi32(a, c);
    const __m512i odd_01 = _mm512_unpacklo_epi32(b, d);
    const __m512i odd_23 = _mm512_unpackhi_epi32(b, d);
    v[0] = _mm512_unpacklo_epi64(even_01, odd_01);
    v[1] = _mm512_unpackhi_epi64(even_01, odd_01);
    v[2] = _mm512_unpacklo_epi64(even_23, odd_23);
    v[3] = _mm512_unpackhi_epi64(even_23, odd_23);
}

// Two blocks in zig-zag order, taken from a vector of their columns 0 and 1 and one of their
// columns 2 and 3, which have the blocks in lanes 0 and 2: indices of 16-bit values.
struct ZigzagIndices {
    alignas(64) int16_t index[32];
};
constexpr ZigzagIndices zigzag_indices() {
    ZigzagIndices indices{};
    for (int i = 0; i < 32; ++i) {
        const int block = i / 16, position = kZigzag[i % 16];
        indices.index[i] = static_cast<int16_t>(32 * (position / 8) + 16 * block + position % 8);
    }
    return indices;
}
constexpr ZigzagIndices kZigzagIndices = zigzag_indices();

// Column j of a quantiser's 16 values, for every block.
__m512i column(const int16_t* values, int j) {
    return _mm512_broadcastq_epi64(
        _mm_loadl_epi64(reinterpret_cast<const __m128i*>(values + 4 * j)));
}

// Levels of column j of the blocks.
__m512i quantize(__m512i c, const Quantizer& quantizer, int j) {
    const __m512i forward = column(quantizer.forward, j);
    const __m512i rounding = _mm512_set1_epi32(quantizer.rounding);
    const __m128i shift = _mm_cvtsi32_si128(quantizer.shift);
    const __m512i magnitude = _mm512_abs_epi16(c);
    const __m512i low = _mm512_mullo_epi16(magnitude, forward);
    const __m512i high = _mm512_mulhi_epu16(magnitude, forward);
    const __m512i first =
        _mm512_srl_epi32(_mm512_add_epi32(_mm512_unpacklo_epi16(low, high), rounding), shift);
    const __m512i second =
        _mm512_srl_epi32(_mm512_add_epi32(_mm512_unpackhi_epi16(low, high), rounding), shift);
    const __m512i level =
        _mm512_min_epi16(_mm512_packs_epi32(first, second), _mm512_set1_epi16(kMaxLevel));
    return _mm512_mask_sub_epi16(level, _mm512_movepi16_mask(c), _mm512_setzero_si512(), level);
}

// Codes the eight blocks of two block rows from the rows of their residual. Returns the mask of the
// coded ones. In decoding order (Figure 6-10) the blocks of the upper row, in the low half, are 0,
// 1, 4, 5, those of the lower one 2, 3, 6, 7.
uint32_t code_eight(__m512i* v, const Quantizer& quantizer, int16_t* dc, int16_t* coefs,
                    int16_t* scan, uint16_t* nonzero) {
    forward_butterfly(v);
    transpose_eight(v);
    forward_butterfly(v);  // now vector j holds column j, 64 bits a block
    if (dc) {
        store_16(dc, _mm_shuffle_epi32(_mm512_cvtepi64_epi16(v[0]), _MM_SHUFFLE(3, 1, 2, 0)));
        v[0] = _mm512_maskz_mov_epi16(0xeeeeeeee, v[0]);
        for (int b = 0; b < 8; b += 2) {
            store_64(coefs + 16 * b, _mm512_setzero_si512());
        }
    }
    store_16(nonzero, _mm_setzero_si128());
    __mmask32 beyond = 0;
    for (int j = 0; j < 4; ++j) {
        beyond |= _mm512_cmpgt_epi16_mask(_mm512_abs_epi16(v[j]), column(quantizer.dead_zone, j));
    }
    if (beyond == 0) {
        return 0;
    }
    __m512i levels[4], scaled[4];
    for (int j = 0; j < 4; ++j) {
        levels[j] = quantize(v[j], quantizer, j);
        scaled[j] = _mm512_mullo_epi16(levels[j], column(quantizer.dequant, j));
    }
    uint32_t coded = 0;
    const auto store_block = [&](int b, uint32_t mask, __m256i block_coefs, __m256i block_scan) {
        if (mask != 0) {
            nonzero[b] = static_cast<uint16_t>(mask);
            store_32(coefs + 16 * b, block_coefs);
            store_32(scan + 16 * b, block_scan);
            coded |= 1u << b;
        }
    };
    for (int odd = 0; odd < 2; ++odd) {
        // Columns 0 and 1, and 2 and 3, of blocks 0, 4, 2, 6, or of 1, 5, 3, 7.
        const auto two_columns = [=](__m512i left, __m512i right) {
            return odd ? _mm512_unpackhi_epi64(left, right) : _mm512_unpacklo_epi64(left, right);
        };
        const __m512i levels_01 = two_columns(levels[0], levels[1]);
        const __m512i levels_23 = two_columns(levels[2], levels[3]);
        const __m512i scaled_01 = two_columns(scaled[0], scaled[1]);
        const __m512i scaled_23 = two_columns(scaled[2], scaled[3]);
        for (int lane = 0; lane < 2; ++lane) {
            const __m512i zigzag = _mm512_add_epi16(
                load_64(kZigzagIndices.index), _mm512_set1_epi16(static_cast<short>(8 * lane)));
            const __m512i by_column = _mm512_add_epi64(_mm512_setr_epi64(0, 1, 8, 9, 4, 5, 12, 13),
                                                       _mm512_set1_epi64(2 * lane));
            const __m512i in_order = _mm512_permutex2var_epi16(levels_01, zigzag, levels_23);
            const __m512i blocks = _mm512_permutex2var_epi64(scaled_01, by_column, scaled_23);
            const uint32_t mask = _mm512_test_epi16_mask(in_order, in_order);
            const int b = 4 * lane + odd;
            store_block(b, mask & 0xffff, low_half(blocks), low_half(in_order));
            store_block(b + 2, mask >> 16, high_half(blocks), high_half(in_order));
        }
    }
    return coded;
}

uint32_t code_residual_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                             const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                             uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int first = 0; first < 16; first += 8, src += 8 * stride, pred += 128) {
        __m512i v[4];
        for (int y = 0; y < 4; ++y) {
            v[y] =
                _mm512_sub_epi16(two_rows(src + y * stride, stride), two_rows(pred + 16 * y, 16));
        }
        coded |= code_eight(v, quantizer, dc ? dc + first : nullptr, coefs + 16 * first,
                            scan + 16 * first, nonzero + first)
                 << first;
    }
    return coded;
}

// Rows of the residual of eight blocks that stand in decoding order, as code_eight takes them.
// Returns false when 16-bit sums might not be exact: no sum of the inverse transform, rounding
// included, exceeds the sum of a block's magnitudes.
[[gnu::always_inline]] inline bool inverse_eight(const __m512i* b, __m512i* rows) {
    const __m512i first = _mm512_setr_epi64(0, 4, 8, 12, 1, 5, 9, 13);
    const __m512i last = _mm512_setr_epi64(2, 6, 10, 14, 3, 7, 11, 15);
    const __m512i upper_01 = _mm512_permutex2var_epi64(b[0], first, b[2]);
    const __m512i upper_23 = _mm512_permutex2var_epi64(b[0], last, b[2]);
    const __m512i lower_01 = _mm512_permutex2var_epi64(b[1], first, b[3]);
    const __m512i lower_23 = _mm512_permutex2var_epi64(b[1], last, b[3]);
    constexpr int kLow = _MM_SHUFFLE(1, 0, 1, 0), kHigh = _MM_SHUFFLE(3, 2, 3, 2);
    rows[0] = _mm512_shuffle_i64x2(upper_01, lower_01, kLow);
    rows[1] = _mm512_shuffle_i64x2(upper_01, lower_01, kHigh);
    rows[2] = _mm512_shuffle_i64x2(upper_23, lower_23, kLow);
    rows[3] = _mm512_shuffle_i64x2(upper_23, lower_23, kHigh);
    __m512i sum = _mm512_setzero_si512();
    for (int j = 0; j < 4; ++j) {
        sum = _mm512_adds_epi16(sum, _mm512_abs_epi16(rows[j]));
    }
    sum = _mm512_adds_epi16(sum, _mm512_shuffle_epi32(sum, _MM_PERM_CDAB));
    sum = _mm512_adds_epi16(sum, _mm512_rol_epi32(sum, 16));
    if (_mm512_cmpgt_epi16_mask(sum, _mm512_set1_epi16(32767 - 32)) != 0) {
        return false;
    }
    inverse_butterfly(rows);
    transpose_eight(rows);
    inverse_butterfly(rows);
    for (int y = 0; y < 4; ++y) {
        rows[y] = _mm512_srai_epi16(_mm512_add_epi16(rows[y], _mm512_set1_epi16(32)), 6);
    }
    return true;
}

void reconstruct_16x16(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                       ptrdiff_t stride) {
    constexpr __mmask8 kBlocks[4] = {0, 0x0f, 0xf0, 0xff};
    for (int first = 0; first < 16; first += 8) {
        const uint8_t* half_pred = pred + 16 * first;
        uint8_t* half_dst = dst + first * stride;
        if ((mask >> first & 0xff) == 0) {
            for (int y = 0; y < 8; ++y) {
                store_16(half_dst + y * stride, load_16(half_pred + 16 * y));
            }
            continue;
        }
        __m512i blocks[4], rows[4];
        for (int i = 0; i < 4; ++i) {
            const int b = first + 2 * i;
            blocks[i] = _mm512_maskz_loadu_epi64(kBlocks[mask >> b & 3], coefs + 16 * b);
        }
        if (!inverse_eight(blocks, rows)) {
            scalar_kernels().reconstruct_16x16(coefs, mask, pred, dst, stride);
            return;
        }
        for (int y = 0; y < 4; ++y) {
            const __m256i samples =
                to_samples(_mm512_add_epi16(rows[y], two_rows(half_pred + 16 * y, 16)));
            store_16(half_dst + y * stride, _mm256_castsi256_si128(samples));
            store_16(half_dst + (y + 4) * stride, _mm256_extracti128_si256(samples, 1));
        }
    }
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
    k.code_residual_16x16 = code_residual_16x16;
    k.reconstruct_16x16 = reconstruct_16x16;
    return k;
}

}  // namespace zolt
