#include <algorithm>
#include <cstdlib>

#include "kernels/clip.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::int8_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

// Whether a line of samples across an edge is filtered at all: clause 8.7.2.2, filterSamplesFlag.
bool line_is_filtered(int p1, int p0, int q0, int q1, int alpha, int beta) {
    return std::abs(p0 - q0) < alpha && std::abs(p1 - p0) < beta && std::abs(q1 - q0) < beta;
}

// One line of a luma edge, clause 8.7.2.3; q is its first q sample, samples are step apart.
void filter_luma_line(uint8_t* q, ptrdiff_t step, int alpha, int beta, int tc0) {
    const int p2 = q[-3 * step], p1 = q[-2 * step], p0 = q[-step];
    const int q0 = q[0], q1 = q[step], q2 = q[2 * step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const bool ap = std::abs(p2 - p0) < beta;
    const bool aq = std::abs(q2 - q0) < beta;
    const int tc = tc0 + (ap ? 1 : 0) + (aq ? 1 : 0);
    const int delta = std::clamp(((q0 - p0) * 4 + (p1 - q1) + 4) >> 3, -tc, tc);
    q[-step] = clip_sample(p0 + delta);
    q[0] = clip_sample(q0 - delta);
    const int average = (p0 + q0 + 1) >> 1;
    if (ap) {
        q[-2 * step] =
            static_cast<uint8_t>(p1 + std::clamp((p2 + average - 2 * p1) >> 1, -tc0, tc0));
    }
    if (aq) {
        q[step] = static_cast<uint8_t>(q1 + std::clamp((q2 + average - 2 * q1) >> 1, -tc0, tc0));
    }
}

void filter_chroma_line(uint8_t* q, ptrdiff_t step, int alpha, int beta, int tc0) {
    const int p1 = q[-2 * step], p0 = q[-step], q0 = q[0], q1 = q[step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const int tc = tc0 + 1;
    const int delta = std::clamp(((q0 - p0) * 4 + (p1 - q1) + 4) >> 3, -tc, tc);
    q[-step] = clip_sample(p0 + delta);
    q[0] = clip_sample(q0 - delta);
}

// One line of a luma edge with bS 4, clause 8.7.2.4.
void filter_luma_line_strong(uint8_t* q, ptrdiff_t step, int alpha, int beta) {
    const int p3 = q[-4 * step], p2 = q[-3 * step], p1 = q[-2 * step], p0 = q[-step];
    const int q0 = q[0], q1 = q[step], q2 = q[2 * step], q3 = q[3 * step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const bool small_gap = std::abs(p0 - q0) < (alpha >> 2) + 2;
    if (small_gap && std::abs(q2 - q0) < beta) {
        q[0] = static_cast<uint8_t>((p1 + 2 * p0 + 2 * q0 + 2 * q1 + q2 + 4) >> 3);
        q[step] = static_cast<uint8_t>((p0 + q0 + q1 + q2 + 2) >> 2);
        q[2 * step] = static_cast<uint8_t>((2 * q3 + 3 * q2 + q1 + q0 + p0 + 4) >> 3);
    } else {
        q[0] = static_cast<uint8_t>((2 * q1 + q0 + p1 + 2) >> 2);
    }
    if (small_gap && std::abs(p2 - p0) < beta) {
        q[-step] = static_cast<uint8_t>((q1 + 2 * q0 + 2 * p0 + 2 * p1 + p2 + 4) >> 3);
        q[-2 * step] = static_cast<uint8_t>((q0 + p0 + p1 + p2 + 2) >> 2);
        q[-3 * step] = static_cast<uint8_t>((2 * p3 + 3 * p2 + p1 + p0 + q0 + 4) >> 3);
    } else {
        q[-step] = static_cast<uint8_t>((2 * p1 + p0 + q1 + 2) >> 2);
    }
}

void filter_chroma_line_strong(uint8_t* q, ptrdiff_t step, int alpha, int beta) {
    const int p1 = q[-2 * step], p0 = q[-step], q0 = q[0], q1 = q[step];
    if (line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        q[0] = static_cast<uint8_t>((2 * q1 + q0 + p1 + 2) >> 2);
        q[-step] = static_cast<uint8_t>((2 * p1 + p0 + q1 + 2) >> 2);
    }
}

// An edge of four segments: `across` leads from one sample of a line to the next, `along` from one
// line to the next.
template <typename FilterLine>
void filter_edge(uint8_t* pix, ptrdiff_t along, ptrdiff_t across, int lines_per_segment, int alpha,
                 int beta, const int8_t* tc0, uint32_t strengths, FilterLine filter_line) {
    for (int line = 0; line < 4 * lines_per_segment; ++line) {
        const int segment_tc0 = tc0[strengths >> (8 * (line / lines_per_segment)) & 0xff];
        if (segment_tc0 >= 0) {
            filter_line(pix + line * along, across, alpha, beta, segment_tc0);
        }
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    filter_edge(pix, stride, 1, 4, alpha, beta, tc0, strengths, filter_luma_line);
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    filter_edge(pix, 1, stride, 4, alpha, beta, tc0, strengths, filter_luma_line);
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    filter_edge(u, stride, 1, 2, alpha, beta, tc0, strengths, filter_chroma_line);
    filter_edge(v, stride, 1, 2, alpha, beta, tc0, strengths, filter_chroma_line);
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    filter_edge(u, 1, stride, 2, alpha, beta, tc0, strengths, filter_chroma_line);
    filter_edge(v, 1, stride, 2, alpha, beta, tc0, strengths, filter_chroma_line);
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 16; ++line) {
        filter_luma_line_strong(pix + line * stride, 1, alpha, beta);
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 16; ++line) {
        filter_luma_line_strong(pix + line, stride, alpha, beta);
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 8; ++line) {
        filter_chroma_line_strong(u + line * stride, 1, alpha, beta);
        filter_chroma_line_strong(v + line * stride, 1, alpha, beta);
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    for (int line = 0; line < 8; ++line) {
        filter_chroma_line_strong(u + line, stride, alpha, beta);
        filter_chroma_line_strong(v + line, stride, alpha, beta);
    }
}

}  // namespace

void scalar::fill_deblock(Kernels& table) {
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
