// Compiled for AVX2: nothing but intrinsics and functions of this file, of avx2.h and of
// hadamard_simd.h, so that no inline function that other files share is emitted with instructions
// that an older processor lacks.
#include "kernels/avx2.h"
#include "kernels/families.h"
#include "kernels/hadamard_simd.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
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

__m128i absolute_32(__m128i v) {
    return _mm_abs_epi32(v);
}

// ---- Intra 16x16 and chroma ----

__m256i twice(__m128i v) {
    return _mm256_broadcastsi128_si256(v);
}

// Sum of the products of samples and weights -8..8.
int weighted_sum(__m128i samples, __m128i weights) {
    const __m128i quads = _mm_madd_epi16(_mm_maddubs_epi16(samples, weights), _mm_set1_epi16(1));
    const __m128i halves = _mm_add_epi32(quads, _mm_srli_si128(quads, 8));
    return _mm_cvtsi128_si32(_mm_add_epi32(halves, _mm_srli_epi64(halves, 32)));
}

// Sums of the samples in either half.
struct HalfSums {
    int low, high;
};
HalfSums half_sums(__m128i samples) {
    const __m128i sums = _mm_sad_epu8(samples, _mm_setzero_si128());
    return {_mm_cvtsi128_si32(sums), _mm_extract_epi16(sums, 4)};
}

// Eight samples below each other, the first in the lowest byte.
__m128i column_of_8(const uint8_t* p, ptrdiff_t stride) {
    const auto four = [stride](const uint8_t* q) {
        return static_cast<uint32_t>(q[0] | q[stride] << 8 | q[2 * stride] << 16) |
               static_cast<uint32_t>(q[3 * stride]) << 24;
    };
    return _mm_insert_epi32(_mm_cvtsi32_si128(static_cast<int32_t>(four(p))),
                            static_cast<int32_t>(four(p + 4 * stride)), 1);
}

// Samples with the columns of a sampling phase next to each other.
__m256i by_phase(__m256i rows) {
    return _mm256_shuffle_epi8(
        rows, twice(_mm_setr_epi8(0, 4, 8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15)));
}

// Rows y, y + 4, y + 8 and y + 12 of a block or of a prediction as 64-bit groups by phase: phases 0
// and 1, or 2 and 3, of the first two rows in the low lane, of the others in the high one. From
// rows y and y + 8, and rows y + 4 and y + 12, by_phase.
struct FourRows {
    __m256i phases_01, phases_23;
    FourRows(__m256i outer, __m256i inner)
        : phases_01(_mm256_unpacklo_epi32(outer, inner)),
          phases_23(_mm256_unpackhi_epi32(outer, inner)) {}
};

// SADs of the four phases, in the order 0, 2, 1, 3.
__m128i sads(const FourRows& a, const FourRows& b) {
    const __m256i first = _mm256_sad_epu8(a.phases_01, b.phases_01);
    const __m256i second = _mm256_sad_epu8(a.phases_23, b.phases_23);
    const __m256i all = _mm256_or_si256(first, _mm256_slli_epi64(second, 32));
    return _mm_add_epi32(low_lane(all), high_lane(all));
}

// Plane prediction (clause 8.3.3.4): rows y and y + 8 for every y < 8.
void plane_16x16(__m128i above, __m128i left, int corner, __m256i* rows) {
    const __m128i weights = _mm_setr_epi8(-7, -6, -5, -4, -3, -2, -1, 0, 1, 2, 3, 4, 5, 6, 7, 8);
    const int b = (5 * (weighted_sum(above, weights) - 8 * corner) + 32) >> 6;
    const int c = (5 * (weighted_sum(left, weights) - 8 * corner) + 32) >> 6;
    const int a = 16 * (_mm_extract_epi8(above, 15) + _mm_extract_epi8(left, 15));
    const __m256i x = _mm256_setr_epi16(-7, -6, -5, -4, -3, -2, -1, 0, 1, 2, 3, 4, 5, 6, 7, 8);
    const __m256i step = _mm256_set1_epi16(static_cast<short>(c));
    const __m256i half = _mm256_slli_epi16(step, 3);
    __m256i row = _mm256_add_epi16(_mm256_mullo_epi16(x, _mm256_set1_epi16(static_cast<short>(b))),
                                   _mm256_set1_epi16(static_cast<short>(a + 16 - 7 * c)));
    for (int y = 0; y < 8; ++y) {
        const __m256i both = _mm256_packus_epi16(_mm256_srai_epi16(row, 5),
                                                 _mm256_srai_epi16(_mm256_add_epi16(row, half), 5));
        rows[y] = _mm256_permute4x64_epi64(both, _MM_SHUFFLE(3, 1, 2, 0));
        row = _mm256_add_epi16(row, step);
    }
}

