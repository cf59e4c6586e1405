#pragma once

// Deblocking filters over vectors of 16-bit lanes, one lane per line of the edge. Included by the
// SSE2 and AVX2 kernels, each of which supplies a vector type V with the operations used below.

#include <cstddef>
#include <cstdint>

namespace zolt {
namespace {

// The lines of an edge that are filtered (clause 8.7.2.2): all lanes of a line 1s, or 0s.
template <typename V>
V filtered_lines(V p1, V p0, V q0, V q1, V alpha, V beta) {
    return V::less(V::absolute_difference(p0, q0), alpha) &
           V::less(V::absolute_difference(p1, p0), beta) &
           V::less(V::absolute_difference(q1, q0), beta);
}

template <typename V>
V clip3(V low, V high, V value) {
    return V::max(low, V::min(high, value));
}

// The delta of clause 8.7.2.3.
template <typename V>
V normal_delta(V p1, V p0, V q0, V q1, V tc) {
    const V delta = V::shift_right((q0 - p0) * V::splat(4) + (p1 - q1) + V::splat(4), 3);
    return clip3(V::splat(0) - tc, tc, delta);
}

// Luma lines with bS 1..3; tc0 is -1 in lines that are not filtered. Returns false when nothing
// changes.
template <typename V>
bool filter_luma(V p2, V& p1, V& p0, V& q0, V& q1, V q2, int alpha, int beta, V tc0) {
    const V zero = V::splat(0);
    const V beta_v = V::splat(beta);
    const V lines =
        V::andnot(V::less(tc0, zero), filtered_lines(p1, p0, q0, q1, V::splat(alpha), beta_v));
    if (!V::any(lines)) {
        return false;
    }
    const V ap = V::less(V::absolute_difference(p2, p0), beta_v) & lines;
    const V aq = V::less(V::absolute_difference(q2, q0), beta_v) & lines;
    const V limit = tc0 & lines;
    const V tc = limit - ap - aq;  // a set mask is -1
    const V delta = normal_delta(p1, p0, q0, q1, tc) & lines;
    const V average = V::average(p0, q0);
    const V two = V::splat(2);
    const V p1_delta = clip3(zero - limit, limit, V::shift_right(p2 + average - p1 * two, 1)) & ap;
    const V q1_delta = clip3(zero - limit, limit, V::shift_right(q2 + average - q1 * two, 1)) & aq;
    p1 = p1 + p1_delta;
    q1 = q1 + q1_delta;
    p0 = p0 + delta;
    q0 = q0 - delta;
    return true;
}

// Chroma lines with bS 1..3.
template <typename V>
bool filter_chroma(V p1, V& p0, V& q0, V q1, int alpha, int beta, V tc0) {
    const V lines = V::andnot(V::less(tc0, V::splat(0)),
                              filtered_lines(p1, p0, q0, q1, V::splat(alpha), V::splat(beta)));
    if (!V::any(lines)) {
        return false;
    }
    const V delta = normal_delta(p1, p0, q0, q1, (tc0 + V::splat(1)) & lines) & lines;
    p0 = p0 + delta;
    q0 = q0 - delta;
    return true;
}

// One side of a luma edge with bS 4 (clause 8.7.2.4): p is the side, q the other one.
template <typename V>
void strong_side(V p3, V& p2, V& p1, V& p0, V q0, V q1, V lines, V smooth) {
    const V sum = p0 + q0 + p1;
    const V weak = V::shift_right(p1 + p1 + p0 + q1 + V::splat(2), 2);
    const V new_p0 = V::shift_right(p2 + sum + sum + q1 + V::splat(4), 3);
    const V new_p1 = V::shift_right(p2 + sum + V::splat(2), 2);
    const V new_p2 = V::shift_right(p3 + p3 + p2 + p2 + p2 + sum + V::splat(4), 3);
    p0 = V::select(lines, V::select(smooth, new_p0, weak), p0);
    p1 = V::select(smooth, new_p1, p1);
    p2 = V::select(smooth, new_p2, p2);
}

template <typename V>
bool filter_luma_strong(V p3, V& p2, V& p1, V& p0, V& q0, V& q1, V& q2, V q3, int alpha, int beta) {
    const V beta_v = V::splat(beta);
    const V lines = filtered_lines(p1, p0, q0, q1, V::splat(alpha), beta_v);
    if (!V::any(lines)) {
        return false;
    }
    const V small_gap = V::less(V::absolute_difference(p0, q0), V::splat((alpha >> 2) + 2)) & lines;
    const V ap = V::less(V::absolute_difference(p2, p0), beta_v) & small_gap;
    const V aq = V::less(V::absolute_difference(q2, q0), beta_v) & small_gap;
    const V old_p0 = p0;
    const V old_p1 = p1;
    strong_side(p3, p2, p1, p0, q0, q1, lines, ap);
    strong_side(q3, q2, q1, q0, old_p0, old_p1, lines, aq);
    return true;
}

template <typename V>
bool filter_chroma_strong(V p1, V& p0, V& q0, V q1, int alpha, int beta) {
    const V lines = filtered_lines(p1, p0, q0, q1, V::splat(alpha), V::splat(beta));
    if (!V::any(lines)) {
        return false;
    }
    const V two = V::splat(2);
    const V new_p0 = V::shift_right(p1 + p1 + p0 + q1 + two, 2);
    const V new_q0 = V::shift_right(q1 + q1 + q0 + p1 + two, 2);
    p0 = V::select(lines, new_p0, p0);
    q0 = V::select(lines, new_q0, q0);
    return true;
}

}  // namespace
}  // namespace zolt
