#include <cstring>

#include "kernels/chroma_dc.h"
#include "kernels/families.h"
#include "kernels/hadamard_simd.h"
#include "kernels/sse2.h"
#include "kernels/zigzag.h"

namespace zolt {
namespace {

using std::int16_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

// Forward core transform across four vectors.
void forward_butterfly(__m128i* v) {
    const __m128i s = _mm_add_epi16(v[0], v[3]);
    const __m128i d = _mm_sub_epi16(v[0], v[3]);
    const __m128i t = _mm_add_epi16(v[1], v[2]);
    const __m128i u = _mm_sub_epi16(v[1], v[2]);
    v[0] = _mm_add_epi16(s, t);
    v[1] = _mm_add_epi16(_mm_add_epi16(d, d), u);
    v[2] = _mm_sub_epi16(s, t);
    v[3] = _mm_sub_epi16(d, _mm_add_epi16(u, u));
}

// Inverse core transform across four vectors.
void inverse_butterfly(__m128i* v) {
    const __m128i e = _mm_add_epi16(v[0], v[2]);
    const __m128i f = _mm_sub_epi16(v[0], v[2]);
    const __m128i g = _mm_sub_epi16(_mm_srai_epi16(v[1], 1), v[3]);
    const __m128i h = _mm_add_epi16(v[1], _mm_srai_epi16(v[3], 1));
    v[0] = _mm_add_epi16(e, h);
    v[1] = _mm_add_epi16(f, g);
    v[2] = _mm_sub_epi16(f, g);
    v[3] = _mm_sub_epi16(e, h);
}

// Transposes the two 4x4 blocks that stand side by side in four vectors.
void transpose_two(__m128i* v) {
    const __m128i a = _mm_unpacklo_epi16(v[0], v[1]);
    const __m128i b = _mm_unpackhi_epi16(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi16(v[2], v[3]);
    const __m128i d = _mm_unpackhi_epi16(v[2], v[3]);
    const __m128i first_01 = _mm_unpacklo_epi32(a, c);
    const __m128i first_23 = _mm_unpackhi_epi32(a, c);
    const __m128i second_01 = _mm_unpacklo_epi32(b, d);
    const __m128i second_23 = _mm_unpackhi_epi32(b, d);
    v[0] = _mm_unpacklo_epi64(first_01, second_01);
    v[1] = _mm_unpackhi_epi64(first_01, second_01);
    v[2] = _mm_unpacklo_epi64(first_23, second_23);
    v[3] = _mm_unpackhi_epi64(first_23, second_23);
}

// Sample offsets of the pair of blocks 2n, 2n + 1 in decoding order (Figure 6-10).
constexpr int pair_x(int n) {
    return 8 * (n >> 1 & 1);
}
constexpr int pair_y(int n) {
    return 4 * (n & 1) + 8 * (n >> 2);
}

// Levels and scaled coefficients of eight coefficients.
void quantize_eight(__m128i c, const int16_t* forward, const int16_t* dequant, __m128i rounding,
                    __m128i shift, __m128i* levels, __m128i* scaled) {
    const __m128i magnitude = absolute_16(c);
    const __m128i factor = load_aligned(forward);
    const __m128i low = _mm_mullo_epi16(magnitude, factor);
    const __m128i high = _mm_mulhi_epu16(magnitude, factor);
    const __m128i first =
        _mm_srl_epi32(_mm_add_epi32(_mm_unpacklo_epi16(low, high), rounding), shift);
    const __m128i second =
        _mm_srl_epi32(_mm_add_epi32(_mm_unpackhi_epi16(low, high), rounding), shift);
    const __m128i level = _mm_min_epi16(_mm_packs_epi32(first, second), _mm_set1_epi16(kMaxLevel));
    const __m128i sign = _mm_srai_epi16(c, 15);
    *levels = _mm_sub_epi16(_mm_xor_si128(level, sign), sign);
    *scaled = _mm_mullo_epi16(*levels, load_aligned(dequant));
}

// Mask of the 16-bit values of two vectors that are not 0.
uint32_t nonzero_16(__m128i a, __m128i b) {
    const __m128i zeros = _mm_cmpeq_epi8(_mm_packs_epi16(a, b), _mm_setzero_si128());
    return ~static_cast<uint32_t>(_mm_movemask_epi8(zeros)) & 0xffff;
}

// Quantises a block that has a coefficient beyond the dead zone; returns the mask of its levels,
// and in bit 16 whether one of them is beyond 1.
uint32_t quantize_block(__m128i c0, __m128i c1, const Quantizer& quantizer, int16_t* coefs,
                        int16_t* scan) {
    const __m128i rounding = _mm_set1_epi32(quantizer.rounding);
    const __m128i shift = _mm_cvtsi32_si128(quantizer.shift);
    alignas(16) int16_t levels[16];
    __m128i level0, level1, scaled0, scaled1;
    quantize_eight(c0, quantizer.forward, quantizer.dequant, rounding, shift, &level0, &scaled0);
    quantize_eight(c1, quantizer.forward + 8, quantizer.dequant + 8, rounding, shift, &level1,
                   &scaled1);
    store(levels, level0);
    store(levels + 8, level1);
    store(coefs, scaled0);
    store(coefs + 8, scaled1);
    for (int n = 0; n < 16; ++n) {
        scan[n] = levels[kZigzag[n]];
    }
    const __m128i one = _mm_set1_epi16(1);
    const __m128i large = _mm_or_si128(_mm_cmpgt_epi16(absolute_16(level0), one),
                                       _mm_cmpgt_epi16(absolute_16(level1), one));
    return nonzero_16(load(scan), load(scan + 8)) | (_mm_movemask_epi8(large) != 0 ? 0x10000u : 0);
}

uint32_t code_luma_dc(const int16_t* dc, const Quantizer& quantizer, int16_t* coefs,
                      int16_t* scan) {
    // Block rows of the macroblock: in decoding order blocks 0, 1, 4, 5 and 2, 3, 6, 7 stand side
    // by side.
    const __m128i upper = _mm_shuffle_epi32(load(dc), _MM_SHUFFLE(3, 1, 2, 0));
    const __m128i lower = _mm_shuffle_epi32(load(dc + 8), _MM_SHUFFLE(3, 1, 2, 0));
    const auto low_32 = [](__m128i x) { return _mm_srai_epi32(_mm_unpacklo_epi16(x, x), 16); };
    const auto high_32 = [](__m128i x) { return _mm_srai_epi32(_mm_unpackhi_epi16(x, x), 16); };
    __m128i v[4] = {low_32(upper), high_32(upper), low_32(lower), high_32(lower)};
    hadamard_4x4(v);  // now vector j holds column j

    // 16-bit factors of values that have 16 bits, the sign included: products of pairs with 0.
    const __m128i forward = _mm_set1_epi32(quantizer.forward[0]);
    const __m128i dequant = _mm_set1_epi32(quantizer.dequant[0]);
    const __m128i rounding = _mm_set1_epi32(2 * quantizer.rounding);
    const __m128i shift = _mm_cvtsi32_si128(quantizer.shift + 1);
    const __m128i largest = _mm_set1_epi32(kMaxLevel);
    alignas(16) int16_t levels[16];
    for (int j = 0; j < 4; j += 2) {
        __m128i level[2];
        for (int i = 0; i < 2; ++i) {
            const __m128i c = _mm_srai_epi32(v[j + i], 1);
            const __m128i sign = _mm_srai_epi32(c, 31);
            const __m128i magnitude = _mm_min_epi16(
                _mm_srl_epi32(_mm_add_epi32(_mm_madd_epi16(absolute_32(c), forward), rounding),
                              shift),
                largest);
            const __m128i scaled = _mm_madd_epi16(magnitude, dequant);
            level[i] = _mm_sub_epi32(_mm_xor_si128(magnitude, sign), sign);
            v[j + i] = _mm_sub_epi32(_mm_xor_si128(scaled, sign), sign);
        }
        store(levels + 4 * j, _mm_packs_epi32(level[0], level[1]));
    }
    for (int n = 0; n < 16; ++n) {
        scan[n] = levels[kZigzag[n]];
    }

    hadamard_4x4(v);
    for (__m128i& row : v) {
        row = _mm_srai_epi32(_mm_add_epi32(row, _mm_set1_epi32(2)), 2);
    }
    const __m128i values[2] = {
        _mm_shuffle_epi32(_mm_packs_epi32(v[0], v[1]), _MM_SHUFFLE(3, 1, 2, 0)),
        _mm_shuffle_epi32(_mm_packs_epi32(v[2], v[3]), _MM_SHUFFLE(3, 1, 2, 0))};
    alignas(16) int16_t in_order[16];
    store(in_order, values[0]);
    store(in_order + 8, values[1]);
    for (int k = 0; k < 16; ++k) {
        coefs[16 * k] = in_order[k];
    }
    return nonzero_16(load(scan), load(scan + 8)) | nonzero_16(values[0], values[1]) << 16;
}

// Whether a level of the block is not 0.
bool leaves_dead_zone(__m128i c0, __m128i c1, const Quantizer& quantizer) {
    const __m128i beyond =
        _mm_or_si128(_mm_cmpgt_epi16(absolute_16(c0), load_aligned(quantizer.dead_zone)),
                     _mm_cmpgt_epi16(absolute_16(c1), load_aligned(quantizer.dead_zone + 8)));
    return _mm_movemask_epi8(beyond) != 0;
}

void clear_block(int16_t* block) {
    store(block, _mm_setzero_si128());
    store(block + 8, _mm_setzero_si128());
}

// Codes two blocks side by side; dc, coefs, scan and nonzero are those of the first. Returns what
// code_residual_16x16 does.
uint32_t code_two(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred, ptrdiff_t pred_stride,
                  const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                  uint16_t* nonzero) {
    __m128i v[4];
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm_sub_epi16(widen_low(load_8(src + y * stride)),
                             widen_low(load_8(pred + y * pred_stride)));
    }
    forward_butterfly(v);
    transpose_two(v);
    forward_butterfly(v);
    if (dc) {
        dc[0] = static_cast<int16_t>(_mm_extract_epi16(v[0], 0));
        dc[1] = static_cast<int16_t>(_mm_extract_epi16(v[0], 4));
        v[0] = _mm_and_si128(v[0], _mm_set1_epi64x(~0xffffLL));
    }
    const __m128i blocks[2][2] = {{_mm_unpacklo_epi64(v[0], v[1]), _mm_unpacklo_epi64(v[2], v[3])},
                                  {_mm_unpackhi_epi64(v[0], v[1]), _mm_unpackhi_epi64(v[2], v[3])}};
    uint32_t coded = 0;
    for (int b = 0; b < 2; ++b) {
        if (leaves_dead_zone(blocks[b][0], blocks[b][1], quantizer)) {
            const uint32_t levels = quantize_block(blocks[b][0], blocks[b][1], quantizer,
                                                   coefs + 16 * b, scan + 16 * b);
            nonzero[b] = static_cast<uint16_t>(levels);
            coded |= ((levels & 0x10000) | 1) << b;
        } else {
            nonzero[b] = 0;
            if (dc) {
                clear_block(coefs + 16 * b);
            }
        }
    }
    return coded;
}

uint32_t code_residual_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                             const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                             uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int n = 0; n < 8; ++n) {
        coded |= code_two(src + pair_y(n) * stride + pair_x(n), stride,
                          pred + pair_y(n) * 16 + pair_x(n), 16, quantizer,
                          dc ? dc + 2 * n : nullptr, coefs + 32 * n, scan + 32 * n, nonzero + 2 * n)
                 << (2 * n);
    }
    return coded;
}

