// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h, so that no
// inline function that other files share is emitted with instructions that an older processor
// lacks.
#include "kernels/avx2.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::ptrdiff_t;
using std::uint8_t;

// ---- Reference planes ----

// Half samples from pairs of neighbours: E and F, G and H, I and J, interleaved.
__m256i half_samples(__m256i ef, __m256i gh, __m256i ij) {
    const __m256i first = _mm256_set1_epi16(static_cast<short>(0xfb01));  // 1, -5
    const __m256i middle = _mm256_set1_epi16(0x1414);                     // 20, 20
    const __m256i last = _mm256_set1_epi16(0x01fb);                       // -5, 1
    const __m256i sum = _mm256_add_epi16(
        _mm256_add_epi16(_mm256_maddubs_epi16(ef, first), _mm256_maddubs_epi16(ij, last)),
        _mm256_maddubs_epi16(gh, middle));
    return _mm256_mulhrs_epi16(sum, _mm256_set1_epi16(1 << 10));  // (sum + 16) >> 5
}

// 32 half samples below those at p.
__m256i half_vertical(const uint8_t* p, ptrdiff_t stride) {
    const __m256i e = load_32(p - 2 * stride), f = load_32(p - stride), g = load_32(p);
    const __m256i h = load_32(p + stride), i = load_32(p + 2 * stride), j = load_32(p + 3 * stride);
    return _mm256_packus_epi16(half_samples(_mm256_unpacklo_epi8(e, f), _mm256_unpacklo_epi8(g, h),
                                            _mm256_unpacklo_epi8(i, j)),
                               half_samples(_mm256_unpackhi_epi8(e, f), _mm256_unpackhi_epi8(g, h),
                                            _mm256_unpackhi_epi8(i, j)));
}

// Pairs of neighbours in either lane, of which the first begins at byte n.
__m256i neighbours(__m256i samples, int n) {
    const __m256i pairs =
        _mm256_broadcastsi128_si256(_mm_setr_epi8(0, 1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8));
    return _mm256_shuffle_epi8(samples,
                               _mm256_add_epi8(pairs, _mm256_set1_epi8(static_cast<char>(n))));
}

// 32 half samples right of those at p.
__m256i half_horizontal(const uint8_t* p) {
    // The samples that the first eight of a lane need are 0..12 of `left`, those of the others are
    // 3..15 of `right`; so nothing beyond the last tap is read.
    const __m256i left = load_32(p - 2), right = load_32(p + 3);
    return _mm256_packus_epi16(
        half_samples(neighbours(left, 0), neighbours(left, 2), neighbours(left, 4)),
        half_samples(neighbours(right, 3), neighbours(right, 5), neighbours(right, 7)));
}

// Rows of count >= 32 half samples; the last step overlaps the one before it.
void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    if (count < 32) {
        scalar_kernels().half_vertical_row(src, stride, dst, count);
        return;
    }
    for (int x = 0; x < count - 32; x += 32) {
        store_32(dst + x, half_vertical(src + x, stride));
    }
    store_32(dst + count - 32, half_vertical(src + count - 32, stride));
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    if (count < 32) {
        scalar_kernels().half_horizontal_row(src, dst, count);
        return;
    }
    for (int x = 0; x < count - 32; x += 32) {
        store_32(dst + x, half_horizontal(src + x));
    }
    store_32(dst + count - 32, half_horizontal(src + count - 32));
}

// ---- Inter prediction ----

void copy_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    for (int y = 0; y < 16; y += 2) {
        store_32(pred + 16 * y, join(load_16(src + y * stride), load_16(src + (y + 1) * stride)));
    }
}

void average_16x16(uint8_t* pred, const uint8_t* a, ptrdiff_t a_stride, const uint8_t* b,
                   ptrdiff_t b_stride) {
    for (int y = 0; y < 16; ++y) {
        store_16(pred + 16 * y, _mm_avg_epu8(load_16(a + y * a_stride), load_16(b + y * b_stride)));
    }
}

