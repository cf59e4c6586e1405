// Compiled for AVX2: nothing but intrinsics and functions of this file and of avx2.h, so that no
// inline function that other files share is emitted with instructions that an older processor
// lacks.
#include "kernels/avx2.h"
#include "kernels/deblock_simd.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::int32_t;
using std::int8_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

// Sixteen lines of an edge.
struct Lanes {
    __m256i v;

    static Lanes load(const uint8_t* p) { return {_mm256_cvtepu8_epi16(load_16(p))}; }
    void store(uint8_t* p) const { store_16(p, _mm_packus_epi16(low_lane(v), high_lane(v))); }
    static Lanes splat(int value) { return {_mm256_set1_epi16(static_cast<short>(value))}; }

    friend Lanes operator+(Lanes a, Lanes b) { return {_mm256_add_epi16(a.v, b.v)}; }
    friend Lanes operator-(Lanes a, Lanes b) { return {_mm256_sub_epi16(a.v, b.v)}; }
    friend Lanes operator*(Lanes a, Lanes b) { return {_mm256_mullo_epi16(a.v, b.v)}; }
    friend Lanes operator&(Lanes a, Lanes b) { return {_mm256_and_si256(a.v, b.v)}; }
    static Lanes andnot(Lanes a, Lanes b) { return {_mm256_andnot_si256(a.v, b.v)}; }
    static Lanes less(Lanes a, Lanes b) { return {_mm256_cmpgt_epi16(b.v, a.v)}; }
    static Lanes min(Lanes a, Lanes b) { return {_mm256_min_epi16(a.v, b.v)}; }
    static Lanes max(Lanes a, Lanes b) { return {_mm256_max_epi16(a.v, b.v)}; }
    static Lanes average(Lanes a, Lanes b) { return {_mm256_avg_epu16(a.v, b.v)}; }
    static Lanes shift_right(Lanes a, int n) { return {_mm256_srai_epi16(a.v, n)}; }
    static Lanes absolute_difference(Lanes a, Lanes b) {
        return {_mm256_abs_epi16(_mm256_sub_epi16(a.v, b.v))};
    }
    static Lanes select(Lanes mask, Lanes a, Lanes b) {
        return {_mm256_blendv_epi8(b.v, a.v, mask.v)};
    }
    static bool any(Lanes a) { return !_mm256_testz_si256(a.v, a.v); }
};

// tC0 of 16 lines; lines: the segment of each.
Lanes line_tc0(const int8_t* tc0, uint32_t strengths, __m128i lines) {
    int32_t by_strength;
    __builtin_memcpy(&by_strength, tc0, sizeof by_strength);
    const __m128i segments = _mm_shuffle_epi8(_mm_cvtsi32_si128(by_strength),
                                              _mm_cvtsi32_si128(static_cast<int>(strengths)));
    return {_mm256_cvtepi8_epi16(_mm_shuffle_epi8(segments, lines))};
}

// The samples p3..q3 around a luma edge of 16 lines.
struct LumaLines {
    Lanes p3, p2, p1, p0, q0, q1, q2, q3;

    bool filter(int alpha, int beta, const int8_t* tc0, uint32_t strengths) {
        return filter_luma(p2, p1, p0, q0, q1, q2, alpha, beta,
                           line_tc0(tc0, strengths,
                                    _mm_setr_epi8(0, 0, 0, 0, 1, 1, 1, 1, 2, 2, 2, 2, 3, 3, 3, 3)));
    }
    bool filter_strong(int alpha, int beta) {
        return filter_luma_strong(p3, p2, p1, p0, q0, q1, q2, q3, alpha, beta);
    }
};

LumaLines luma_rows(const uint8_t* pix, ptrdiff_t stride) {
    const auto row = [=](int y) { return Lanes::load(pix + y * stride); };
    return {row(-4), row(-3), row(-2), row(-1), row(0), row(1), row(2), row(3)};
}

