#include <algorithm>

#include "kernels/color_rules.h"
#include "kernels/color_scalar.h"
#include "kernels/families.h"
#include "kernels/sse2.h"

namespace zolt {
namespace {

using std::uint8_t;

// A pair of 16-bit numbers, not negative, in every 32 bits.
__m128i pairs_of(int first, int second) {
    return _mm_set1_epi32(static_cast<int>(static_cast<unsigned>(second) << 16) | first);
}
// The 32-bit numbers, below 2^16, in both halves of their places.
__m128i in_both_halves(__m128i v) {
    return _mm_or_si128(v, _mm_slli_epi32(v, 16));
}
__m128i even_bytes(__m128i v) {
    return _mm_and_si128(v, _mm_set1_epi16(0x00ff));
}
__m128i odd_bytes(__m128i v) {
    return _mm_srli_epi16(v, 8);
}
// Sums of neighbouring 16-bit numbers.
__m128i add_pairs(__m128i v) {
    return _mm_madd_epi16(v, _mm_set1_epi16(1));
}

// Blocks of 8x2 pixels are converted at once.
constexpr int kBlock = 8;

// Calls convert(x) for blocks that cover the width; the last may overlap the one before. Returns
// false, and calls nothing, where the width has no block.
template <class Convert>
bool for_each_block(int width, Convert convert) {
    if (width < kBlock) {
        return false;
    }
    for (int x = 0; x <= width - kBlock; x += kBlock) {
        convert(x);
    }
    if (width % kBlock != 0) {
        convert(width - kBlock);
    }
    return true;
}

// Takes 16-bit samples.
void store_luma(__m128i upper, __m128i lower, IyuvRows to, int x) {
    const __m128i luma = _mm_packus_epi16(upper, lower);
    store_8(to.upper + x, luma);
    store_8(to.lower + x, _mm_unpackhi_epi64(luma, luma));
}

// Takes 16-bit samples, the first plane's and the second's in turn; they are clipped to 8 bits.
void store_chroma(__m128i chroma, uint8_t* first, uint8_t* second) {
    chroma = _mm_shufflehi_epi16(_mm_shufflelo_epi16(chroma, 0xd8), 0xd8);
    const __m128i samples = _mm_packus_epi16(chroma, chroma);  // two of each plane in turn
    const __m128i planes = _mm_shufflelo_epi16(samples, 0xd8);
    store_4(first, planes);
    store_4(second, _mm_srli_si128(planes, 4));
}

// ---- RGB ----

// Four pixels of a row, each in 32 bits; `half` is 0 for the first four of a block. Nothing beyond
// the block is read. The high bytes of 3-byte pixels are undefined.
template <int kBytes>
__m128i load_pixels(const uint8_t* row, int half) {
    if (kBytes == 4) {
        return load(row + 16 * half);
    }
    const __m128i v = half == 0 ? load(row) : _mm_srli_si128(load(row + 8), 4);
    const __m128i first = _mm_unpacklo_epi32(v, _mm_srli_si128(v, 3));
    const __m128i last = _mm_unpacklo_epi32(_mm_srli_si128(v, 6), _mm_srli_si128(v, 9));
    return _mm_unpacklo_epi64(first, last);
}

// `scaled` of color_rules.h on 16-bit numbers of magnitude below 2^13: half of the product shifted
// by 14, rounded up. The average with 0 is that half for samples, which are not negative.
__m128i twice_scaled(__m128i v, __m128i factors) {
    return _mm_mulhi_epi16(_mm_slli_epi16(v, 2), factors);
}
__m128i scaled_samples(__m128i v, __m128i factors) {
    return _mm_avg_epu16(twice_scaled(v, factors), _mm_setzero_si128());
}
__m128i scaled_differences(__m128i v, __m128i factors) {
    return _mm_srai_epi16(_mm_add_epi16(twice_scaled(v, factors), _mm_set1_epi16(1)), 1);
}

template <int kBytes>
bool rgb_blocks_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at, IyuvRows to,
                        int width) {
    // Shifted to the low end, a pixel has an outer colour, green and the other outer colour.
    const bool blue_first = at.b < at.r;
    const __m128i shift = _mm_cvtsi32_si128(8 * std::min(at.b, at.r));
    const __m128i outer_factors =
        blue_first ? pairs_of(kBlueFactor, kRedFactor) : pairs_of(kRedFactor, kBlueFactor);
    const __m128i green_factor = pairs_of(kGreenFactor, 0);
    const __m128i chroma_factors =
        blue_first ? pairs_of(kFactorU, kFactorV) : pairs_of(kFactorV, kFactorU);
    uint8_t* const first_plane = blue_first ? to.u : to.v;
    uint8_t* const second_plane = blue_first ? to.v : to.u;

    return for_each_block(width, [&](int x) {
        __m128i luma[2];        // of a row, 16 bits a sample
        __m128i outer_sums[2];  // over the two rows, of the first and the last four pixels
        const uint8_t* rows[2] = {upper + kBytes * x, lower + kBytes * x};
        for (int row = 0; row < 2; ++row) {
            __m128i half_luma[2];
            for (int half = 0; half < 2; ++half) {
                const __m128i pixels = _mm_srl_epi32(load_pixels<kBytes>(rows[row], half), shift);
                const __m128i outer = even_bytes(pixels);
                half_luma[half] =
                    add_pairs(_mm_add_epi16(scaled_samples(outer, outer_factors),
                                            scaled_samples(odd_bytes(pixels), green_factor)));
                outer_sums[half] = row == 0 ? outer : _mm_add_epi16(outer_sums[half], outer);
            }
            luma[row] = _mm_packs_epi32(half_luma[0], half_luma[1]);
        }
        store_luma(luma[0], luma[1], to, x);

        const __m128 left = _mm_castsi128_ps(outer_sums[0]);
        const __m128 right = _mm_castsi128_ps(outer_sums[1]);
        const __m128i sums = _mm_add_epi16(_mm_castps_si128(_mm_shuffle_ps(left, right, 0x88)),
                                           _mm_castps_si128(_mm_shuffle_ps(left, right, 0xdd)));
        const __m128i luma_means = _mm_srli_epi32(add_pairs(_mm_add_epi16(luma[0], luma[1])), 2);
        const __m128i differences =
            _mm_sub_epi16(_mm_srli_epi16(sums, 2), in_both_halves(luma_means));
        store_chroma(
            _mm_add_epi16(scaled_differences(differences, chroma_factors), _mm_set1_epi16(128)),
            first_plane + x / 2, second_plane + x / 2);
    });
}

void rgb32_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at, IyuvRows to,
                        int width) {
    if (!rgb_blocks_to_iyuv<4>(upper, lower, at, to, width)) {
        scalar_rgb32_rows_to_iyuv(upper, lower, at, to, width);
    }
}