// (outer - 5 * middle + 20 * inner + 512) >> 10 with 32-bit sums.
__m256i centre_samples(__m256i outer, __m256i middle, __m256i inner) {
    const __m256i ones = _mm256_set1_epi16(1);
    const __m256i outer_middle = _mm256_set1_epi32(static_cast<int>(0xfffb0001u));  // 1, -5
    const __m256i inner_rounding = _mm256_set1_epi32(512 << 16 | 20);
    const __m256i low =
        _mm256_add_epi32(_mm256_madd_epi16(_mm256_unpacklo_epi16(outer, middle), outer_middle),
                         _mm256_madd_epi16(_mm256_unpacklo_epi16(inner, ones), inner_rounding));
    const __m256i high =
        _mm256_add_epi32(_mm256_madd_epi16(_mm256_unpackhi_epi16(outer, middle), outer_middle),
                         _mm256_madd_epi16(_mm256_unpackhi_epi16(inner, ones), inner_rounding));
    return _mm256_packs_epi32(_mm256_srai_epi32(low, 10), _mm256_srai_epi32(high, 10));
}

// Unrounded sums of the six samples around each of 16 positions in a row, as 16-bit lanes.
__m256i horizontal_sums(const uint8_t* row) {
    const auto at = [row](int n) { return _mm256_cvtepu8_epi16(load_16(row + n)); };
    const __m256i t = _mm256_sub_epi16(_mm256_slli_epi16(_mm256_add_epi16(at(0), at(1)), 2),
                                       _mm256_add_epi16(at(-1), at(2)));
    return _mm256_add_epi16(_mm256_add_epi16(_mm256_add_epi16(at(-2), at(3)), t),
                            _mm256_slli_epi16(t, 2));
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    __m256i sums[6];  // of rows -2..3 around the current one
    for (int i = 0; i < 5; ++i) {
        sums[i] = horizontal_sums(src + (i - 2) * stride);
    }
    for (int y = 0; y < 16; ++y) {
        sums[5] = horizontal_sums(src + (y + 3) * stride);
        const __m256i samples =
            centre_samples(_mm256_add_epi16(sums[0], sums[5]), _mm256_add_epi16(sums[1], sums[4]),
                           _mm256_add_epi16(sums[2], sums[3]));
        store_16(pred + 16 * y, _mm_packus_epi16(low_lane(samples), high_lane(samples)));
        for (int i = 0; i < 5; ++i) {
            sums[i] = sums[i + 1];
        }
    }
}

// Cb in the low lane, Cr in the high one.
void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    const __m256i columns = _mm256_set1_epi16(static_cast<short>((8 - fx) | fx << 8));
    const __m256i upper_weight = _mm256_set1_epi16(static_cast<short>(8 - fy));
    const __m256i lower_weight = _mm256_set1_epi16(static_cast<short>(fy));
    const auto horizontal = [&](int y) {
        const __m256i row = join(load_16(u + y * stride), load_16(v + y * stride));
        return _mm256_maddubs_epi16(neighbours(row, 0), columns);
    };
    __m256i upper = horizontal(0);
    for (int y = 0; y < 8; ++y) {
        const __m256i lower = horizontal(y + 1);
        const __m256i sum = _mm256_add_epi16(_mm256_mullo_epi16(upper, upper_weight),
                                             _mm256_mullo_epi16(lower, lower_weight));
        const __m256i rounded = _mm256_srli_epi16(_mm256_add_epi16(sum, _mm256_set1_epi16(32)), 6);
        const __m256i samples = _mm256_packus_epi16(rounded, rounded);
        store_8(pred + 8 * y, low_lane(samples));
        store_8(pred + 64 + 8 * y, high_lane(samples));
        upper = lower;
    }
}

}  // namespace

void avx2::fill_prediction(Kernels& table) {
    table.half_vertical_row = half_vertical_row;
    table.half_horizontal_row = half_horizontal_row;
    table.copy_16x16 = copy_16x16;
    table.average_16x16 = average_16x16;
    table.centre_16x16 = centre_16x16;
    table.chroma_8x8 = chroma_8x8;
}

}  // namespace zolt