void intra_16x16_modes(const uint8_t* src, ptrdiff_t stride, bool up, bool left, uint8_t* preds,
                       int32_t* distortion) {
    const __m128i above = load_16(src - stride);
    const __m128i column =
        _mm_unpacklo_epi64(column_of_8(src - 1, stride), column_of_8(src + 8 * stride - 1, stride));
    const HalfSums above_sums = half_sums(above), column_sums = half_sums(column);
    const int above_sum = above_sums.low + above_sums.high;
    const int column_sum = column_sums.low + column_sums.high;
    const int mean = up && left ? (above_sum + column_sum + 16) >> 5
                     : up       ? (above_sum + 8) >> 4
                     : left     ? (column_sum + 8) >> 4
                                : 128;
    const __m256i vertical = twice(above);
    const __m256i means = _mm256_set1_epi8(static_cast<char>(mean));
    const __m256i columns = twice(column);
    __m256i plane[8];
    plane_16x16(above, column, src[-stride - 1], plane);
    for (int y = 0; y < 8; ++y) {
        store_32(preds + 32 * y, vertical);
        // Rows 2y and 2y + 1.
        const __m256i row_numbers = join(_mm_set1_epi8(static_cast<char>(2 * y)),
                                         _mm_set1_epi8(static_cast<char>(2 * y + 1)));
        store_32(preds + 256 + 32 * y, _mm256_shuffle_epi8(columns, row_numbers));
        store_32(preds + 512 + 32 * y, means);
        store_16(preds + 768 + 16 * y, low_lane(plane[y]));
        store_16(preds + 768 + 16 * (y + 8), high_lane(plane[y]));
    }
    const FourRows vertical_rows(by_phase(vertical), by_phase(vertical));
    const FourRows mean_rows(means, means);
    for (int y = 0; y < 2; ++y) {
        const auto source_rows = [=](int row) {
            return by_phase(join(load_16(src + row * stride), load_16(src + (row + 8) * stride)));
        };
        const auto column_rows = [=](int row) {
            return _mm256_shuffle_epi8(columns, join(_mm_set1_epi8(static_cast<char>(row)),
                                                     _mm_set1_epi8(static_cast<char>(row + 8))));
        };
        const FourRows source(source_rows(y), source_rows(y + 4));
        const __m128i v = sads(source, vertical_rows);
        const __m128i h = sads(source, FourRows(column_rows(y), column_rows(y + 4)));
        const __m128i m = sads(source, mean_rows);
        const __m128i p = sads(source, FourRows(by_phase(plane[y]), by_phase(plane[y + 4])));
        const __m128i vh_02 = _mm_unpacklo_epi32(v, h), vh_13 = _mm_unpackhi_epi32(v, h);
        const __m128i mp_02 = _mm_unpacklo_epi32(m, p), mp_13 = _mm_unpackhi_epi32(m, p);
        store_16(distortion + 16 * y, _mm_unpacklo_epi64(vh_02, mp_02));
        store_16(distortion + 16 * y + 4, _mm_unpacklo_epi64(vh_13, mp_13));
        store_16(distortion + 16 * y + 8, _mm_unpackhi_epi64(vh_02, mp_02));
        store_16(distortion + 16 * y + 12, _mm_unpackhi_epi64(vh_13, mp_13));
    }
}

// What the chroma predictions of one component are made of.
struct ChromaNeighbours {
    __m128i above, column;  // 8 samples each, in both halves
    int corner;