uint32_t code_residual_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    __m128i v[4];
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm_sub_epi16(widen_low(load_4(src + y * stride)), widen_low(load_4(pred + 4 * y)));
    }
    forward_butterfly(v);
    transpose_two(v);
    forward_butterfly(v);
    const __m128i c0 = _mm_unpacklo_epi64(v[0], v[1]), c1 = _mm_unpacklo_epi64(v[2], v[3]);
    if (!leaves_dead_zone(c0, c1, quantizer)) {
        *nonzero = 0;
        return 0;
    }
    *nonzero = static_cast<uint16_t>(quantize_block(c0, c1, quantizer, coefs, scan));
    return 1;
}

// Whether 16-bit sums are exact for a block: no sum of the inverse transform, rounding included,
// exceeds the sum of the magnitudes.
bool fits_16_bits(const int16_t* coefs) {
    constexpr int kLargestSum = 32767 - 32;
    const __m128i ones = _mm_set1_epi16(1);
    __m128i sum = _mm_add_epi32(_mm_madd_epi16(absolute_16(load_aligned(coefs)), ones),
                                _mm_madd_epi16(absolute_16(load_aligned(coefs + 8)), ones));
    sum = _mm_add_epi32(sum, _mm_srli_si128(sum, 8));
    sum = _mm_add_epi32(sum, _mm_srli_si128(sum, 4));
    return _mm_cvtsi128_si32(sum) <= kLargestSum;
}

