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
using std::uint8_t;

// ---- Features of the intra decisions ----

void block_sums(const uint8_t* src, ptrdiff_t stride, int32_t* sums) {
    const __m256i byte_ones = _mm256_set1_epi8(1);
    const __m256i ones = _mm256_set1_epi16(1);
    for (int block_row = 0; block_row < 4; ++block_row, src += 4 * stride) {
        const __m256i upper = join(load_16(src), load_16(src + stride));
        const __m256i lower = join(load_16(src + 2 * stride), load_16(src + 3 * stride));
        const __m256i pairs = _mm256_add_epi16(_mm256_maddubs_epi16(upper, byte_ones),
                                               _mm256_maddubs_epi16(lower, byte_ones));
        const __m256i quads = _mm256_madd_epi16(pairs, ones);
        store_16(sums + 4 * block_row, _mm_add_epi32(low_lane(quads), high_lane(quads)));
    }
}

// 4-point Hadamard transform across four vectors.
void hadamard(__m128i* v) {
    const __m128i a = _mm_add_epi32(v[0], v[1]);
    const __m128i b = _mm_sub_epi32(v[0], v[1]);
    const __m128i c = _mm_add_epi32(v[2], v[3]);
    const __m128i d = _mm_sub_epi32(v[2], v[3]);
    v[0] = _mm_add_epi32(a, c);
    v[1] = _mm_add_epi32(b, d);
    v[2] = _mm_sub_epi32(a, c);
    v[3] = _mm_sub_epi32(b, d);
}