    ChromaNeighbours(const uint8_t* src, ptrdiff_t stride) : corner(src[-stride - 1]) {
        above = load_8(src - stride);
        above = _mm_unpacklo_epi64(above, above);
        column = column_of_8(src - 1, stride);
        column = _mm_unpacklo_epi64(column, column);
    }

    // The means of the four blocks, each four times (clauses 8.3.4.1 to 8.3.4.3).
    __m128i means(bool up, bool left) const {
        // Sums of the halves of the neighbours.
        const __m128i halves = _mm_unpacklo_epi32(above, _mm_setzero_si128());
        const __m128i sides = _mm_unpacklo_epi32(column, _mm_setzero_si128());
        const HalfSums a = half_sums(halves), c = half_sums(sides);
        int mean[4] = {128, 128, 128, 128};
        if (up && left) {
            mean[0] = (a.low + c.low + 4) >> 3;
            mean[1] = (a.high + 2) >> 2;
            mean[2] = (c.high + 2) >> 2;
            mean[3] = (a.high + c.high + 4) >> 3;
        } else if (up) {
            mean[0] = mean[2] = (a.low + 2) >> 2;
            mean[1] = mean[3] = (a.high + 2) >> 2;
        } else if (left) {
            mean[0] = mean[1] = (c.low + 2) >> 2;
            mean[2] = mean[3] = (c.high + 2) >> 2;
        }
        return _mm_mullo_epi32(_mm_setr_epi32(mean[0], mean[1], mean[2], mean[3]),
                               _mm_set1_epi32(0x01010101));
    }
};

// Plane prediction of both components (clause 8.3.4.4): rows 2y and 2y + 1 at [y], those of Cb in
// the low lane.
void plane_chroma(const ChromaNeighbours& u, const ChromaNeighbours& v, __m256i* rows) {
    struct Parameters {
        short a, b, c;
        explicit Parameters(const ChromaNeighbours& n) {
            // Eight samples twice, of which one half counts.
            const __m128i weights =
                _mm_setr_epi8(-3, -2, -1, 0, 1, 2, 3, 4, 0, 0, 0, 0, 0, 0, 0, 0);
            const int horizontal = weighted_sum(n.above, weights) - 4 * n.corner;
            const int vertical = weighted_sum(n.column, weights) - 4 * n.corner;
            b = static_cast<short>((17 * horizontal + 16) >> 5);
            c = static_cast<short>((17 * vertical + 16) >> 5);
            a = static_cast<short>(
                16 * (_mm_extract_epi8(n.above, 7) + _mm_extract_epi8(n.column, 7)) + 16 - 3 * c);
        }
    };
    const Parameters cb(u), cr(v);
    const auto both = [](short low, short high) {
        return join(_mm_set1_epi16(low), _mm_set1_epi16(high));
    };
    const __m256i step = both(cb.c, cr.c);
    __m256i row = _mm256_add_epi16(
        _mm256_mullo_epi16(both(cb.b, cr.b), twice(_mm_setr_epi16(-3, -2, -1, 0, 1, 2, 3, 4))),
        both(cb.a, cr.a));
    for (int y = 0; y < 4; ++y) {
        const __m256i next = _mm256_add_epi16(row, step);
        rows[y] = _mm256_packus_epi16(_mm256_srai_epi16(row, 5), _mm256_srai_epi16(next, 5));
        row = _mm256_add_epi16(next, step);
    }
}

// A prediction's or the source's rows y and y + 4: their sums and differences, Cb in the low lane.
struct RowPair {
    __m256i sums, differences;
    RowPair(__m256i upper, __m256i lower)
        : sums(_mm256_add_epi16(upper, lower)), differences(_mm256_sub_epi16(upper, lower)) {}
};

// Distortions of two predictions, those of four phases side by side.
__m128i chroma_distortion(const RowPair& source, const RowPair& a, const RowPair& b) {
    // |a + b| + |a - b| = 2 max(|a|, |b|), a and b four columns apart.
    const auto larger = [](__m256i from, __m256i one, __m256i other) {
        const __m256i m = _mm256_abs_epi16(_mm256_sub_epi16(from, one));
        const __m256i n = _mm256_abs_epi16(_mm256_sub_epi16(from, other));
        return _mm256_max_epi16(_mm256_unpacklo_epi64(m, n), _mm256_unpackhi_epi64(m, n));
    };
    const __m256i half = _mm256_add_epi16(larger(source.sums, a.sums, b.sums),
                                          larger(source.differences, a.differences, b.differences));
    const __m128i components = _mm_add_epi16(low_lane(half), high_lane(half));
    return _mm_add_epi16(components, components);
}