// Eight columns of 16 lines, transposed.
LumaLines luma_columns(const uint8_t* pix, ptrdiff_t stride) {
    const uint8_t* src = pix - 4;
    __m128i a[8];  // rows i and i + 8 interleaved
    for (int i = 0; i < 8; ++i) {
        a[i] = _mm_unpacklo_epi8(load_8(src + i * stride), load_8(src + (i + 8) * stride));
    }
    __m128i b[8];
    for (int i = 0; i < 4; ++i) {
        b[2 * i] = _mm_unpacklo_epi8(a[i], a[i + 4]);
        b[2 * i + 1] = _mm_unpackhi_epi8(a[i], a[i + 4]);
    }
    // b[2i + h]: rows i, i + 4, i + 8, i + 12 of columns 4h..4h + 3.
    __m128i columns[8];
    for (int h = 0; h < 2; ++h) {
        const __m128i even_low = _mm_unpacklo_epi8(b[h], b[4 + h]);
        const __m128i even_high = _mm_unpackhi_epi8(b[h], b[4 + h]);
        const __m128i odd_low = _mm_unpacklo_epi8(b[2 + h], b[6 + h]);
        const __m128i odd_high = _mm_unpackhi_epi8(b[2 + h], b[6 + h]);
        columns[4 * h] = _mm_unpacklo_epi8(even_low, odd_low);
        columns[4 * h + 1] = _mm_unpackhi_epi8(even_low, odd_low);
        columns[4 * h + 2] = _mm_unpacklo_epi8(even_high, odd_high);
        columns[4 * h + 3] = _mm_unpackhi_epi8(even_high, odd_high);
    }
    const auto lanes = [&](int i) { return Lanes{_mm256_cvtepu8_epi16(columns[i])}; };
    return {lanes(0), lanes(1), lanes(2), lanes(3), lanes(4), lanes(5), lanes(6), lanes(7)};
}

// The samples of 16 lines at two places of the edge, one in each half.
__m256i two_samples(Lanes a, Lanes b) {
    return _mm256_permute4x64_epi64(_mm256_packus_epi16(a.v, b.v), _MM_SHUFFLE(3, 1, 2, 0));
}