void hadamard_energy(const int32_t* values, int32_t* energy) {
    __m128i v[4] = {load_16(values), load_16(values + 4), load_16(values + 8),
                    load_16(values + 12)};
    hadamard(v);
    const __m128i a = _mm_unpacklo_epi32(v[0], v[1]), b = _mm_unpackhi_epi32(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi32(v[2], v[3]), d = _mm_unpackhi_epi32(v[2], v[3]);
    v[0] = _mm_unpacklo_epi64(a, c);
    v[1] = _mm_unpackhi_epi64(a, c);
    v[2] = _mm_unpacklo_epi64(b, d);
    v[3] = _mm_unpackhi_epi64(b, d);
    hadamard(v);  // now vector j holds horizontal frequency j, lane i vertical frequency i
    for (__m128i& row : v) {
        row = _mm_srli_epi32(_mm_add_epi32(_mm_abs_epi32(row), _mm_set1_epi32(8)), 4);
    }
    const __m128i others = _mm_add_epi32(_mm_add_epi32(v[1], v[2]), v[3]);
    const __m128i low = _mm_unpacklo_epi32(v[0], others);   // lanes 0 of both, lanes 1 of both
    const __m128i high = _mm_unpackhi_epi32(v[0], others);  // lanes 2, lanes 3
    const __m128i sums =
        _mm_add_epi32(_mm_add_epi32(_mm_srli_si128(low, 8), high), _mm_srli_si128(high, 8));
    store_16(energy, _mm_unpacklo_epi64(low, sums));
}

// ---- Intra 4x4 prediction ----

// The predictions of clause 8.3.1.2 in the order of their modes, from the neighbours L, K, J, I, M,
// A..H. Every row of a directional mode is made of neighbours, of two in a row averaged, and of
// three in a row filtered.
void predict_4x4_modes(const uint8_t* neighbours_at, int dc, __m128i* modes) {
    constexpr char x = -1;  // from the other vector
    const __m128i n = load_16(neighbours_at);
    const __m128i before =
        _mm_shuffle_epi8(n, _mm_setr_epi8(0, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 12, 12));
    const __m128i after =
        _mm_shuffle_epi8(n, _mm_setr_epi8(1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 12, 12, 12, 12));
    const __m128i two = _mm_avg_epu8(n, after);  // (n[i] + n[i + 1] + 1) >> 1
    const __m128i odd = _mm_and_si128(_mm_xor_si128(before, after), _mm_set1_epi8(1));
    // (n[i - 1] + 2 n[i] + n[i + 1] + 2) >> 2
    const __m128i three = _mm_avg_epu8(n, _mm_sub_epi8(_mm_avg_epu8(before, after), odd));
    const auto mix = [=](__m128i from_two, __m128i from_three) {
        return _mm_or_si128(_mm_shuffle_epi8(two, from_two), _mm_shuffle_epi8(three, from_three));
    };
    modes[0] = _mm_shuffle_epi8(n, _mm_set1_epi32(0x08070605));
    modes[1] = _mm_shuffle_epi8(n, _mm_setr_epi8(3, 3, 3, 3, 2, 2, 2, 2, 1, 1, 1, 1, 0, 0, 0, 0));
    modes[2] = _mm_set1_epi8(static_cast<char>(dc));
    modes[3] = _mm_shuffle_epi8(
        three, _mm_setr_epi8(6, 7, 8, 9, 7, 8, 9, 10, 8, 9, 10, 11, 9, 10, 11, 12));
    modes[4] =
        _mm_shuffle_epi8(three, _mm_setr_epi8(4, 5, 6, 7, 3, 4, 5, 6, 2, 3, 4, 5, 1, 2, 3, 4));
    modes[5] = mix(_mm_setr_epi8(4, 5, 6, 7, x, x, x, x, x, 4, 5, 6, x, x, x, x),
                   _mm_setr_epi8(x, x, x, x, 4, 5, 6, 7, 3, x, x, x, 2, 4, 5, 6));
    modes[6] = mix(_mm_setr_epi8(3, x, x, x, 2, x, 3, x, 1, x, 2, x, 0, x, 1, x),
                   _mm_setr_epi8(x, 4, 5, 6, x, 3, x, 4, x, 2, x, 3, x, 1, x, 2));
    modes[7] = mix(_mm_setr_epi8(5, 6, 7, 8, x, x, x, x, 6, 7, 8, 9, x, x, x, x),
                   _mm_setr_epi8(x, x, x, x, 6, 7, 8, 9, x, x, x, x, 7, 8, 9, 10));
    const __m128i last =
        _mm_shuffle_epi8(n, _mm_setr_epi8(x, x, x, x, x, x, x, x, x, x, 0, 0, 0, 0, 0, 0));
    modes[8] = _mm_or_si128(mix(_mm_setr_epi8(2, x, 1, x, 1, x, 0, x, 0, x, x, x, x, x, x, x),
                                _mm_setr_epi8(x, 2, x, 1, x, 1, x, 0, x, 0, x, x, x, x, x, x)),
                            last);
}

// The distortions of two predictions at the four phases, as 16-bit values in the low half of either
// lane; rows 0, 1 and 2, 3 of the block are in both lanes.
__m256i phase_satds(__m256i src_01, __m256i src_23, __m128i a, __m128i b) {
    const __m256i rows_01 =
        _mm256_sub_epi16(src_01, _mm256_cvtepu8_epi16(_mm_unpacklo_epi64(a, b)));
    const __m256i rows_23 =
        _mm256_sub_epi16(src_23, _mm256_cvtepu8_epi16(_mm_unpackhi_epi64(a, b)));
    const __m256i sums = _mm256_abs_epi16(_mm256_add_epi16(rows_01, rows_23));
    const __m256i differences = _mm256_abs_epi16(_mm256_sub_epi16(rows_01, rows_23));
    // |a + b| + |a - b| = 2 max(|a|, |b|), a and b two columns apart.
    const __m256i largest =
        _mm256_add_epi16(_mm256_max_epi16(sums, _mm256_srli_epi64(sums, 32)),
                         _mm256_max_epi16(differences, _mm256_srli_epi64(differences, 32)));
    return _mm256_shuffle_epi32(_mm256_add_epi16(largest, largest), _MM_SHUFFLE(3, 1, 2, 0));
}

void intra_4x4_modes(const uint8_t* src, ptrdiff_t stride, const uint8_t* neighbours_at, int dc,
                     uint8_t* preds, int16_t* distortion) {
    __m128i modes[9];
    predict_4x4_modes(neighbours_at, dc, modes);
    for (int mode = 0; mode < 9; ++mode) {
        store_16(preds + 16 * mode, modes[mode]);
    }
    const __m256i src_01 = _mm256_broadcastsi128_si256(two_rows_of_4(src, stride));
    const __m256i src_23 = _mm256_broadcastsi128_si256(two_rows_of_4(src + 2 * stride, stride));
    __m256i d[4];  // modes n and n + 4
    for (int n = 0; n < 4; ++n) {
        d[n] = phase_satds(src_01, src_23, modes[n], modes[n + 4]);
    }
    const __m256i d01 = _mm256_unpacklo_epi16(d[0], d[1]);
    const __m256i d23 = _mm256_unpacklo_epi16(d[2], d[3]);
    constexpr int kLanesBySide = _MM_SHUFFLE(3, 1, 2, 0);
    const __m256i first = _mm256_permute4x64_epi64(_mm256_unpacklo_epi32(d01, d23), kLanesBySide);
    const __m256i last = _mm256_permute4x64_epi64(_mm256_unpackhi_epi32(d01, d23), kLanesBySide);
    const __m128i d8 = low_lane(phase_satds(src_01, src_23, modes[8], modes[8]));
    const __m128i first_value = _mm_setr_epi16(-1, 0, 0, 0, 0, 0, 0, 0);
    const auto store_phase = [=](int phase, __m128i eight, __m128i ninth) {
        store_16(distortion + 16 * phase, eight);
        store_16(distortion + 16 * phase + 8, _mm_and_si128(ninth, first_value));
    };
    store_phase(0, low_lane(first), d8);
    store_phase(1, high_lane(first), _mm_srli_epi64(d8, 16));
    store_phase(2, low_lane(last), _mm_srli_epi64(d8, 32));
    store_phase(3, high_lane(last), _mm_srli_epi64(d8, 48));
}

}  // namespace

void avx2::fill_intra(Kernels& table) {
    table.block_sums = block_sums;
    table.hadamard_energy = hadamard_energy;
    table.intra_4x4_modes = intra_4x4_modes;
}

}  // namespace zolt