void intra_chroma_modes(const uint8_t* u, const uint8_t* v, ptrdiff_t stride, bool up, bool left,
                        uint8_t* preds, int32_t* distortion) {
    const ChromaNeighbours cb(u, stride), cr(v, stride);
    const __m256i above = join(cb.above, cr.above);
    const __m256i columns = join(cb.column, cr.column);
    const __m256i means = join(cb.means(up, left), cr.means(up, left));
    __m256i plane[4];
    plane_chroma(cb, cr, plane);

    const auto store_rows = [preds](int mode, int y, __m256i two_rows) {
        store_16(preds + 128 * mode + 16 * y, low_lane(two_rows));
        store_16(preds + 128 * mode + 64 + 16 * y, high_lane(two_rows));
    };
    const __m256i upper_means = _mm256_unpacklo_epi64(means, means);
    const __m256i lower_means = _mm256_unpackhi_epi64(means, means);
    for (int y = 0; y < 4; ++y) {
        store_rows(0, y, y < 2 ? upper_means : lower_means);
        const __m256i row_numbers =
            _mm256_add_epi8(_mm256_set1_epi8(static_cast<char>(2 * y)),
                            twice(_mm_setr_epi8(0, 0, 0, 0, 0, 0, 0, 0, 1, 1, 1, 1, 1, 1, 1, 1)));
        store_rows(1, y, _mm256_shuffle_epi8(columns, row_numbers));
        store_rows(2, y, above);
        store_rows(3, y, plane[y]);
    }

    const __m256i zero = _mm256_setzero_si256();
    const __m256i above_words = _mm256_unpacklo_epi8(above, zero);
    const RowPair vertical(above_words, above_words);
    const RowPair mean(_mm256_unpacklo_epi8(upper_means, zero),
                       _mm256_unpacklo_epi8(lower_means, zero));
    for (int y = 0; y < 3; ++y) {
        const auto source_row = [=](int row) {
            return _mm256_cvtepu8_epi16(
                _mm_unpacklo_epi64(load_8(u + row * stride), load_8(v + row * stride)));
        };
        const auto column_row = [=](int row) {
            // One sample's byte and a zero byte in each of eight words.
            return _mm256_shuffle_epi8(columns,
                                       _mm256_set1_epi16(static_cast<short>(0x8000 | row)));
        };
        const auto plane_row = [&](int row) {
            return row % 2 == 0 ? _mm256_unpacklo_epi8(plane[row / 2], zero)
                                : _mm256_unpackhi_epi8(plane[row / 2], zero);
        };
        const RowPair source(source_row(y), source_row(y + 4));
        const __m128i mean_horizontal =
            chroma_distortion(source, mean, RowPair(column_row(y), column_row(y + 4)));
        const __m128i vertical_plane =
            chroma_distortion(source, vertical, RowPair(plane_row(y), plane_row(y + 4)));
        // By phase, then by mode.
        const __m128i mean_vertical = _mm_unpacklo_epi16(mean_horizontal, vertical_plane);
        const __m128i horizontal_plane = _mm_unpackhi_epi16(mean_horizontal, vertical_plane);
        store_32(distortion + 16 * y,
                 _mm256_cvtepu16_epi32(_mm_unpacklo_epi16(mean_vertical, horizontal_plane)));
        store_32(distortion + 16 * y + 8,
                 _mm256_cvtepu16_epi32(_mm_unpackhi_epi16(mean_vertical, horizontal_plane)));
    }
}

}  // namespace

void avx2::fill_intra(Kernels& table) {
    table.block_sums = block_sums;
    table.hadamard_energy = hadamard_energy_by<absolute_32>;
    table.intra_16x16_modes = intra_16x16_modes;
    table.intra_chroma_modes = intra_chroma_modes;
}

}  // namespace zolt
