// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file and
// of avx512.h and chroma_simd.h, so that no inline function that other files share is emitted with
// instructions that an older processor lacks.
#include "kernels/avx512.h"
#include "kernels/chroma_simd.h"
#include "kernels/families.h"
#include "kernels/zigzag.h"

namespace zolt {
namespace {

using std::int16_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

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

// Core transform of the rows of eight blocks: leaves column j of them in vector j, 64 bits a block.
[[gnu::always_inline]] inline void transform_eight(__m512i* v) {
    forward_butterfly(v);
    transpose_eight(v);
    forward_butterfly(v);
}

__m512i without_constants(__m512i first_column) {
    return _mm512_maskz_mov_epi16(0xeeeeeeee, first_column);
}

// Whether any of eight blocks in columns has a level other than 0.
[[gnu::always_inline]] inline bool have_levels(const __m512i* v, const Quantizer& quantizer) {
    __mmask32 beyond = 0;
    for (int j = 0; j < 4; ++j) {
        beyond |= _mm512_cmpgt_epi16_mask(_mm512_abs_epi16(v[j]), column(quantizer.dead_zone, j));
    }
    return beyond != 0;
}

// Quantises eight blocks in columns, which become scaled levels, and stores the levels, with coefs
// the scaled ones too: those of blocks that have none as well, since nobody can predict which ones
// these are. Returns what code_residual_16x16 does. The blocks in the second lane are number step
// and step + 1, those in the third 6 - step and 7 - step.
[[gnu::always_inline]] inline uint32_t quantize_eight(__m512i* v, const Quantizer& quantizer,
                                                      int step, int16_t* coefs, int16_t* scan,
                                                      uint16_t* nonzero) {
    __m512i levels[4];
    __m512i all = _mm512_setzero_si512();  // bits of the magnitudes of a block's levels
    for (int j = 0; j < 4; ++j) {
        levels[j] = quantize(v[j], quantizer, j);
        all = _mm512_or_si512(all, _mm512_abs_epi16(levels[j]));
        v[j] = _mm512_mullo_epi16(levels[j], column(quantizer.dequant, j));
    }
    const auto store_block = [&](int b, uint32_t mask, __m256i block_coefs, __m256i block_scan) {
        nonzero[b] = static_cast<uint16_t>(mask);
        store_32(scan + 16 * b, block_scan);
        if (coefs) {
            store_32(coefs + 16 * b, block_coefs);
        }
    };
    for (int odd = 0; odd < 2; ++odd) {
        // Columns 0 and 1, and 2 and 3, of the first or of the second block of every lane.
        const auto two_columns = [=](__m512i left, __m512i right) {
            return odd ? _mm512_unpackhi_epi64(left, right) : _mm512_unpacklo_epi64(left, right);
        };
        const __m512i levels_01 = two_columns(levels[0], levels[1]);
        const __m512i levels_23 = two_columns(levels[2], levels[3]);
        const __m512i scaled_01 = two_columns(v[0], v[1]);
        const __m512i scaled_23 = two_columns(v[2], v[3]);
        for (int lane = 0; lane < 2; ++lane) {
            const __m512i zigzag = _mm512_add_epi16(
                load_64(kZigzagIndices.index), _mm512_set1_epi16(static_cast<short>(8 * lane)));
            const __m512i by_column = _mm512_add_epi64(_mm512_setr_epi64(0, 1, 8, 9, 4, 5, 12, 13),
                                                       _mm512_set1_epi64(2 * lane));
            const __m512i in_order = _mm512_permutex2var_epi16(levels_01, zigzag, levels_23);
            const __m512i blocks = _mm512_permutex2var_epi64(scaled_01, by_column, scaled_23);
            const uint32_t mask = _mm512_test_epi16_mask(in_order, in_order);
            const int b = step * lane + odd;
            store_block(b, mask & 0xffff, low_half(blocks), low_half(in_order));
            store_block(b + 6 - step, mask >> 16, high_half(blocks), high_half(in_order));
        }
    }
    const auto by_number = [step](uint32_t by_place) {
        return (by_place & 0xc3) | (by_place >> 2 & 3) << step | (by_place >> 4 & 3) << (6 - step);
    };
    const uint32_t coded = _mm512_test_epi64_mask(all, all);
    const uint32_t large = _mm512_test_epi64_mask(all, _mm512_set1_epi16(~1));
    return by_number(coded) | by_number(large) << 16;
}

// Codes the eight blocks of two block rows from the rows of their residual. Returns what
// code_residual_16x16 does. In decoding order (Figure 6-10) the blocks of the upper row, in the low
// half, are 0, 1, 4, 5, those of the lower one 2, 3, 6, 7.
uint32_t code_eight(__m512i* v, const Quantizer& quantizer, int16_t* dc, int16_t* coefs,
                    int16_t* scan, uint16_t* nonzero) {
    transform_eight(v);
    if (dc) {
        store_16(dc, _mm_shuffle_epi32(_mm512_cvtepi64_epi16(v[0]), _MM_SHUFFLE(3, 1, 2, 0)));
        v[0] = without_constants(v[0]);
        for (int b = 0; b < 8; b += 2) {
            store_64(coefs + 16 * b, _mm512_setzero_si512());
        }
    }
    store_16(nonzero, _mm_setzero_si128());
    return have_levels(v, quantizer) ? quantize_eight(v, quantizer, 4, coefs, scan, nonzero) : 0;
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

// From the columns of eight blocks to the rows of their residual. Returns false when 16-bit sums
// might not be exact: no sum of the inverse transform, rounding included, exceeds the sum of a
// block's magnitudes.
[[gnu::always_inline]] inline bool inverse_eight(__m512i* rows) {
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

// Rows y and y + 4 of Cb in the low half, of Cr in the high one.
__m512i two_rows_of_8(const uint8_t* u, const uint8_t* v, ptrdiff_t stride) {
    return _mm512_cvtepu8_epi16(join(_mm_unpacklo_epi64(load_8(u), load_8(u + 4 * stride)),
                                     _mm_unpacklo_epi64(load_8(v), load_8(v + 4 * stride))));
}

uint32_t code_chroma(const Chroma& chroma) {
    const Quantizer& quantizer = *chroma.quantizer;
    __m512i v[4];
    for (int y = 0; y < 4; ++y) {
        const ptrdiff_t row = y * chroma.src_stride;
        v[y] = _mm512_sub_epi16(
            two_rows_of_8(chroma.src[0] + row, chroma.src[1] + row, chroma.src_stride),
            two_rows_of_8(chroma.pred + 8 * y, chroma.pred + 64 + 8 * y, 8));
    }
    transform_eight(v);
    __m256i dc = _mm256_cvtepi16_epi32(_mm512_cvtepi64_epi16(v[0]));
    v[0] = without_constants(v[0]);
    store_16(chroma.nonzero, _mm_setzero_si128());
    const bool ac = have_levels(v, quantizer);
    const uint32_t dc_mask = code_chroma_dc(&dc, quantizer, chroma.dc);
    const __m512i constants = _mm512_maskz_mov_epi16(0x11111111, _mm512_cvtepi32_epi64(dc));
    uint32_t ac_mask = 0;
    if (ac) {
        ac_mask = quantize_eight(v, quantizer, 2, nullptr, chroma.scan, chroma.nonzero) & 0xff;
        v[0] = _mm512_or_si512(v[0], constants);
        if (!inverse_eight(v)) {
            return scalar_kernels().code_chroma(chroma);  // nothing is stored at dst yet
        }
    } else if (dc_mask != 0) {
        const __m512i all = _mm512_shuffle_epi8(
            constants,
            _mm512_broadcast_i32x4(_mm_setr_epi8(0, 1, 0, 1, 0, 1, 0, 1, 8, 9, 8, 9, 8, 9, 8, 9)));
        v[0] = _mm512_srai_epi16(_mm512_add_epi16(all, _mm512_set1_epi16(32)), 6);
        v[1] = v[2] = v[3] = v[0];
    } else {
        copy_prediction(chroma);
        return 0;
    }
    for (int y = 0; y < 4; ++y) {
        const __m512i pred = two_rows_of_8(chroma.pred + 8 * y, chroma.pred + 64 + 8 * y, 8);
        const __m256i samples = to_samples(_mm512_add_epi16(v[y], pred));
        for (int c = 0; c < 2; ++c) {
            store_two_rows(chroma, c, y, c == 0 ? low_lane(samples) : high_lane(samples));
        }
    }
    return ac_mask | dc_mask << 8;
}

}  // namespace

void avx512::fill_residual(Kernels& table) {
    table.code_residual_16x16 = code_residual_16x16;
    table.code_chroma = code_chroma;
}

}  // namespace zolt
