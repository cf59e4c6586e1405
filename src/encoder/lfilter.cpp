#include <algorithm>
#include <cstdlib>

#include "encoder/MacroblockCoder.h"
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

// Boundary strengths of an edge's four segments, one byte each, by the mask of the segments that
// have levels on either side: those get 2, the others the base strength, 0 or 1.
struct StrengthTable {
    std::uint32_t packed[2][16];
};

constexpr StrengthTable make_strengths() {
    StrengthTable table{};
    for (unsigned base = 0; base < 2; ++base) {
        for (unsigned coded = 0; coded < 16; ++coded) {
            for (unsigned segment = 0; segment < 4; ++segment) {
                const std::uint32_t strength = (coded >> segment & 1) ? 2 : base;
                table.packed[base][coded] |= strength << (8 * segment);
            }
        }
    }
    return table;
}

constexpr StrengthTable kStrengths = make_strengths();
constexpr std::uint32_t kAllStrong = 0x04040404;
constexpr std::uint32_t kAllIntra = 0x03030303;

bool is_intra(std::uint8_t mode) {
    return mode == MB_INTRA4x4 || mode == MB_INTRA16x16;
}

// Exchanges rows and columns of a 4x4 bit matrix.
unsigned transpose_mask(unsigned m) {
    unsigned t = (m ^ m >> 3) & 0x0a0a;
    m ^= t ^ t << 3;
    t = (m ^ m >> 6) & 0x00cc;
    return m ^ t ^ t << 6;
}

// Parameters of the edges with one QP (clause 8.7.2.2).
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

// The filters of the vertical or of the horizontal edges, and the steps across an edge, in samples.
struct EdgeFilters {
    zolt::Kernels::LumaFilter luma;
    zolt::Kernels::StrongLumaFilter luma_strong;
    zolt::Kernels::ChromaFilter chroma;
    zolt::Kernels::StrongChromaFilter chroma_strong;
    std::ptrdiff_t luma_step, chroma_step;
};

// The samples of a macroblock that is being filtered.
struct Macroblock {
    const Picture& picture;
    const int mb;
    const EdgeParameters luma, chroma;  // of its internal edges
    std::uint8_t* const y;
    std::uint8_t* const u;
    std::uint8_t* const v;

    Macroblock(const Picture& p, int address, int mb_x, int mb_y)
        : picture(p),
          mb(address),
          luma(p.g_mb_qp[address], p.g_lf_data[address]),
          chroma(zolt::QP_SCALE_CR[p.g_mb_qp[address]], p.g_lf_data[address]),
          y(p.g_cur_y + static_cast<std::ptrdiff_t>(16 * mb_y) * p.g_stride_luma + 16 * mb_x),
          u(p.g_cur_u + static_cast<std::ptrdiff_t>(8 * mb_y) * p.g_stride_chroma + 8 * mb_x),
          v(p.g_cur_v + static_cast<std::ptrdiff_t>(8 * mb_y) * p.g_stride_chroma + 8 * mb_x) {}

    // One direction's edges by their strengths; neighbour: the macroblock beyond edge 0.
    void filter_edges(const std::uint32_t* strengths, int neighbour,
                      const EdgeFilters& filters) const {
        if (strengths[0] != 0) {
            filter_external_edge(strengths[0], neighbour, filters);
        }
        if ((strengths[1] | strengths[2] | strengths[3]) != 0) {
            filter_internal_edges(strengths, filters);
        }
    }

    void filter_external_edge(std::uint32_t strengths, int neighbour,
                              const EdgeFilters& filters) const {
        const int qp_q = picture.g_mb_qp[mb];
        const int qp_p = picture.g_mb_qp[neighbour];
        if (qp_q == qp_p) {
            filter_external_edge(strengths, luma, chroma, filters);
            return;
        }
        const lfdata& lf = picture.g_lf_data[mb];
        const EdgeParameters mean_luma((qp_q + qp_p + 1) >> 1, lf);
        const EdgeParameters mean_chroma(
            (zolt::QP_SCALE_CR[qp_q] + zolt::QP_SCALE_CR[qp_p] + 1) >> 1, lf);
        filter_external_edge(strengths, mean_luma, mean_chroma, filters);
    }