// Rows of the residual of two blocks side by side.
void inverse_two(const int16_t* first, const int16_t* second, __m128i* rows) {
    const __m128i first_01 = load_aligned(first), first_23 = load_aligned(first + 8);
    const __m128i second_01 = load_aligned(second), second_23 = load_aligned(second + 8);
    rows[0] = _mm_unpacklo_epi64(first_01, second_01);
    rows[1] = _mm_unpackhi_epi64(first_01, second_01);
    rows[2] = _mm_unpacklo_epi64(first_23, second_23);
    rows[3] = _mm_unpackhi_epi64(first_23, second_23);
    inverse_butterfly(rows);
    transpose_two(rows);
    inverse_butterfly(rows);
    for (int y = 0; y < 4; ++y) {
        rows[y] = _mm_srai_epi16(_mm_add_epi16(rows[y], _mm_set1_epi16(32)), 6);
    }
}

alignas(16) constexpr int16_t kNoCoefs[16] = {};

// The block at pred and dst, by way of 32-bit sums.
void reconstruct_wide(const int16_t* coefs, const uint8_t* pred, ptrdiff_t pred_stride,
                      uint8_t* dst, ptrdiff_t stride) {
    alignas(16) uint8_t block[16];
    for (int y = 0; y < 4; ++y) {
        std::memcpy(block + 4 * y, pred + y * pred_stride, 4);
    }
    scalar_kernels().reconstruct_4x4(coefs, block, dst, stride);
}

