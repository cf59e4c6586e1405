// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h and
// chroma_simd.h, so that no inline function that other files share is emitted with instructions
// that an older processor lacks.
#include "kernels/avx2.h"
#include "kernels/chroma_simd.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

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

__m256i zigzag(__m256i v) {
    __m128i first, second;
    zigzag(low_lane(v), high_lane(v), &first, &second);
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

    // Quantises a block; returns the mask of its levels, and in bit 16 whether one is beyond 1.
    uint32_t quantize(__m256i c, __m256i* scaled, int16_t* scan) const {
        const __m256i magnitude = _mm256_abs_epi16(c);
        const __m256i low = _mm256_mullo_epi16(magnitude, forward);
        const __m256i high = _mm256_mulhi_epu16(magnitude, forward);
        const __m256i first =
            _mm256_srl_epi32(_mm256_add_epi32(_mm256_unpacklo_epi16(low, high), rounding), shift);
        const __m256i second =
            _mm256_srl_epi32(_mm256_add_epi32(_mm256_unpackhi_epi16(low, high), rounding), shift);
        const __m256i absolute = _mm256_min_epi16(_mm256_packs_epi32(first, second), largest);
        const __m256i level = _mm256_sign_epi16(absolute, c);
        *scaled = _mm256_mullo_epi16(level, dequant);
        const __m256i in_order = zigzag(level);
        store_32(scan, in_order);
        const __m128i bytes = _mm_packs_epi16(low_lane(in_order), high_lane(in_order));
        const int zeros = _mm_movemask_epi8(_mm_cmpeq_epi8(bytes, _mm_setzero_si128()));
        const bool large = !_mm256_testz_si256(absolute, _mm256_set1_epi16(~1));
        return (~static_cast<uint32_t>(zeros) & 0xffff) | (large ? 0x10000u : 0);
    }
};

// Core transform of the rows of four blocks, 0 and 1 in the low lane: leaves column j of them in
// vector j, 64 bits a block.
[[gnu::always_inline]] inline void transform_four(__m256i* v) {
    forward_butterfly(v);
    transpose_four(v);
    forward_butterfly(v);
}

__m256i without_constants(__m256i first_column) {
    return _mm256_and_si256(first_column, _mm256_set1_epi64x(~0xffffLL));
}

// Mask of those of four blocks in columns that have a level other than 0.
[[gnu::always_inline]] inline unsigned blocks_with_levels(const __m256i* v,
                                                          const Quantizer& quantizer) {
    __m256i beyond = _mm256_setzero_si256();
    for (int j = 0; j < 4; ++j) {
        const __m256i dead_zone = _mm256_broadcastq_epi64(load_8(quantizer.dead_zone + 4 * j));
        beyond = _mm256_or_si256(beyond, _mm256_cmpgt_epi16(_mm256_abs_epi16(v[j]), dead_zone));
    }
    const __m256i none = _mm256_cmpeq_epi64(beyond, _mm256_setzero_si256());
    return ~static_cast<unsigned>(_mm256_movemask_pd(_mm256_castsi256_pd(none))) & 0xf;
}

// From four blocks in columns to a vector a block, and back.
[[gnu::always_inline]] inline void columns_to_blocks(const __m256i* v, __m256i* blocks) {
    const __m256i even_01 = _mm256_unpacklo_epi64(v[0], v[1]);
    const __m256i even_23 = _mm256_unpacklo_epi64(v[2], v[3]);
    const __m256i odd_01 = _mm256_unpackhi_epi64(v[0], v[1]);
    const __m256i odd_23 = _mm256_unpackhi_epi64(v[2], v[3]);
    blocks[0] = _mm256_permute2x128_si256(even_01, even_23, 0x20);
    blocks[1] = _mm256_permute2x128_si256(odd_01, odd_23, 0x20);
    blocks[2] = _mm256_permute2x128_si256(even_01, even_23, 0x31);
    blocks[3] = _mm256_permute2x128_si256(odd_01, odd_23, 0x31);
}
[[gnu::always_inline]] inline void blocks_to_columns(const __m256i* blocks, __m256i* v) {
    const __m256i even_01 = _mm256_permute2x128_si256(blocks[0], blocks[2], 0x20);
    const __m256i even_23 = _mm256_permute2x128_si256(blocks[0], blocks[2], 0x31);
    const __m256i odd_01 = _mm256_permute2x128_si256(blocks[1], blocks[3], 0x20);
    const __m256i odd_23 = _mm256_permute2x128_si256(blocks[1], blocks[3], 0x31);
    v[0] = _mm256_unpacklo_epi64(even_01, odd_01);
    v[1] = _mm256_unpackhi_epi64(even_01, odd_01);
    v[2] = _mm256_unpacklo_epi64(even_23, odd_23);
    v[3] = _mm256_unpackhi_epi64(even_23, odd_23);
}

