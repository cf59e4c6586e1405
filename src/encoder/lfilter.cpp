#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "encoder/CEncoder.h"
#include "encoder/tables.h"

namespace {

// alpha' and beta' of Table 8-16.
constexpr std::uint8_t alpha_tab[52] = {
    0,  0,  0,  0,  0,  0,  0,   0,   0,   0,   0,   0,   0,   0,   0,   0,  4,  4,
    5,  6,  7,  8,  9,  10, 12,  13,  15,  17,  20,  22,  25,  28,  32,  36, 40, 45,
    50, 56, 63, 71, 80, 90, 101, 113, 127, 144, 162, 182, 203, 226, 255, 255};
constexpr std::uint8_t beta_tab[52] = {
    0, 0, 0, 0, 0, 0, 0, 0, 0,  0,  0,  0,  0,  0,  0,  0,  2,  2,  2,  3,  3,  3,  3,  4,  4,  4,
    6, 6, 7, 7, 8, 8, 9, 9, 10, 10, 11, 11, 12, 12, 13, 13, 14, 14, 15, 15, 16, 16, 17, 17, 18, 18};

// tC0' of Table 8-17 by indexA and bS 1..3; bS 0: not filtered.
constexpr std::int8_t C0_big_tab[52][4] = {
    {-1, 0, 0, 0},    {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},
    {-1, 0, 0, 0},    {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},
    {-1, 0, 0, 0},    {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},   {-1, 0, 0, 0},
    {-1, 0, 0, 0},    {-1, 0, 0, 0},   {-1, 0, 0, 1},   {-1, 0, 0, 1},   {-1, 0, 0, 1},
    {-1, 0, 0, 1},    {-1, 0, 1, 1},   {-1, 0, 1, 1},   {-1, 1, 1, 1},   {-1, 1, 1, 1},
    {-1, 1, 1, 1},    {-1, 1, 1, 1},   {-1, 1, 1, 2},   {-1, 1, 1, 2},   {-1, 1, 1, 2},
    {-1, 1, 1, 2},    {-1, 1, 2, 3},   {-1, 1, 2, 3},   {-1, 2, 2, 3},   {-1, 2, 2, 4},
    {-1, 2, 3, 4},    {-1, 2, 3, 4},   {-1, 3, 3, 5},   {-1, 3, 4, 6},   {-1, 3, 4, 6},
    {-1, 4, 5, 7},    {-1, 4, 5, 8},   {-1, 4, 6, 9},   {-1, 5, 7, 10},  {-1, 6, 8, 11},
    {-1, 6, 8, 13},   {-1, 7, 10, 14}, {-1, 8, 11, 16}, {-1, 9, 12, 18}, {-1, 10, 13, 20},
    {-1, 11, 15, 23}, {-1, 13, 17, 25}};

constexpr int kLineBytes = 4;  // strengths of one edge

// Parameters of one edge (clause 8.7.2.2).
struct EdgeParameters {
    int alpha, beta;
    const std::int8_t* tc0;  // by bS

    EdgeParameters(int qp, const lfdata& lf) {
        const int index_a = std::clamp(qp + lf.alpha_offset, 0, 51);
        const int index_b = std::clamp(qp + lf.beta_offset, 0, 51);
        alpha = alpha_tab[index_a];
        beta = beta_tab[index_b];
        tc0 = C0_big_tab[index_a];
    }
};

bool is_intra(std::uint8_t mode) {
    return mode == MB_INTRA4x4 || mode == MB_INTRA16x16;
}

bool any(const std::uint8_t* strengths) {
    std::uint32_t all;
    std::memcpy(&all, strengths, sizeof all);
    return all != 0;
}

}  // namespace

// Deblocks the current picture in place, macroblock by macroblock (clause 8.7).
void CEncoder::filter_frame() {
    for (int mb_y = 0; mb_y < g_mb_height; ++mb_y) {
        for (int mb_x = 0; mb_x < g_mb_width; ++mb_x) {
            filter_mb(mb_x, mb_y);
        }
    }
}

// Left, internal vertical, top and internal horizontal edges of one macroblock.
void CEncoder::filter_mb(int mb_x, int mb_y) {
    const int mb = mb_y * g_mb_width + mb_x;
    if (g_lf_data[mb].disable_flag) {
        return;
    }
    find_internal_edge_strength(mb_x, mb_y);
    std::uint8_t* y = g_cur_y + static_cast<std::ptrdiff_t>(16 * mb_y) * g_stride_luma + 16 * mb_x;
    const std::ptrdiff_t chroma =
        static_cast<std::ptrdiff_t>(8 * mb_y) * g_stride_chroma + 8 * mb_x;
    for (const bool vertical : {true, false}) {
        const std::uint8_t(&strengths)[4][4] = vertical ? bs_ver : bs_hor;
        if (vertical ? mb_x > 0 : mb_y > 0) {
            find_external_edge_strength(mb_x, mb_y, vertical);
            filter_external_edge(mb, vertical, y, chroma);
        }
        filter_internal_edges(mb, vertical, strengths, y, chroma);
    }
}