    void filter_external_edge(std::uint32_t strengths, const EdgeParameters& edge_luma,
                              const EdgeParameters& edge_chroma, const EdgeFilters& filters) const {
        if (strengths == kAllStrong) {
            filters.luma_strong(y, picture.g_stride_luma, edge_luma.alpha, edge_luma.beta);
            filters.chroma_strong(u, v, picture.g_stride_chroma, edge_chroma.alpha,
                                  edge_chroma.beta);
            return;
        }
        filters.luma(y, picture.g_stride_luma, edge_luma.alpha, edge_luma.beta, edge_luma.tc0,
                     strengths);
        filters.chroma(u, v, picture.g_stride_chroma, edge_chroma.alpha, edge_chroma.beta,
                       edge_chroma.tc0, strengths);
    }

    void filter_internal_edges(const std::uint32_t* strengths, const EdgeFilters& filters) const {
        for (int edge = 1; edge < 4; ++edge) {
            if (strengths[edge] != 0) {
                filters.luma(y + 4 * edge * filters.luma_step, picture.g_stride_luma, luma.alpha,
                             luma.beta, luma.tc0, strengths[edge]);
            }
        }
        if (strengths[2] != 0) {  // the middle one is chroma's only internal edge
            const std::ptrdiff_t offset = 4 * filters.chroma_step;
            filters.chroma(u + offset, v + offset, picture.g_stride_chroma, chroma.alpha,
                           chroma.beta, chroma.tc0, strengths[2]);
        }
    }
};

}  // namespace

// Left, internal vertical, top and internal horizontal edges of one macroblock of the current
// picture, in place (clause 8.7).
void MacroblockCoder::filter_mb(int mb_x, int mb_y) {
    const int mb = mb_y * picture.g_mb_width + mb_x;
    if (picture.g_lf_data[mb].disable_flag) {
        return;
    }
    find_edge_strengths(mb_x, mb_y);
    const zolt::Kernels& k = *g_kernels;
    const Macroblock macroblock(picture, mb, mb_x, mb_y);
    macroblock.filter_edges(bs_ver, mb - 1,
                            {k.deblock_luma_vertical, k.deblock_luma_vertical_strong,
                             k.deblock_chroma_vertical, k.deblock_chroma_vertical_strong, 1, 1});
    macroblock.filter_edges(
        bs_hor, mb - picture.g_mb_width,
        {k.deblock_luma_horizontal, k.deblock_luma_horizontal_strong, k.deblock_chroma_horizontal,
         k.deblock_chroma_horizontal_strong, picture.g_stride_luma, picture.g_stride_chroma});
}

// Boundary strengths of all edges of a macroblock (clause 8.7.2.1). Every inter macroblock has one
// vector, so that only its outer edges can have strength 1.
void MacroblockCoder::find_edge_strengths(int mb_x, int mb_y) {
    const int mb = mb_y * picture.g_mb_width + mb_x;
    const bool intra = is_intra(picture.g_mb_mode[mb]);
    const unsigned coded = picture.g_coded_blocks[mb];
    const unsigned coded_columns = transpose_mask(coded);
    const unsigned inside_ver = coded_columns | coded_columns << 4;
    const unsigned inside_hor = coded | coded << 4;
    for (int edge = 1; edge < 4; ++edge) {
        bs_ver[edge] = intra ? kAllIntra : kStrengths.packed[0][inside_ver >> (4 * edge) & 0xf];
        bs_hor[edge] = intra ? kAllIntra : kStrengths.packed[0][inside_hor >> (4 * edge) & 0xf];
    }

    bs_ver[0] = 0;
    if (mb_x > 0) {
        const unsigned left = transpose_mask(picture.g_coded_blocks[mb - 1]) >> 12;
        bs_ver[0] =
            intra || is_intra(picture.g_mb_mode[mb - 1])
                ? kAllStrong
                : kStrengths.packed[vectors_differ(mb, mb - 1)][(coded_columns | left) & 0xf];
    }
    bs_hor[0] = 0;
    if (mb_y > 0) {
        const int above = mb - picture.g_mb_width;
        bs_hor[0] = intra || is_intra(picture.g_mb_mode[above])
                        ? kAllStrong
                        : kStrengths.packed[vectors_differ(mb, above)]
                                           [(coded | picture.g_coded_blocks[above] >> 12) & 0xf];
    }
}

// Whether the vectors of two inter macroblocks differ by a sample or more; both have reference 0.
bool MacroblockCoder::vectors_differ(int mb, int other) const {
    const _mv& a = picture.g_mv_array[mb];
    const _mv& b = picture.g_mv_array[other];
    return std::abs(4 * (a.x - b.x) + a.dx - b.dx) >= 4 ||
           std::abs(4 * (a.y - b.y) + a.dy - b.dy) >= 4;
}