// Two blocks side by side; bits 0 and 1 of mask.
void reconstruct_two(const int16_t* coefs, uint32_t mask, const uint8_t* pred,
                     ptrdiff_t pred_stride, uint8_t* dst, ptrdiff_t stride) {
    if ((mask & 3) == 0) {
        for (int y = 0; y < 4; ++y) {
            store_8(dst + y * stride, load_8(pred + y * pred_stride));
        }
        return;
    }
    const int16_t* first = mask & 1 ? coefs : kNoCoefs;
    const int16_t* second = mask & 2 ? coefs + 16 : kNoCoefs;
    if (!fits_16_bits(first) || !fits_16_bits(second)) {
        reconstruct_wide(first, pred, pred_stride, dst, stride);
        reconstruct_wide(second, pred + 4, pred_stride, dst + 4, stride);
        return;
    }
    __m128i rows[4];
    inverse_two(first, second, rows);
    for (int y = 0; y < 4; ++y) {
        const __m128i sum = _mm_add_epi16(rows[y], widen_low(load_8(pred + y * pred_stride)));
        store_8(dst + y * stride, _mm_packus_epi16(sum, sum));
    }
}

void reconstruct_16x16(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                       ptrdiff_t stride) {
    for (int n = 0; n < 8; ++n) {
        reconstruct_two(coefs + 32 * n, mask >> (2 * n), pred + pair_y(n) * 16 + pair_x(n), 16,
                        dst + pair_y(n) * stride + pair_x(n), stride);
    }
}

void reconstruct_4x4(const int16_t* coefs, const uint8_t* pred, uint8_t* dst, ptrdiff_t stride) {
    if (!fits_16_bits(coefs)) {
        scalar_kernels().reconstruct_4x4(coefs, pred, dst, stride);
        return;
    }
    __m128i rows[4];
    inverse_two(coefs, kNoCoefs, rows);
    for (int y = 0; y < 4; ++y) {
        const __m128i sum = _mm_add_epi16(rows[y], widen_low(load_4(pred + 4 * y)));
        store_4(dst + y * stride, _mm_packus_epi16(sum, sum));
    }
}

uint32_t code_chroma(const Chroma& chroma) {
    const Quantizer& quantizer = *chroma.quantizer;
    uint32_t coded = 0;
    for (int c = 0; c < 2; ++c) {
        const uint8_t* const pred = chroma.pred + 64 * c;
        alignas(16) int16_t coefs[64];
        int16_t dc[4];
        uint32_t ac_mask = 0;
        for (int n = 0; n < 4; n += 2) {
            const uint32_t two =
                code_two(chroma.src[c] + 2 * n * chroma.src_stride, chroma.src_stride,
                         pred + 16 * n, 8, quantizer, dc + n, coefs + 16 * n,
                         chroma.scan + 64 * c + 16 * n, chroma.nonzero + 4 * c + n);
            ac_mask |= (two & 3) << n;
        }
        const uint32_t levels = code_chroma_dc(dc, quantizer, chroma.dc + 4 * c, coefs);
        const uint32_t mask = levels != 0 ? 0xf : ac_mask;
        for (int n = 0; n < 4; n += 2) {
            reconstruct_two(coefs + 16 * n, mask >> n, pred + 16 * n, 8,
                            chroma.dst[c] + 2 * n * chroma.dst_stride, chroma.dst_stride);
        }
        coded |= (ac_mask | levels << 8) << (4 * c);
    }
    return coded;
}

}  // namespace

void sse2::fill_residual(Kernels& table) {
    table.code_residual_16x16 = code_residual_16x16;
    table.code_residual_4x4 = code_residual_4x4;
    table.code_luma_dc = code_luma_dc;
    table.reconstruct_16x16 = reconstruct_16x16;
    table.reconstruct_4x4 = reconstruct_4x4;
    table.code_chroma = code_chroma;
}

}  // namespace zolt