void rgb24_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at, IyuvRows to,
                        int width) {
    if (!rgb_blocks_to_iyuv<3>(upper, lower, at, to, width)) {
        scalar_rgb24_rows_to_iyuv(upper, lower, at, to, width);
    }
}

// ---- YUV ----

// The second byte of every 32 bits.
__m128i second_byte(__m128i v) {
    return _mm_and_si128(_mm_srli_epi32(v, 8), _mm_set1_epi32(0xff));
}

void ayuv_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    const auto convert = [&](int x) {
        __m128i luma[2], u[2], v[2];
        const uint8_t* rows[2] = {upper + 4 * x, lower + 4 * x};
        for (int row = 0; row < 2; ++row) {
            const __m128i left = load(rows[row]), right = load(rows[row] + 16);
            luma[row] = _mm_packs_epi32(second_byte(left), second_byte(right));
            const __m128i uv = _mm_packs_epi32(_mm_srai_epi32(left, 16), _mm_srai_epi32(right, 16));
            u[row] = even_bytes(uv);
            v[row] = odd_bytes(uv);
        }
        store_luma(luma[0], luma[1], to, x);
        const __m128i u_sums = add_pairs(_mm_add_epi16(u[0], u[1]));
        const __m128i v_sums = add_pairs(_mm_add_epi16(v[0], v[1]));
        const __m128i sums = _mm_or_si128(u_sums, _mm_slli_epi32(v_sums, 16));
        store_chroma(_mm_srli_epi16(sums, 2), to.u + x / 2, to.v + x / 2);
    };
    if (!for_each_block(width, convert)) {
        scalar_ayuv_rows_to_iyuv(upper, lower, to, width);
    }
}

void yuy2_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    const auto convert = [&](int x) {
        const __m128i first = load(upper + 2 * x), second = load(lower + 2 * x);
        store_luma(even_bytes(first), even_bytes(second), to, x);
        const __m128i sums = _mm_add_epi16(odd_bytes(first), odd_bytes(second));
        store_chroma(_mm_srli_epi16(sums, 1), to.u + x / 2, to.v + x / 2);
    };
    if (!for_each_block(width, convert)) {
        scalar_yuy2_rows_to_iyuv(upper, lower, to, width);
    }
}

}  // namespace

void sse2::fill_color(Kernels& table) {
    table.rgb32_rows_to_iyuv = rgb32_rows_to_iyuv;
    table.rgb24_rows_to_iyuv = rgb24_rows_to_iyuv;
    table.ayuv_rows_to_iyuv = ayuv_rows_to_iyuv;
    table.yuy2_rows_to_iyuv = yuy2_rows_to_iyuv;
}

}  // namespace zolt
