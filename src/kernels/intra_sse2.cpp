#include "kernels/families.h"
#include "kernels/hadamard_simd.h"
#include "kernels/intra_modes.h"
#include "kernels/predict_4x4.h"
#include "kernels/sse2.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::ptrdiff_t;
using std::uint8_t;

void block_sums(const uint8_t* src, ptrdiff_t stride, int32_t* sums) {
    const __m128i zero = _mm_setzero_si128();
    const __m128i ones = _mm_set1_epi16(1);
    for (int block_row = 0; block_row < 4; ++block_row, src += 4 * stride) {
        __m128i low = zero;
        __m128i high = zero;
        for (int y = 0; y < 4; ++y) {
            const __m128i samples = load(src + y * stride);
            low = _mm_add_epi16(low, widen_low(samples));
            high = _mm_add_epi16(high, widen_high(samples));
        }
        // Sums of two columns each, then of four.
        const __m128i pairs =
            _mm_packs_epi32(_mm_madd_epi16(low, ones), _mm_madd_epi16(high, ones));
        store(sums + 4 * block_row, _mm_madd_epi16(pairs, ones));
    }
}

void phase_sad_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                     int32_t* distortion) {
    const __m128i zero = _mm_setzero_si128();
    for (int y = 0; y < 4; ++y) {
        __m128i sum = zero;
        for (int row = y; row < 16; row += 4) {
            const __m128i a = load(src + row * stride);
            const __m128i b = load(pred + 16 * row);
            const __m128i difference = _mm_or_si128(_mm_subs_epu8(a, b), _mm_subs_epu8(b, a));
            sum = _mm_add_epi16(sum, _mm_add_epi16(widen_low(difference), widen_high(difference)));
        }
        sum = _mm_add_epi16(sum, _mm_srli_si128(sum, 8));
        store(distortion + 4 * y, _mm_unpacklo_epi16(sum, zero));
    }
}

void phase_satd_8x8(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    const __m128i zero = _mm_setzero_si128();
    const auto difference = [&](int y) {
        return _mm_sub_epi16(widen_low(load_8(src + y * stride)), widen_low(load_8(pred + 8 * y)));
    };
    for (int y = 0; y < 4; ++y) {
        const __m128i upper = difference(y);
        const __m128i lower = difference(y + 4);
        const __m128i sums = absolute_16(_mm_add_epi16(upper, lower));
        const __m128i differences = absolute_16(_mm_sub_epi16(upper, lower));
        // |a + b| + |a - b| = 2 max(|a|, |b|), a and b four columns apart.
        const __m128i largest =
            _mm_add_epi16(_mm_max_epi16(sums, _mm_srli_si128(sums, 8)),
                          _mm_max_epi16(differences, _mm_srli_si128(differences, 8)));
        store(distortion + 4 * y, _mm_unpacklo_epi16(_mm_add_epi16(largest, largest), zero));
    }
}

// A 4x4 block's rows 0, 1 and 2, 3 in 16-bit lanes.
struct TwoRowPairs {
    __m128i rows_01, rows_23;
};

TwoRowPairs load_4x4(const uint8_t* src, ptrdiff_t stride) {
    return {widen_low(_mm_unpacklo_epi32(load_4(src), load_4(src + stride))),
            widen_low(_mm_unpacklo_epi32(load_4(src + 2 * stride), load_4(src + 3 * stride)))};
}

// The distortions of the four phases as 16-bit values in the low half.
__m128i phase_satds(const TwoRowPairs& src, const uint8_t* pred) {
    const __m128i rows_01 = _mm_sub_epi16(src.rows_01, widen_low(load_8(pred)));
    const __m128i rows_23 = _mm_sub_epi16(src.rows_23, widen_low(load_8(pred + 8)));
    const __m128i sums = absolute_16(_mm_add_epi16(rows_01, rows_23));
    const __m128i differences = absolute_16(_mm_sub_epi16(rows_01, rows_23));
    // As above, two columns apart: each row is a group of four lanes.
    const __m128i largest =
        _mm_add_epi16(_mm_max_epi16(sums, _mm_srli_epi64(sums, 32)),
                      _mm_max_epi16(differences, _mm_srli_epi64(differences, 32)));
    return _mm_shuffle_epi32(_mm_add_epi16(largest, largest), _MM_SHUFFLE(3, 1, 2, 0));
}

void phase_satd_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    const __m128i phases = phase_satds(load_4x4(src, stride), pred);
    store(distortion, _mm_unpacklo_epi16(phases, _mm_setzero_si128()));
}

void intra_4x4_modes(const uint8_t* src, ptrdiff_t stride, const uint8_t* neighbours, int dc,
                     uint8_t* preds, int16_t* distortion) {
    const TwoRowPairs block = load_4x4(src, stride);
    __m128i d[9];
    for (int mode = 0; mode < 9; ++mode) {
        predict_4x4(preds + 16 * mode, neighbours, dc, mode);
        d[mode] = phase_satds(block, preds + 16 * mode);
    }
    const __m128i d01 = _mm_unpacklo_epi16(d[0], d[1]), d23 = _mm_unpacklo_epi16(d[2], d[3]);
    const __m128i d45 = _mm_unpacklo_epi16(d[4], d[5]), d67 = _mm_unpacklo_epi16(d[6], d[7]);
    const __m128i first_low = _mm_unpacklo_epi32(d01, d23),
                  first_high = _mm_unpackhi_epi32(d01, d23);
    const __m128i last_low = _mm_unpacklo_epi32(d45, d67), last_high = _mm_unpackhi_epi32(d45, d67);
    store(distortion, _mm_unpacklo_epi64(first_low, last_low));
    store(distortion + 16, _mm_unpackhi_epi64(first_low, last_low));
    store(distortion + 32, _mm_unpacklo_epi64(first_high, last_high));
    store(distortion + 48, _mm_unpackhi_epi64(first_high, last_high));
    const __m128i first_value = _mm_setr_epi16(-1, 0, 0, 0, 0, 0, 0, 0);
    store(distortion + 8, _mm_and_si128(d[8], first_value));
    store(distortion + 24, _mm_and_si128(_mm_srli_epi64(d[8], 16), first_value));
    store(distortion + 40, _mm_and_si128(_mm_srli_epi64(d[8], 32), first_value));
    store(distortion + 56, _mm_and_si128(_mm_srli_epi64(d[8], 48), first_value));
}

}  // namespace

void sse2::fill_intra(Kernels& table) {
    table.block_sums = block_sums;
    table.hadamard_energy = hadamard_energy_by<absolute_32>;
    table.intra_16x16_modes = intra_16x16_modes_by<phase_sad_16x16>;
    table.intra_chroma_modes = intra_chroma_modes_by<phase_satd_8x8>;
    table.phase_satd_4x4 = phase_satd_4x4;
    table.intra_4x4_modes = intra_4x4_modes;
}

}  // namespace zolt
