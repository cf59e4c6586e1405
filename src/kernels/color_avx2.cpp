// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h, so that no
// inline function that other files share is emitted with instructions that an older processor
// lacks. The functions of color_rules.h are evaluated at compile time only.
#include "kernels/avx2.h"
#include "kernels/color_rules.h"
#include "kernels/color_scalar.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::uint8_t;

// A pair of 16-bit numbers, not negative, in every 32 bits.
__m256i pairs_of(int first, int second) {
    return _mm256_set1_epi32(static_cast<int>(static_cast<unsigned>(second) << 16) | first);
}

// Blocks of 16x2 pixels are converted at once, two vectors of 8 pixels a row. In their lanes,
// pixels (p) and chroma samples (c) stand thus:
//     low lane   p 0..3, p 8..11     c 0, 1, 4, 5
//     high lane  p 4..7, p 12..15    c 2, 3, 6, 7
constexpr int kBlock = 16;

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

// Takes the upper luma row in the low halves of the lanes, the lower in the high halves.
void store_luma(__m256i luma, IyuvRows to, int x) {
    luma = _mm256_permutevar8x32_epi32(luma, _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
    store_16(to.upper + x, _mm256_castsi256_si128(luma));
    store_16(to.lower + x, _mm256_extracti128_si256(luma, 1));
}

// Takes 16-bit samples, the first plane's and the second's in turn; they are clipped to 8 bits.
void store_chroma(__m256i chroma, uint8_t* first, uint8_t* second) {
    const __m256i planes = _mm256_broadcastsi128_si256(
        _mm_setr_epi8(0, 2, 4, 6, 1, 3, 5, 7, -1, -1, -1, -1, -1, -1, -1, -1));
    const __m256i split = _mm256_shuffle_epi8(_mm256_packus_epi16(chroma, chroma), planes);
    const __m128i samples =
        _mm_unpacklo_epi16(_mm256_castsi256_si128(split), _mm256_extracti128_si256(split, 1));
    store_8(first, samples);
    store_8(second, _mm_unpackhi_epi64(samples, samples));
}

// ---- RGB ----

// Eight pixels of a row, four in each lane; `half` is 0 for the first eight of a block. Nothing
// beyond the block is read.
template <int kBytes>
__m256i load_pixels(const uint8_t* row, int half) {
    if (kBytes == 4) {
        return load_32(row + 32 * half);
    }
    return half == 0 ? join(load_16(row), load_16(row + 12))
                     : join(load_16(row + 24), load_16(row + 32));
}

// Where load_pixels puts the first bytes of the pixels, in their lanes.
template <int kBytes>
__m256i first_bytes(int half) {
    if (kBytes == 4) {
        return _mm256_setr_epi32(0, 4, 8, 12, 0, 4, 8, 12);
    }
    return half == 0 ? _mm256_setr_epi32(0, 3, 6, 9, 0, 3, 6, 9)
                     : _mm256_setr_epi32(0, 3, 6, 9, 4, 7, 10, 13);
}

template <int kBytes>
bool rgb_blocks_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at, IyuvRows to,
                        int width) {
    // Shuffles that give B and R of a pixel as 16-bit numbers, and G as a 32-bit number.
    constexpr int kHighByte = 0x8000, kNoBytes = 0x8080;  // are filled with 0
    __m256i to_blue_red[2], to_green[2];
    for (int half = 0; half < 2; ++half) {
        const __m256i first = first_bytes<kBytes>(half);
        const __m256i first_in_pairs = _mm256_or_si256(first, _mm256_slli_epi32(first, 16));
        to_blue_red[half] =
            _mm256_add_epi8(first_in_pairs, pairs_of(kHighByte | at.b, kHighByte | at.r));
        to_green[half] = _mm256_add_epi8(first, pairs_of(kHighByte | at.g, kNoBytes));
    }
    const __m256i blue_red_factors = pairs_of(kBlueFactor, kRedFactor);
    const __m256i green_factor = pairs_of(kGreenFactor, 0);
    const __m256i chroma_factors = pairs_of(kFactorU, kFactorV);
    const __m256i ones = _mm256_set1_epi16(1);
    const __m256i middle = _mm256_set1_epi16(128);

    return for_each_block(width, [&](int x) {
        __m256i luma[2];      // of a row, 16 bits a sample
        __m256i blue_red[2];  // sums over the two rows, of the first and the last eight pixels
        const uint8_t* rows[2] = {upper + kBytes * x, lower + kBytes * x};
        for (int row = 0; row < 2; ++row) {
            __m256i half_luma[2];
            for (int half = 0; half < 2; ++half) {
                const __m256i pixels = load_pixels<kBytes>(rows[row], half);
                const __m256i br = _mm256_shuffle_epi8(pixels, to_blue_red[half]);
                const __m256i g = _mm256_shuffle_epi8(pixels, to_green[half]);
                half_luma[half] =
                    _mm256_madd_epi16(_mm256_add_epi16(_mm256_mulhrs_epi16(br, blue_red_factors),
                                                       _mm256_mulhrs_epi16(g, green_factor)),
                                      ones);
                blue_red[half] = row == 0 ? br : _mm256_add_epi16(blue_red[half], br);
            }
            luma[row] = _mm256_packs_epi32(half_luma[0], half_luma[1]);
        }
        store_luma(_mm256_packus_epi16(luma[0], luma[1]), to, x);

        const __m256i means = _mm256_srli_epi16(_mm256_hadd_epi32(blue_red[0], blue_red[1]), 2);
        const __m256i luma_means =
            _mm256_srli_epi32(_mm256_madd_epi16(_mm256_add_epi16(luma[0], luma[1]), ones), 2);
        const __m256i differences =
            _mm256_sub_epi16(means, _mm256_or_si256(luma_means, _mm256_slli_epi32(luma_means, 16)));
        store_chroma(_mm256_add_epi16(_mm256_mulhrs_epi16(differences, chroma_factors), middle),
                     to.u + x / 2, to.v + x / 2);
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

void ayuv_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    // U, U, V, V of two pixels and of the next two, then the four of luma.
    const __m256i sort = _mm256_broadcastsi128_si256(
        _mm_setr_epi8(2, 6, 3, 7, 10, 14, 11, 15, 1, 5, 9, 13, -1, -1, -1, -1));
    const __m256i ones = _mm256_set1_epi8(1);
    const auto convert = [&](int x) {
        __m256i luma[2], chroma[2];
        const uint8_t* rows[2] = {upper + 4 * x, lower + 4 * x};
        for (int row = 0; row < 2; ++row) {
            const __m256i first = _mm256_shuffle_epi8(load_32(rows[row]), sort);
            const __m256i last = _mm256_shuffle_epi8(load_32(rows[row] + 32), sort);
            luma[row] = _mm256_unpackhi_epi32(first, last);
            chroma[row] = _mm256_maddubs_epi16(_mm256_unpacklo_epi64(first, last), ones);
        }
        store_luma(_mm256_unpacklo_epi64(luma[0], luma[1]), to, x);
        store_chroma(_mm256_srli_epi16(_mm256_add_epi16(chroma[0], chroma[1]), 2), to.u + x / 2,
                     to.v + x / 2);
    };
    if (!for_each_block(width, convert)) {
        scalar_ayuv_rows_to_iyuv(upper, lower, to, width);
    }
}

void yuy2_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    const __m256i low_bytes = _mm256_set1_epi16(0x00ff);
    const auto convert = [&](int x) {
        const __m256i first = _mm256_permute4x64_epi64(load_32(upper + 2 * x), 0xd8);
        const __m256i second = _mm256_permute4x64_epi64(load_32(lower + 2 * x), 0xd8);
        store_luma(_mm256_packus_epi16(_mm256_and_si256(first, low_bytes),
                                       _mm256_and_si256(second, low_bytes)),
                   to, x);
        const __m256i sums =
            _mm256_add_epi16(_mm256_srli_epi16(first, 8), _mm256_srli_epi16(second, 8));
        store_chroma(_mm256_srli_epi16(sums, 1), to.u + x / 2, to.v + x / 2);
    };
    if (!for_each_block(width, convert)) {
        scalar_yuy2_rows_to_iyuv(upper, lower, to, width);
    }
}

}  // namespace

void avx2::fill_color(Kernels& table) {
    table.rgb32_rows_to_iyuv = rgb32_rows_to_iyuv;
    table.rgb24_rows_to_iyuv = rgb24_rows_to_iyuv;
    table.ayuv_rows_to_iyuv = ayuv_rows_to_iyuv;
    table.yuy2_rows_to_iyuv = yuy2_rows_to_iyuv;
}

}  // namespace zolt