// Codes a row of four luma blocks from the rows of their residual; dc, coefs, scan and nonzero are
// those of the first, the masks 0 before. Returns what code_residual_16x16 does. The blocks are the
// first and those 1, 4 and 5 after it in decoding order (Figure 6-10).
[[gnu::always_inline]] inline uint32_t code_four(__m256i* v, const Quantizer& quantizer,
                                                 int16_t* dc, int16_t* coefs, int16_t* scan,
                                                 uint16_t* nonzero) {
    constexpr int kPlace[4] = {0, 1, 4, 5};
    transform_four(v);
    if (dc) {
        dc[0] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 0));
        dc[1] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 4));
        dc[4] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 8));
        dc[5] = static_cast<int16_t>(_mm256_extract_epi16(v[0], 12));
        v[0] = without_constants(v[0]);
    }
    const unsigned coded = blocks_with_levels(v, quantizer);
    if (dc) {
        for (const int place : kPlace) {
            store_32(coefs + 16 * place, _mm256_setzero_si256());
        }
    }
    if (coded == 0) {
        return 0;
    }
    __m256i blocks[4];
    columns_to_blocks(v, blocks);
    const VectorQuantizer vectors(quantizer);
    uint32_t result = (coded & 3) | (coded >> 2) << 4;
    for (unsigned rest = coded; rest != 0; rest &= rest - 1) {
        const int b = __builtin_ctz(rest);
        const int place = kPlace[b];
        __m256i scaled;
        const uint32_t levels = vectors.quantize(blocks[b], &scaled, scan + 16 * place);
        nonzero[place] = static_cast<uint16_t>(levels);
        result |= (levels & 0x10000) << place;
        store_32(coefs + 16 * place, scaled);
    }
    return result;
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
    store_32(nonzero, _mm256_setzero_si256());
    for (int r = 0; r < 4; ++r, src += 4 * stride, pred += 64) {
        __m256i v[4];
        for (int y = 0; y < 4; ++y) {
            v[y] = _mm256_sub_epi16(_mm256_cvtepu8_epi16(load_16(src + y * stride)),
                                    _mm256_cvtepu8_epi16(load_16(pred + 16 * y)));
        }
        const int first = first_in_row(r);
        coded |= code_four(v, quantizer, dc ? dc + first : nullptr, coefs + 16 * first,
                           scan + 16 * first, nonzero + first)
                 << first;
    }
    return coded;
}

