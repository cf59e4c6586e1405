#pragma once

// Deblocking of 16 lines at once, a byte each. Included by the SSE2 and AVX2 kernels, so that the
// latter get it in their own encoding; each supplies as Isa what its instruction set does better.

#include <emmintrin.h>

#include <cstddef>
#include <cstdint>

#include "kernels/Kernels.h"

namespace zolt {
namespace {

// Samples of 16 lines at one place across an edge, or masks of lines.
struct Lines {
    __m128i v;

    static Lines load(const std::uint8_t* p) {
        return {_mm_loadu_si128(reinterpret_cast<const __m128i*>(p))};
    }
    void store(std::uint8_t* p) const { _mm_storeu_si128(reinterpret_cast<__m128i*>(p), v); }
    static Lines splat(int value) { return {_mm_set1_epi8(static_cast<char>(value))}; }

    friend Lines operator&(Lines a, Lines b) { return {_mm_and_si128(a.v, b.v)}; }
    friend Lines operator|(Lines a, Lines b) { return {_mm_or_si128(a.v, b.v)}; }
    friend Lines operator^(Lines a, Lines b) { return {_mm_xor_si128(a.v, b.v)}; }
    // Modulo 256; the other sums and differences are clipped.
    friend Lines operator+(Lines a, Lines b) { return {_mm_add_epi8(a.v, b.v)}; }
    friend Lines operator-(Lines a, Lines b) { return {_mm_sub_epi8(a.v, b.v)}; }
};

inline Lines add(Lines a, Lines b) {
    return {_mm_adds_epu8(a.v, b.v)};
}
inline Lines subtract(Lines a, Lines b) {
    return {_mm_subs_epu8(a.v, b.v)};
}
inline Lines min(Lines a, Lines b) {
    return {_mm_min_epu8(a.v, b.v)};
}
inline Lines max(Lines a, Lines b) {
    return {_mm_max_epu8(a.v, b.v)};
}
inline Lines equal(Lines a, Lines b) {
    return {_mm_cmpeq_epi8(a.v, b.v)};
}
inline Lines without(Lines a, Lines mask) {
    return {_mm_andnot_si128(mask.v, a.v)};
}
inline Lines select(Lines mask, Lines a, Lines b) {
    return (a & mask) | without(b, mask);
}
inline bool all(Lines mask) {
    return _mm_movemask_epi8(mask.v) == 0xffff;
}
inline Lines odd(Lines a) {
    return a & Lines::splat(1);
}
inline Lines absolute_difference(Lines a, Lines b) {
    return subtract(a, b) | subtract(b, a);
}

// (a + b + 1) >> 1 and (a + b) >> 1.
inline Lines average_up(Lines a, Lines b) {
    return {_mm_avg_epu8(a.v, b.v)};
}
inline Lines average_down(Lines a, Lines b) {
    return average_up(a, b) - odd(a ^ b);
}

// Two samples with what the averages of four take of them.
struct Pair {
    Lines average, difference;

