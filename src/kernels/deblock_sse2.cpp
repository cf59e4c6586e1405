#include <cstring>
#include <initializer_list>

#include "kernels/deblock_simd.h"
#include "kernels/families.h"
#include "kernels/sse2.h"

namespace zolt {
namespace {

using std::int8_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

// Eight lines of an edge.
struct Lanes {
    __m128i v;

    static Lanes load(const uint8_t* p) { return {widen_low(load_8(p))}; }
    void store(uint8_t* p) const { store_8(p, _mm_packus_epi16(v, v)); }
    static Lanes splat(int value) { return {_mm_set1_epi16(static_cast<short>(value))}; }

    friend Lanes operator+(Lanes a, Lanes b) { return {_mm_add_epi16(a.v, b.v)}; }
    friend Lanes operator-(Lanes a, Lanes b) { return {_mm_sub_epi16(a.v, b.v)}; }
    friend Lanes operator*(Lanes a, Lanes b) { return {_mm_mullo_epi16(a.v, b.v)}; }
    friend Lanes operator&(Lanes a, Lanes b) { return {_mm_and_si128(a.v, b.v)}; }
    static Lanes andnot(Lanes a, Lanes b) { return {_mm_andnot_si128(a.v, b.v)}; }
    static Lanes less(Lanes a, Lanes b) { return {_mm_cmplt_epi16(a.v, b.v)}; }
    static Lanes min(Lanes a, Lanes b) { return {_mm_min_epi16(a.v, b.v)}; }
    static Lanes max(Lanes a, Lanes b) { return {_mm_max_epi16(a.v, b.v)}; }
    static Lanes average(Lanes a, Lanes b) { return {_mm_avg_epu16(a.v, b.v)}; }
    static Lanes shift_right(Lanes a, int n) { return {_mm_srai_epi16(a.v, n)}; }
    static Lanes absolute_difference(Lanes a, Lanes b) {
        return {absolute_16(_mm_sub_epi16(a.v, b.v))};
    }
    static Lanes select(Lanes mask, Lanes a, Lanes b) {
        return {_mm_or_si128(_mm_and_si128(mask.v, a.v), _mm_andnot_si128(mask.v, b.v))};
    }
    static bool any(Lanes a) { return _mm_movemask_epi8(a.v) != 0; }
};

// Filters on samples in memory: rows[i] is the address of the row of samples p3, p2, p1, p0, q0,
// q1, q2, q3 (chroma: p1, p0, q0, q1), one line a lane. They return false when nothing changed.
bool luma_rows(uint8_t* const* rows, int alpha, int beta, Lanes tc0) {
    Lanes p1 = Lanes::load(rows[2]), p0 = Lanes::load(rows[3]);
    Lanes q0 = Lanes::load(rows[4]), q1 = Lanes::load(rows[5]);
    if (!filter_luma(Lanes::load(rows[1]), p1, p0, q0, q1, Lanes::load(rows[6]), alpha, beta,
                     tc0)) {
        return false;
    }
    p1.store(rows[2]);
    p0.store(rows[3]);
    q0.store(rows[4]);
    q1.store(rows[5]);
    return true;
}

bool luma_rows_strong(uint8_t* const* rows, int alpha, int beta) {
    Lanes p2 = Lanes::load(rows[1]), p1 = Lanes::load(rows[2]), p0 = Lanes::load(rows[3]);
    Lanes q0 = Lanes::load(rows[4]), q1 = Lanes::load(rows[5]), q2 = Lanes::load(rows[6]);
    if (!filter_luma_strong(Lanes::load(rows[0]), p2, p1, p0, q0, q1, q2, Lanes::load(rows[7]),
                            alpha, beta)) {
        return false;
    }
    p2.store(rows[1]);
    p1.store(rows[2]);
    p0.store(rows[3]);
    q0.store(rows[4]);
    q1.store(rows[5]);
    q2.store(rows[6]);
    return true;
}

bool chroma_rows(uint8_t* const* rows, int alpha, int beta, Lanes tc0) {
    Lanes p0 = Lanes::load(rows[1]), q0 = Lanes::load(rows[2]);
    if (!filter_chroma(Lanes::load(rows[0]), p0, q0, Lanes::load(rows[3]), alpha, beta, tc0)) {
        return false;
    }
    p0.store(rows[1]);
    q0.store(rows[2]);
    return true;
}

bool chroma_rows_strong(uint8_t* const* rows, int alpha, int beta) {
    Lanes p0 = Lanes::load(rows[1]), q0 = Lanes::load(rows[2]);
    if (!filter_chroma_strong(Lanes::load(rows[0]), p0, q0, Lanes::load(rows[3]), alpha, beta)) {
        return false;
    }
    p0.store(rows[1]);
    q0.store(rows[2]);
    return true;
}

// tC0 of two luma segments, four lines each, of which the strengths are the lowest ones; of four
// chroma segments, two lines each.
Lanes luma_tc0(const int8_t* tc0, uint32_t strengths) {
    const __m128i segments =
        _mm_set_epi16(0, 0, 0, 0, 0, 0, tc0[strengths >> 8 & 0xff], tc0[strengths & 0xff]);
    const __m128i pairs = _mm_unpacklo_epi16(segments, segments);
    return {_mm_unpacklo_epi32(pairs, pairs)};
}
Lanes chroma_tc0(const int8_t* tc0, uint32_t strengths) {
    const __m128i segments =
        _mm_set_epi16(0, 0, 0, 0, tc0[strengths >> 24], tc0[strengths >> 16 & 0xff],
                      tc0[strengths >> 8 & 0xff], tc0[strengths & 0xff]);
    return {_mm_unpacklo_epi16(segments, segments)};
}

// Transposes an 8x8 block of samples.
void transpose_8x8(const uint8_t* src, ptrdiff_t src_stride, uint8_t* dst, ptrdiff_t dst_stride) {
    __m128i a[4];
    for (int i = 0; i < 4; ++i) {
        a[i] = _mm_unpacklo_epi8(load_8(src + i * src_stride), load_8(src + (i + 4) * src_stride));
    }
    const __m128i b0 = _mm_unpacklo_epi8(a[0], a[2]), b1 = _mm_unpackhi_epi8(a[0], a[2]);
    const __m128i b2 = _mm_unpacklo_epi8(a[1], a[3]), b3 = _mm_unpackhi_epi8(a[1], a[3]);
    const __m128i rows[4] = {_mm_unpacklo_epi8(b0, b2), _mm_unpackhi_epi8(b0, b2),
                             _mm_unpacklo_epi8(b1, b3), _mm_unpackhi_epi8(b1, b3)};
    for (int i = 0; i < 4; ++i) {
        store_8(dst + 2 * i * dst_stride, rows[i]);
        store_8(dst + (2 * i + 1) * dst_stride, _mm_srli_si128(rows[i], 8));
    }
}

// Runs filter on the rows around a horizontal edge: `side` samples on each side, first q sample at
// pix.
template <typename Filter>
void filter_rows(uint8_t* pix, ptrdiff_t stride, int side, Filter filter) {
    uint8_t* rows[8];
    for (int i = 0; i < 2 * side; ++i) {
        rows[i] = pix + (i - side) * stride;
    }
    filter(rows);
}

// Runs filter on the four columns on either side of a vertical edge of eight lines, which it sees
// as rows.
template <typename Filter>
void filter_luma_columns(uint8_t* pix, ptrdiff_t stride, Filter filter) {
    alignas(16) uint8_t block[64];
    uint8_t* rows[8];
    for (int i = 0; i < 8; ++i) {
        rows[i] = block + 8 * i;
    }
    transpose_8x8(pix - 4, stride, block, 8);
    if (filter(rows)) {
        transpose_8x8(block, 8, pix - 4, stride);
    }
}

// The same for the two columns on either side of a chroma edge, of which the inner ones change.
template <typename Filter>
void filter_chroma_columns(uint8_t* pix, ptrdiff_t stride, Filter filter) {
    alignas(16) uint8_t block[32];
    uint8_t* rows[4];
    for (int i = 0; i < 4; ++i) {
        rows[i] = block + 8 * i;
    }
    __m128i a[4];
    for (int i = 0; i < 4; ++i) {
        a[i] = _mm_unpacklo_epi8(load_4(pix - 2 + i * stride), load_4(pix - 2 + (i + 4) * stride));
    }
    const __m128i even = _mm_unpacklo_epi8(a[0], a[2]);
    const __m128i odd = _mm_unpacklo_epi8(a[1], a[3]);
    store(block, _mm_unpacklo_epi8(even, odd));
    store(block + 16, _mm_unpackhi_epi8(even, odd));
    if (!filter(rows)) {
        return;
    }
    alignas(16) uint8_t pairs[16];
    store(pairs, _mm_unpacklo_epi8(load_8(rows[1]), load_8(rows[2])));
    for (int i = 0; i < 8; ++i) {
        std::memcpy(pix - 1 + i * stride, pairs + 2 * i, 2);
    }
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    for (int half = 0; half < 2; ++half) {
        filter_rows(pix + 8 * half, stride, 4, [&](uint8_t* const* rows) {
            return luma_rows(rows, alpha, beta, luma_tc0(tc0, strengths >> (16 * half)));
        });
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    for (int half = 0; half < 2; ++half) {
        filter_luma_columns(pix + 8 * half * stride, stride, [&](uint8_t* const* rows) {
            return luma_rows(rows, alpha, beta, luma_tc0(tc0, strengths >> (16 * half)));
        });
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int half = 0; half < 2; ++half) {
        filter_rows(pix + 8 * half, stride, 4,
                    [&](uint8_t* const* rows) { return luma_rows_strong(rows, alpha, beta); });
    }
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int half = 0; half < 2; ++half) {
        filter_luma_columns(pix + 8 * half * stride, stride, [&](uint8_t* const* rows) {
            return luma_rows_strong(rows, alpha, beta);
        });
    }
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    for (uint8_t* pix : {u, v}) {
        filter_rows(pix, stride, 2, [&](uint8_t* const* rows) {
            return chroma_rows(rows, alpha, beta, chroma_tc0(tc0, strengths));
        });
    }
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    for (uint8_t* pix : {u, v}) {
        filter_chroma_columns(pix, stride, [&](uint8_t* const* rows) {
            return chroma_rows(rows, alpha, beta, chroma_tc0(tc0, strengths));
        });
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    for (uint8_t* pix : {u, v}) {
        filter_rows(pix, stride, 2,
                    [&](uint8_t* const* rows) { return chroma_rows_strong(rows, alpha, beta); });
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    for (uint8_t* pix : {u, v}) {
        filter_chroma_columns(pix, stride, [&](uint8_t* const* rows) {
            return chroma_rows_strong(rows, alpha, beta);
        });
    }
}

}  // namespace

void sse2::fill_deblock(Kernels& table) {
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