// From the columns of four blocks to the rows of their residual. Returns false when 16-bit sums
// might not be exact: no sum of the inverse transform, rounding included, exceeds the sum of a
// block's magnitudes.
[[gnu::always_inline]] inline bool inverse_four(__m256i* v) {
    __m256i sum =
        _mm256_adds_epi16(_mm256_adds_epi16(_mm256_abs_epi16(v[0]), _mm256_abs_epi16(v[1])),
                          _mm256_adds_epi16(_mm256_abs_epi16(v[2]), _mm256_abs_epi16(v[3])));
    sum = _mm256_adds_epi16(sum, _mm256_shuffle_epi32(sum, _MM_SHUFFLE(2, 3, 0, 1)));
    sum = _mm256_adds_epi16(sum, _mm256_srli_epi32(sum, 16));  // in the even values
    const __m256i above = _mm256_cmpgt_epi16(sum, _mm256_set1_epi32(32767 - 32));
    if (!_mm256_testz_si256(above, _mm256_set1_epi32(0xffff))) {
        return false;
    }
    inverse_butterfly(v);
    transpose_four(v);
    inverse_butterfly(v);
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm256_srai_epi16(_mm256_add_epi16(v[y], _mm256_set1_epi16(32)), 6);
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
        blocks_to_columns(blocks, rows);
        if (!inverse_four(rows)) {
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

// Rows y and y + 4 of an 8x8 block, one in each lane.
__m256i two_rows_of_8(const uint8_t* p, ptrdiff_t stride) {
    return _mm256_cvtepu8_epi16(_mm_unpacklo_epi64(load_8(p), load_8(p + 4 * stride)));
}

// Replaces the coefficients of the coded ones of four blocks by their scaled levels and those of
// the others by 0, as code_four has them.
[[gnu::always_inline]] inline void quantize_four(__m256i* v, unsigned coded,
                                                 const VectorQuantizer& quantizer, int16_t* scan,
                                                 uint16_t* nonzero) {
    __m256i blocks[4];
    __m256i scaled[4] = {};
    columns_to_blocks(v, blocks);
    for (unsigned rest = coded; rest != 0; rest &= rest - 1) {
        const int b = __builtin_ctz(rest);
        nonzero[b] =
            static_cast<uint16_t>(quantizer.quantize(blocks[b], scaled + b, scan + 16 * b));
    }
    blocks_to_columns(scaled, v);
}

// In the low 16 bits of every 64, blocks in order.
__m256i constants_of_blocks(__m128i dc) {
    return _mm256_and_si256(_mm256_cvtepu32_epi64(dc), _mm256_set1_epi64x(0xffff));
}

// Residual samples of blocks that have nothing but a constant coefficient (clause 8.5.12.2).
__m256i constant_residual(__m256i constants) {
    const __m256i to_all =
        _mm256_broadcastsi128_si256(_mm_setr_epi8(0, 1, 0, 1, 0, 1, 0, 1, 8, 9, 8, 9, 8, 9, 8, 9));
    return _mm256_srai_epi16(
        _mm256_add_epi16(_mm256_shuffle_epi8(constants, to_all), _mm256_set1_epi16(32)), 6);
}

uint32_t code_chroma(const Chroma& chroma) {
    const Quantizer& quantizer = *chroma.quantizer;
    __m256i v[2][4];  // of each component what code_four has
    uint32_t ac_mask = 0;
    for (int c = 0; c < 2; ++c) {
        for (int y = 0; y < 4; ++y) {
            v[c][y] = _mm256_sub_epi16(
                two_rows_of_8(chroma.src[c] + y * chroma.src_stride, chroma.src_stride),
                two_rows_of_8(chroma.pred + 64 * c + 8 * y, 8));
        }
        transform_four(v[c]);
    }
    // Sign extended: block 0 of Cb, of Cr, block 1 of Cb ..
    __m256i dc = _mm256_blend_epi16(v[0][0], _mm256_slli_epi64(v[1][0], 32), 0xcc);
    dc = _mm256_srai_epi32(_mm256_slli_epi32(dc, 16), 16);
    dc = _mm256_permutevar8x32_epi32(dc, _mm256_setr_epi32(0, 2, 4, 6, 1, 3, 5, 7));
    for (int c = 0; c < 2; ++c) {
        v[c][0] = without_constants(v[c][0]);
        ac_mask |= blocks_with_levels(v[c], quantizer) << (4 * c);
    }
    store_16(chroma.nonzero, _mm_setzero_si128());
    const uint32_t levels = code_chroma_dc(&dc, quantizer, chroma.dc);
    if ((ac_mask | levels) == 0) {
        copy_prediction(chroma);
        return 0;
    }

    const __m256i constants[2] = {constants_of_blocks(low_lane(dc)),
                                  constants_of_blocks(high_lane(dc))};
    for (int c = 0; c < 2; ++c) {
        const unsigned coded = ac_mask >> (4 * c) & 0xf;
        if (coded == 0) {
            v[c][0] = v[c][1] = v[c][2] = v[c][3] = constant_residual(constants[c]);
            continue;
        }
        quantize_four(v[c], coded, VectorQuantizer(quantizer), chroma.scan + 64 * c,
                      chroma.nonzero + 4 * c);
        v[c][0] = _mm256_or_si256(v[c][0], constants[c]);
        if (!inverse_four(v[c])) {
            return scalar_kernels().code_chroma(chroma);  // nothing is stored at dst yet
        }
    }
    for (int c = 0; c < 2; ++c) {
        for (int y = 0; y < 4; ++y) {
            const __m256i sum =
                _mm256_add_epi16(v[c][y], two_rows_of_8(chroma.pred + 64 * c + 8 * y, 8));
            store_two_rows(chroma, c, y, _mm_packus_epi16(low_lane(sum), high_lane(sum)));
        }
    }
    return ac_mask | levels << 8;
}

}  // namespace

void avx2::fill_residual(Kernels& table) {
    table.code_residual_16x16 = code_residual_16x16;
    table.reconstruct_16x16 = reconstruct_16x16;
    table.code_chroma = code_chroma;
}

}  // namespace zolt
