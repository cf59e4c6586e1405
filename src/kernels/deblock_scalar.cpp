#include <algorithm>
#include <cstdlib>

#include "kernels/clip.h"
#include "kernels/families.h"

namespace zolt {
namespace {

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
template <typename FilterLine, typename FilterLineStrong>
void filter_edge(uint8_t* pix, ptrdiff_t along, ptrdiff_t across, int lines_per_segment,
                 uint32_t strengths, const EdgeFilter& filter, FilterLine filter_line,
                 FilterLineStrong filter_line_strong) {
    for (int line = 0; line < 4 * lines_per_segment; ++line, pix += along) {
        const uint32_t strength = strengths >> (8 * (line / lines_per_segment)) & 0xff;
        if (strength == 4) {
            filter_line_strong(pix, across, filter.alpha, filter.beta);
        } else if (strength != 0) {
            filter_line(pix, across, filter.alpha, filter.beta, filter.tc0[strength]);
        }
    }
}

void filter_luma_edges(uint8_t* pix, ptrdiff_t along, ptrdiff_t across, const uint32_t* strengths,
                       const EdgeFilter& outer, const EdgeFilter& inner) {
    for (int edge = 0; edge < 4; ++edge) {
        filter_edge(pix + 4 * edge * across, along, across, 4, strengths[edge],
                    edge == 0 ? outer : inner, filter_luma_line, filter_luma_line_strong);
    }
}

void filter_chroma_edges(uint8_t* pix, ptrdiff_t along, ptrdiff_t across, const uint32_t* strengths,
                         const EdgeFilter& outer, const EdgeFilter& inner) {
    for (int edge = 0; edge < 4; edge += 2) {
        filter_edge(pix + 2 * edge * across, along, across, 2, strengths[edge],
                    edge == 0 ? outer : inner, filter_chroma_line, filter_chroma_line_strong);
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, const uint32_t* strengths,
                           const EdgeFilter& outer, const EdgeFilter& inner) {
    filter_luma_edges(pix, stride, 1, strengths, outer, inner);
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, const uint32_t* strengths,
                             const EdgeFilter& outer, const EdgeFilter& inner) {
    filter_luma_edges(pix, 1, stride, strengths, outer, inner);
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, const uint32_t* strengths,
                             const EdgeFilter& outer, const EdgeFilter& inner) {
    filter_chroma_edges(u, stride, 1, strengths, outer, inner);
    filter_chroma_edges(v, stride, 1, strengths, outer, inner);
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, const uint32_t* strengths,
                               const EdgeFilter& outer, const EdgeFilter& inner) {
    filter_chroma_edges(u, 1, stride, strengths, outer, inner);
    filter_chroma_edges(v, 1, stride, strengths, outer, inner);
}

}  // namespace

void scalar::fill_deblock(Kernels& table) {
    table.deblock_luma_vertical = deblock_luma_vertical;
    table.deblock_luma_horizontal = deblock_luma_horizontal;
    table.deblock_chroma_vertical = deblock_chroma_vertical;
    table.deblock_chroma_horizontal = deblock_chroma_horizontal;
}

}  // namespace zolt
