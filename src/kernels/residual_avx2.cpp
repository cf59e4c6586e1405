// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h, so that no
// inline function that other files share is emitted with instructions that an older processor
// lacks.
#include "kernels/avx2.h"
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

}  // namespace

void avx2::fill_residual(Kernels& table) {
    table.code_residual_16x16 = code_residual_16x16;
    table.code_residual_8x8 = code_residual_8x8;
    table.code_residual_4x4 = code_residual_4x4;
    table.reconstruct_16x16 = reconstruct_16x16;
    table.reconstruct_8x8 = reconstruct_8x8;
}

}  // namespace zolt