// Stores columns n, n + 1, n + 2 and n + 3 of 16 lines.
void store_four_columns(uint8_t* p, ptrdiff_t stride, __m256i first, __m256i last) {
    const __m128i low_01 = _mm_unpacklo_epi8(low_lane(first), high_lane(first));
    const __m128i high_01 = _mm_unpackhi_epi8(low_lane(first), high_lane(first));
    const __m128i low_23 = _mm_unpacklo_epi8(low_lane(last), high_lane(last));
    const __m128i high_23 = _mm_unpackhi_epi8(low_lane(last), high_lane(last));
    const __m128i lines[4] = {
        _mm_unpacklo_epi16(low_01, low_23), _mm_unpackhi_epi16(low_01, low_23),
        _mm_unpacklo_epi16(high_01, high_23), _mm_unpackhi_epi16(high_01, high_23)};
    for (int i = 0; i < 4; ++i, p += 4 * stride) {
        const int32_t samples[4] = {_mm_cvtsi128_si32(lines[i]), _mm_extract_epi32(lines[i], 1),
                                    _mm_extract_epi32(lines[i], 2), _mm_extract_epi32(lines[i], 3)};
        for (int y = 0; y < 4; ++y) {
            __builtin_memcpy(p + y * stride, samples + y, sizeof *samples);
        }
    }
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    LumaLines lines = luma_rows(pix, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        lines.p1.store(pix - 2 * stride);
        lines.p0.store(pix - stride);
        lines.q0.store(pix);
        lines.q1.store(pix + stride);
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    LumaLines lines = luma_rows(pix, stride);
    if (lines.filter_strong(alpha, beta)) {
        lines.p2.store(pix - 3 * stride);
        lines.p1.store(pix - 2 * stride);
        lines.p0.store(pix - stride);
        lines.q0.store(pix);
        lines.q1.store(pix + stride);
        lines.q2.store(pix + 2 * stride);
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    LumaLines lines = luma_columns(pix, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_four_columns(pix - 2, stride, two_samples(lines.p1, lines.p0),
                           two_samples(lines.q0, lines.q1));
    }
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    LumaLines lines = luma_columns(pix, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_four_columns(pix - 4, stride, two_samples(lines.p3, lines.p2),
                           two_samples(lines.p1, lines.p0));
        store_four_columns(pix, stride, two_samples(lines.q0, lines.q1),
                           two_samples(lines.q2, lines.q3));
    }
}

// The samples p1, p0, q0, q1 around a chroma edge: eight lines of Cb, then of Cr.
struct ChromaLines {
    Lanes p1, p0, q0, q1;

    bool filter(int alpha, int beta, const int8_t* tc0, uint32_t strengths) {
        return filter_chroma(
            p1, p0, q0, q1, alpha, beta,
            line_tc0(tc0, strengths,
                     _mm_setr_epi8(0, 0, 1, 1, 2, 2, 3, 3, 0, 0, 1, 1, 2, 2, 3, 3)));
    }
    bool filter_strong(int alpha, int beta) {
        return filter_chroma_strong(p1, p0, q0, q1, alpha, beta);
    }
};

ChromaLines chroma_rows(const uint8_t* u, const uint8_t* v, ptrdiff_t stride) {
    const auto row = [=](int y) {
        const __m128i samples = _mm_unpacklo_epi64(load_8(u + y * stride), load_8(v + y * stride));
        return Lanes{_mm256_cvtepu8_epi16(samples)};
    };
    return {row(-2), row(-1), row(0), row(1)};
}

void store_chroma_rows(const ChromaLines& lines, uint8_t* u, uint8_t* v, ptrdiff_t stride) {
    // p0 and q0 of Cb in the low lane, of Cr in the high one.
    const __m256i samples = _mm256_packus_epi16(lines.p0.v, lines.q0.v);
    store_8(u - stride, low_lane(samples));
    store_8(u, _mm_srli_si128(low_lane(samples), 8));
    store_8(v - stride, high_lane(samples));
    store_8(v, _mm_srli_si128(high_lane(samples), 8));
}

// Columns p1..q1 of four lines, one after the other.
__m128i four_lines(const uint8_t* p, ptrdiff_t stride) {
    const auto line = [=](int y) {
        int32_t samples;
        __builtin_memcpy(&samples, p + y * stride, sizeof samples);
        return samples;
    };
    const __m128i lines = _mm_insert_epi32(
        _mm_insert_epi32(_mm_insert_epi32(_mm_cvtsi32_si128(line(0)), line(1), 1), line(2), 2),
        line(3), 3);
    return _mm_shuffle_epi8(lines,
                            _mm_setr_epi8(0, 4, 8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15));
}

ChromaLines chroma_columns(const uint8_t* u, const uint8_t* v, ptrdiff_t stride) {
    const __m128i u0 = four_lines(u - 2, stride), u4 = four_lines(u - 2 + 4 * stride, stride);
    const __m128i v0 = four_lines(v - 2, stride), v4 = four_lines(v - 2 + 4 * stride, stride);
    const __m128i u_p = _mm_unpacklo_epi32(u0, u4), u_q = _mm_unpackhi_epi32(u0, u4);
    const __m128i v_p = _mm_unpacklo_epi32(v0, v4), v_q = _mm_unpackhi_epi32(v0, v4);
    return {{_mm256_cvtepu8_epi16(_mm_unpacklo_epi64(u_p, v_p))},
            {_mm256_cvtepu8_epi16(_mm_unpackhi_epi64(u_p, v_p))},
            {_mm256_cvtepu8_epi16(_mm_unpacklo_epi64(u_q, v_q))},
            {_mm256_cvtepu8_epi16(_mm_unpackhi_epi64(u_q, v_q))}};
}

// Stores the eight pairs of samples in `pairs`, one a line.
void store_pairs(uint8_t* p, ptrdiff_t stride, __m128i pairs) {
    alignas(16) uint16_t values[8];
    _mm_store_si128(reinterpret_cast<__m128i*>(values), pairs);
    for (int y = 0; y < 8; ++y) {
        __builtin_memcpy(p + y * stride, values + y, sizeof *values);
    }
}

void store_chroma_columns(const ChromaLines& lines, uint8_t* u, uint8_t* v, ptrdiff_t stride) {
    const __m256i samples = _mm256_packus_epi16(lines.p0.v, lines.q0.v);
    const __m256i pairs = _mm256_unpacklo_epi8(samples, _mm256_srli_si256(samples, 8));
    store_pairs(u - 1, stride, low_lane(pairs));
    store_pairs(v - 1, stride, high_lane(pairs));
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    ChromaLines lines = chroma_rows(u, v, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_chroma_rows(lines, u, v, stride);
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    ChromaLines lines = chroma_rows(u, v, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_chroma_rows(lines, u, v, stride);
    }
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    ChromaLines lines = chroma_columns(u, v, stride);
    if (lines.filter(alpha, beta, tc0, strengths)) {
        store_chroma_columns(lines, u, v, stride);
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    ChromaLines lines = chroma_columns(u, v, stride);
    if (lines.filter_strong(alpha, beta)) {
        store_chroma_columns(lines, u, v, stride);
    }
}

}  // namespace

void avx2::fill_deblock(Kernels& table) {
    table.deblock_luma_vertical = deblock_luma_vertical;
    table.deblock_luma_horizontal = deblock_luma_horizontal;
    table.deblock_chroma_vertical = deblock_chroma_vertical;
    table.deblock_chroma_horizontal = deblock_chroma_horizontal;
    table.deblock_luma_vertical_strong = deblock_luma_vertical_strong;
    table.deblock_luma_horizontal_strong = deblock_luma_horizontal_strong;
    table.deblock_chroma_vertical_strong = deblock_chroma_vertical_strong;
    table.deblock_chroma_horizontal_strong = deblock_chroma_horizontal_strong;
}

}  // namespace zolt