void CEncoder::filter_external_edge(int mb, bool vertical, std::uint8_t* y, std::ptrdiff_t chroma) {
    const std::uint8_t* strengths = vertical ? bs_ver[0] : bs_hor[0];
    if (!any(strengths)) {
        return;
    }
    const int neighbour = vertical ? mb - 1 : mb - g_mb_width;
    const int qp_q = g_mb_qp[mb];
    const int qp_p = g_mb_qp[neighbour];
    const EdgeParameters luma((qp_q + qp_p + 1) >> 1, g_lf_data[mb]);
    const EdgeParameters chroma_edge((zolt::QP_SCALE_CR[qp_q] + zolt::QP_SCALE_CR[qp_p] + 1) >> 1,
                                     g_lf_data[mb]);
    const zolt::Kernels& k = *g_kernels;
    if (strengths[0] == 4) {
        (vertical ? k.deblock_luma_vertical_strong : k.deblock_luma_horizontal_strong)(
            y, g_stride_luma, luma.alpha, luma.beta);
        const auto filter =
            vertical ? k.deblock_chroma_vertical_strong : k.deblock_chroma_horizontal_strong;
        filter(g_cur_u + chroma, g_stride_chroma, chroma_edge.alpha, chroma_edge.beta);
        filter(g_cur_v + chroma, g_stride_chroma, chroma_edge.alpha, chroma_edge.beta);
    } else {
        filter_luma_edge(vertical, y, luma.alpha, luma.beta, luma.tc0, strengths);
        filter_chroma_edge(vertical, chroma, chroma_edge.alpha, chroma_edge.beta, chroma_edge.tc0,
                           strengths);
    }
}

void CEncoder::filter_internal_edges(int mb, bool vertical, const std::uint8_t (&strengths)[4][4],
                                     std::uint8_t* y, std::ptrdiff_t chroma) {
    const EdgeParameters luma(g_mb_qp[mb], g_lf_data[mb]);
    for (int edge = 1; edge < 4; ++edge) {
        if (any(strengths[edge])) {
            filter_luma_edge(vertical, y + 4 * edge * (vertical ? 1 : g_stride_luma), luma.alpha,
                             luma.beta, luma.tc0, strengths[edge]);
        }
    }
    if (any(strengths[2])) {
        const EdgeParameters chroma_edge(zolt::QP_SCALE_CR[g_mb_qp[mb]], g_lf_data[mb]);
        filter_chroma_edge(vertical, chroma + 4 * (vertical ? 1 : g_stride_chroma),
                           chroma_edge.alpha, chroma_edge.beta, chroma_edge.tc0, strengths[2]);
    }
}

void CEncoder::filter_luma_edge(bool vertical, std::uint8_t* pix, int alpha, int beta,
                                const std::int8_t* tc0, const std::uint8_t* strengths) {
    const std::int8_t segments[4] = {tc0[strengths[0]], tc0[strengths[1]], tc0[strengths[2]],
                                     tc0[strengths[3]]};
    (vertical ? g_kernels->deblock_luma_vertical : g_kernels->deblock_luma_horizontal)(
        pix, g_stride_luma, alpha, beta, segments);
}

void CEncoder::filter_chroma_edge(bool vertical, std::ptrdiff_t offset, int alpha, int beta,
                                  const std::int8_t* tc0, const std::uint8_t* strengths) {
    const std::int8_t segments[4] = {tc0[strengths[0]], tc0[strengths[1]], tc0[strengths[2]],
                                     tc0[strengths[3]]};
    const auto filter =
        vertical ? g_kernels->deblock_chroma_vertical : g_kernels->deblock_chroma_horizontal;
    filter(g_cur_u + offset, g_stride_chroma, alpha, beta, segments);
    filter(g_cur_v + offset, g_stride_chroma, alpha, beta, segments);
}

// Boundary strengths of the edges inside a macroblock (clause 8.7.2.1).
void CEncoder::find_internal_edge_strength(int mb_x, int mb_y) {
    const std::uint8_t mode = g_mb_mode[mb_y * g_mb_width + mb_x];
    if (mode == MB_SKIP || is_intra(mode)) {
        const int strength = mode == MB_SKIP ? 0 : 3;
        std::memset(bs_ver[1], strength, 3 * kLineBytes);
        std::memset(bs_hor[1], strength, 3 * kLineBytes);
        return;
    }
    const std::uint8_t* counts =
        g_cnum_l + static_cast<std::ptrdiff_t>(4 * mb_y) * g_blk_width + 4 * mb_x;
    for (int edge = 1; edge < 4; ++edge) {
        for (int segment = 0; segment < 4; ++segment) {
            const std::uint8_t* v = counts + segment * g_blk_width + edge;
            const std::uint8_t* h = counts + edge * g_blk_width + segment;
            bs_ver[edge][segment] = v[0] || v[-1] ? 2 : 0;
            bs_hor[edge][segment] = h[0] || h[-g_blk_width] ? 2 : 0;
        }
    }
}

// Boundary strengths of the left (vertical) or top edge.
void CEncoder::find_external_edge_strength(int mb_x, int mb_y, bool vertical) {
    std::uint8_t* strengths = vertical ? bs_ver[0] : bs_hor[0];
    const int mb = mb_y * g_mb_width + mb_x;
    const std::uint8_t mode_q = g_mb_mode[mb];
    const std::uint8_t mode_p = g_mb_mode[vertical ? mb - 1 : mb - g_mb_width];
    if (is_intra(mode_q) || is_intra(mode_p)) {
        std::memset(strengths, 4, kLineBytes);
        return;
    }
    const std::ptrdiff_t along = vertical ? g_blk_width : 1;
    const std::ptrdiff_t across = vertical ? 1 : g_blk_width;
    std::ptrdiff_t q = static_cast<std::ptrdiff_t>(4 * mb_y) * g_blk_width + 4 * mb_x;
    for (int segment = 0; segment < 4; ++segment, q += along) {
        const std::ptrdiff_t p = q - across;
        if (g_cnum_l[p] || g_cnum_l[q]) {
            strengths[segment] = 2;
        } else {
            strengths[segment] = g_blk_ref[p] != g_blk_ref[q] ||
                                 std::abs(g_blk_mvx[p] - g_blk_mvx[q]) >= 4 ||
                                 std::abs(g_blk_mvy[p] - g_blk_mvy[q]) >= 4;
        }
    }
}