    Pair(Lines a, Lines b) : average(average_up(a, b)), difference(a ^ b) {}
};

// (a + b + c + d + 2) >> 2. The average of two averages is one too large where it was rounded up
// and so was one of the two.
inline Lines average_of_four(Pair ab, Pair cd) {
    return average_up(ab.average, cd.average) -
           odd((ab.difference | cd.difference) & (ab.average ^ cd.average));
}

// Where two samples differ by `limit` or more.
inline Lines far_apart(Lines a, Lines b, Lines limit) {
    return equal(subtract(limit, absolute_difference(a, b)), Lines::splat(0));
}

// The lines of an edge that are not filtered whatever their strength (clause 8.7.2.2).
inline Lines unfiltered_lines(Lines p1, Lines p0, Lines q0, Lines q1, const EdgeFilter& filter) {
    const Lines alpha = Lines::splat(filter.alpha), beta = Lines::splat(filter.beta);
    const Lines margin = min(min(subtract(beta, absolute_difference(p1, p0)),
                                 subtract(beta, absolute_difference(q1, q0))),
                             subtract(alpha, absolute_difference(p0, q0)));
    return equal(margin, Lines::splat(0));
}

// Adds the delta of clause 8.7.2.3, limited to tc < 94, to p0 and subtracts it from q0. With A = q0
// - p0 and B = p1 - q1, that is (4 * A + B + 4) >> 3 = (A + (B >> 2) + 1) >> 1.
inline void apply_delta(Lines p1, Lines& p0, Lines& q0, Lines q1, Lines tc) {
    const Lines ones = Lines::splat(-1);
    // (B >> 2) + 66.
    const Lines outer = average_up(average_up(p1, q1 ^ ones), Lines::splat(3));
    // (A >> 1) + 128, then ((A & 1) + (B >> 2) + 1) >> 1 and 33: the delta plus 161.
    const Lines delta = add(average_up(q0, p0 ^ ones), average_up(outer, odd(p0 ^ q0)));
    const Lines up = min(subtract(delta, Lines::splat(161)), tc);
    const Lines down = min(subtract(Lines::splat(161), delta), tc);
    p0 = subtract(add(p0, up), down);
    q0 = add(subtract(q0, up), down);
}

// p1 or q1 of clause 8.7.2.3: s1 + clip3(-limit, limit, (s2 + average - 2 * s1) >> 1).
inline Lines second_sample(Lines s2, Lines s1, Lines average, Lines limit) {
    return min(max(average_down(s2, average), subtract(s1, limit)), add(s1, limit));
}

// The luma samples p3..q3 across an edge.
struct LumaLines {
    Lines p3, p2, p1, p0, q0, q1, q2, q3;
};

// Luma lines with bS 1..3; tc0 is -1 in lines that are not filtered. Returns false when nothing
// changes.
inline bool filter_luma(LumaLines& s, const EdgeFilter& filter, Lines tc0) {
    const Lines idle =
        unfiltered_lines(s.p1, s.p0, s.q0, s.q1, filter) | equal(tc0, Lines::splat(-1));
    if (all(idle)) {
        return false;
    }
    const Lines beta = Lines::splat(filter.beta);
    const Lines p_rough = far_apart(s.p2, s.p0, beta), q_rough = far_apart(s.q2, s.q0, beta);
    const Lines limit = without(tc0, idle);
    const Lines average = average_up(s.p0, s.q0);
    const Lines p1 = second_sample(s.p2, s.p1, average, without(limit, p_rough));
    const Lines q1 = second_sample(s.q2, s.q1, average, without(limit, q_rough));
    // tC0 and 1 for each smooth side; a mask is -1.
    const Lines tc = without(limit + Lines::splat(2) + p_rough + q_rough, idle);
    apply_delta(s.p1, s.p0, s.q0, s.q1, tc);
    s.p1 = p1;
    s.q1 = q1;
    return true;
}

// One side of a luma edge with bS 4 (clause 8.7.2.4): p is the side, q the other one; inner is of
// p0 and q0. Lines that are not smooth take but one sample of either side into account.
inline void filter_strong_side(Lines p3, Lines& p2, Lines& p1, Lines& p0, Lines q1, Pair inner,
                               Lines idle, Lines smooth) {
    const Pair outer(p2, p1);
    // ((p2 + p1) >> 1) + ((p0 + q0) >> 1) and what both lose: (p2 + p1 + p0 + q0) >> 1.
    const Lines outer_half = outer.average - odd(outer.difference);
    const Lines inner_half = inner.average - odd(without(inner.difference, outer.difference));
    const Lines new_p2 = average_of_four({p3, p2}, {outer_half, inner_half});
    const Lines new_p1 = average_of_four(outer, inner);
    const Lines new_p0 = average_of_four({average_down(p2, q1), p1}, inner);
    const Lines rough_p0 = average_up(p1, average_down(p0, q1));
    p0 = select(idle, p0, select(smooth, new_p0, rough_p0));
    p1 = select(smooth, new_p1, p1);
    p2 = select(smooth, new_p2, p2);
}

inline bool filter_luma_strong(LumaLines& s, const EdgeFilter& filter) {
    const Lines idle = unfiltered_lines(s.p1, s.p0, s.q0, s.q1, filter);
    if (all(idle)) {
        return false;
    }
    const Lines beta = Lines::splat(filter.beta);
    const Lines rough = idle | far_apart(s.p0, s.q0, Lines::splat((filter.alpha >> 2) + 2));
    const Lines p_smooth = equal(rough | far_apart(s.p2, s.p0, beta), Lines::splat(0));
    const Lines q_smooth = equal(rough | far_apart(s.q2, s.q0, beta), Lines::splat(0));
    const Pair inner(s.p0, s.q0);
    const Lines p1 = s.p1;
    filter_strong_side(s.p3, s.p2, s.p1, s.p0, s.q1, inner, idle, p_smooth);
    filter_strong_side(s.q3, s.q2, s.q1, s.q0, p1, inner, idle, q_smooth);
    return true;
}

// tC0 of the lines of a luma edge and of a chroma edge, the latter once for either component.
template <typename Isa>
Lines luma_tc0(const EdgeFilter& filter, std::uint32_t strengths) {
    const __m128i segments = Isa::segment_tc0(filter.tc0, strengths);
    const __m128i pairs = _mm_unpacklo_epi8(segments, segments);
    return {_mm_unpacklo_epi16(pairs, pairs)};
}
template <typename Isa>
Lines chroma_tc0(const EdgeFilter& filter, std::uint32_t strengths) {
    const __m128i segments = Isa::segment_tc0(filter.tc0, strengths);
    const __m128i pairs = _mm_unpacklo_epi8(segments, segments);
    return {_mm_unpacklo_epi64(pairs, pairs)};
}

// Filters the luma edge above row p; false when nothing changes.
template <typename Isa>
bool filter_luma_rows(std::uint8_t* p, std::ptrdiff_t stride, std::uint32_t strengths,
                      const EdgeFilter& filter) {
    const auto row = [=](int y) { return Lines::load(p + y * stride); };
    LumaLines s = {row(-4), row(-3), row(-2), row(-1), row(0), row(1), row(2), row(3)};
    const bool strong = strengths == kStrongEdge;
    if (!(strong ? filter_luma_strong(s, filter)
                 : filter_luma(s, filter, luma_tc0<Isa>(filter, strengths)))) {
        return false;
    }
    s.p1.store(p - 2 * stride);
    s.p0.store(p - stride);
    s.q0.store(p);
    s.q1.store(p + stride);
    if (strong) {
        s.p2.store(p - 3 * stride);
        s.q2.store(p + 2 * stride);
    }
    return true;
}

// Filters the horizontal luma edges; bit n of the result: edge n has changed samples.
template <typename Isa>
unsigned filter_luma_edges(std::uint8_t* pix, std::ptrdiff_t stride, const std::uint32_t* strengths,
                           const EdgeFilter& outer, const EdgeFilter& inner) {
    unsigned changed = 0;
    for (int edge = 0; edge < 4; ++edge) {
        if (strengths[edge] != 0 &&
            filter_luma_rows<Isa>(pix + 4 * edge * stride, stride, strengths[edge],
                                  edge == 0 ? outer : inner)) {
            changed |= 1U << edge;
        }
    }
    return changed;
}

// The chroma samples p1..q1 across an edge: eight lines of Cb, then of Cr.
struct ChromaLines {
    Lines p1, p0, q0, q1;
};

// Returns false when nothing changes.
template <typename Isa>
bool filter_chroma(ChromaLines& s, std::uint32_t strengths, const EdgeFilter& filter) {
    Lines idle = unfiltered_lines(s.p1, s.p0, s.q0, s.q1, filter);
    if (strengths == kStrongEdge) {
        const Lines p0 = average_up(s.p1, average_down(s.p0, s.q1));
        const Lines q0 = average_up(s.q1, average_down(s.q0, s.p1));
        s.p0 = select(idle, s.p0, p0);
        s.q0 = select(idle, s.q0, q0);
        return !all(idle);
    }
    const Lines tc0 = chroma_tc0<Isa>(filter, strengths);
    idle = idle | equal(tc0, Lines::splat(-1));
    if (all(idle)) {
        return false;
    }
    apply_delta(s.p1, s.p0, s.q0, s.q1, without(tc0 + Lines::splat(1), idle));
    return true;
}

// ---- Columns as rows ----

inline __m128i load_half(const std::uint8_t* p) {
    return _mm_loadl_epi64(reinterpret_cast<const __m128i*>(p));
}
inline void store_halves(std::uint8_t* low, std::uint8_t* high, __m128i v) {
    _mm_storel_epi64(reinterpret_cast<__m128i*>(low), v);
    _mm_storel_epi64(reinterpret_cast<__m128i*>(high), _mm_unpackhi_epi64(v, v));
}

// Interleaves vectors n and n + count / 2: with the bits of a sample's vector number above those of
// its place there, this moves the highest one to the lowest place.
template <int count>
void interleave(__m128i (&v)[count]) {
    __m128i mixed[count];
    for (int i = 0; i < count / 2; ++i) {
        mixed[2 * i] = _mm_unpacklo_epi8(v[i], v[i + count / 2]);
        mixed[2 * i + 1] = _mm_unpackhi_epi8(v[i], v[i + count / 2]);
    }
    for (int i = 0; i < count; ++i) {
        v[i] = mixed[i];
    }
}

// Turns eight columns of 16 lines, eight at `upper` and eight at `lower`, to rows of 16 samples one
// after the other, and back.
inline void load_columns(const std::uint8_t* upper, const std::uint8_t* lower,
                         std::ptrdiff_t stride, std::uint8_t* rows) {
    __m128i v[8];
    for (int y = 0; y < 8; ++y) {
        v[y] = _mm_unpacklo_epi8(load_half(upper + y * stride), load_half(lower + y * stride));
    }
    for (int step = 0; step < 3; ++step) {
        interleave(v);
    }
    for (int x = 0; x < 8; ++x) {
        Lines{v[x]}.store(rows + 16 * x);
    }
}
inline void store_columns(const std::uint8_t* rows, std::uint8_t* upper, std::uint8_t* lower,
                          std::ptrdiff_t stride) {
    __m128i v[8];
    for (int x = 0; x < 8; ++x) {
        v[x] = Lines::load(rows + 16 * x).v;
    }
    for (int step = 0; step < 3; ++step) {
        interleave(v);
    }
    for (int y = 0; y < 4; ++y) {
        store_halves(upper + 2 * y * stride, upper + (2 * y + 1) * stride, v[y]);
        store_halves(lower + 2 * y * stride, lower + (2 * y + 1) * stride, v[4 + y]);
    }
}

// ---- Kernels ----

template <typename Isa>
void deblock_luma_horizontal(std::uint8_t* pix, std::ptrdiff_t stride,
                             const std::uint32_t* strengths, const EdgeFilter& outer,
                             const EdgeFilter& inner) {
    filter_luma_edges<Isa>(pix, stride, strengths, outer, inner);
}

template <typename Isa>
void deblock_luma_vertical(std::uint8_t* pix, std::ptrdiff_t stride, const std::uint32_t* strengths,
                           const EdgeFilter& outer, const EdgeFilter& inner) {
    alignas(32) std::uint8_t columns[24 * 16];  // the macroblock's with the eight left of it
    std::uint8_t* const first = columns + 8 * 16;
    if (strengths[0] != 0) {
        load_columns(pix - 8, pix - 8 + 8 * stride, stride, columns);
    }
    Isa::transpose_16x16(pix, stride, first, 16);
    const unsigned changed = filter_luma_edges<Isa>(first, 16, strengths, outer, inner);
    if ((changed & 1) != 0) {
        store_columns(columns, pix - 8, pix - 8 + 8 * stride, stride);
    }
    if (changed != 0) {
        Isa::transpose_16x16(first, 16, pix, stride);
    }
}

template <typename Isa>
void deblock_chroma_horizontal(std::uint8_t* u, std::uint8_t* v, std::ptrdiff_t stride,
                               const std::uint32_t* strengths, const EdgeFilter& outer,
                               const EdgeFilter& inner) {
    for (int edge = 0; edge < 4; edge += 2) {
        if (strengths[edge] == 0) {
            continue;
        }
        const std::ptrdiff_t place = 2 * edge * stride;
        const auto row = [=](int y) {
            return Lines{_mm_unpacklo_epi64(load_half(u + place + y * stride),
                                            load_half(v + place + y * stride))};
        };
        ChromaLines s = {row(-2), row(-1), row(0), row(1)};
        if (filter_chroma<Isa>(s, strengths[edge], edge == 0 ? outer : inner)) {
            store_halves(u + place - stride, v + place - stride, s.p0.v);
            store_halves(u + place, v + place, s.q0.v);
        }
    }
}

// Columns -2..5 are all that the two edges read.
template <typename Isa>
void deblock_chroma_vertical(std::uint8_t* u, std::uint8_t* v, std::ptrdiff_t stride,
                             const std::uint32_t* strengths, const EdgeFilter& outer,
                             const EdgeFilter& inner) {
    if ((strengths[0] | strengths[2]) == 0) {
        return;
    }
    alignas(16) std::uint8_t columns[8 * 16];
    load_columns(u - 2, v - 2, stride, columns);
    bool changed = false;
    for (int edge = 0; edge < 4; edge += 2) {
        if (strengths[edge] == 0) {
            continue;
        }
        std::uint8_t* const p1 = columns + 2 * edge * 16;
        ChromaLines s = {Lines::load(p1), Lines::load(p1 + 16), Lines::load(p1 + 32),
                         Lines::load(p1 + 48)};
        if (filter_chroma<Isa>(s, strengths[edge], edge == 0 ? outer : inner)) {
            s.p0.store(p1 + 16);
            s.q0.store(p1 + 32);
            changed = true;
        }
    }
    if (changed) {
        store_columns(columns, u - 2, v - 2, stride);
    }
}

template <typename Isa>
void fill_deblock_kernels(Kernels& table) {
    table.deblock_luma_vertical = deblock_luma_vertical<Isa>;
    table.deblock_luma_horizontal = deblock_luma_horizontal<Isa>;
    table.deblock_chroma_vertical = deblock_chroma_vertical<Isa>;
    table.deblock_chroma_horizontal = deblock_chroma_horizontal<Isa>;
}

}  // namespace
}  // namespace zolt
