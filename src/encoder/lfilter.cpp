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
constexpr std::uint32_t kAllIntra = 0x03030303;

bool is_intra(std::uint8_t mode) {
    return mode == MB_INTRA4x4 || mode == MB_INTRA16x16;
}

// The first row or column of a mask of 4x4 blocks in raster order. The product has bit 4n of the
// mask, among others, at 12 + n, and no two at one place.
unsigned first_row(unsigned blocks) {
    return blocks & 0xf;
}
unsigned first_column(unsigned blocks) {
    return (blocks & 0x1111) * 0x1248 >> 12 & 0xf;
}

bool any(const std::uint32_t* strengths) {
    return (strengths[0] | strengths[1] | strengths[2] | strengths[3]) != 0;
}

// The filters of edges between macroblocks of two QPs (clause 8.7.2.2).
struct EdgeFilters {
    zolt::EdgeFilter luma, chroma;

    EdgeFilters(int qp_p, int qp_q, const lfdata& lf)
        : luma(make((qp_p + qp_q + 1) >> 1, lf)),
          chroma(make((zolt::QP_SCALE_CR[qp_p] + zolt::QP_SCALE_CR[qp_q] + 1) >> 1, lf)) {}

private:
    static zolt::EdgeFilter make(int qp, const lfdata& lf) {
        const int index_a = std::clamp(qp + lf.alpha_offset, 0, 51);
        const int index_b = std::clamp(qp + lf.beta_offset, 0, 51);
        const std::int8_t* const tc0 = C0_big_tab[index_a];
        return {alpha_tab[index_a], beta_tab[index_b], {tc0[0], tc0[1], tc0[2], tc0[3]}};
    }
};

}  // namespace

// Left, internal vertical, top and internal horizontal edges of one macroblock of the current
// picture, in place (clause 8.7).
void MacroblockCoder::filter_mb(int mb_x, int mb_y) {
    const int mb = mb_y * picture.g_mb_width + mb_x;
    const lfdata& lf = picture.g_lf_data[mb];
    if (lf.disable_flag) {
        return;
    }
    find_edge_strengths(mb_x, mb_y);
    const bool vertical = any(bs_ver), horizontal = any(bs_hor);
    if (!vertical && !horizontal) {
        return;
    }
    const std::ptrdiff_t luma_stride = picture.g_stride_luma;
    const std::ptrdiff_t chroma_stride = picture.g_stride_chroma;
    std::uint8_t* const y = picture.g_cur_y + 16 * mb_y * luma_stride + 16 * mb_x;
    std::uint8_t* const u = picture.g_cur_u + 8 * mb_y * chroma_stride + 8 * mb_x;
    std::uint8_t* const v = picture.g_cur_v + 8 * mb_y * chroma_stride + 8 * mb_x;
    const zolt::Kernels& k = *g_kernels;
    const int qp = picture.g_mb_qp[mb];
    const EdgeFilters inner(qp, qp, lf);
    const auto outer = [&](bool present, int neighbour) {
        const int other = present ? picture.g_mb_qp[neighbour] : qp;
        return other == qp ? inner : EdgeFilters(other, qp, lf);
    };
    if (vertical) {
        const EdgeFilters left = outer(mb_x > 0, mb - 1);
        k.deblock_luma_vertical(y, luma_stride, bs_ver, left.luma, inner.luma);
        k.deblock_chroma_vertical(u, v, chroma_stride, bs_ver, left.chroma, inner.chroma);
    }
    if (horizontal) {
        const EdgeFilters top = outer(mb_y > 0, mb - picture.g_mb_width);
        k.deblock_luma_horizontal(y, luma_stride, bs_hor, top.luma, inner.luma);
        k.deblock_chroma_horizontal(u, v, chroma_stride, bs_hor, top.chroma, inner.chroma);
    }
}

// Boundary strengths of all edges of a macroblock (clause 8.7.2.1). Every inter macroblock has one
// vector, so that only its outer edges can have strength 1.
void MacroblockCoder::find_edge_strengths(int mb_x, int mb_y) {
    const int mb = mb_y * picture.g_mb_width + mb_x;
    const int left = mb - 1, above = mb - picture.g_mb_width;
    if (is_intra(picture.g_mb_mode[mb])) {
        std::fill_n(bs_ver, 4, kAllIntra);
        std::fill_n(bs_hor, 4, kAllIntra);
        bs_ver[0] = mb_x > 0 ? zolt::kStrongEdge : 0;
        bs_hor[0] = mb_y > 0 ? zolt::kStrongEdge : 0;
        return;
    }
    const unsigned coded = picture.g_coded_blocks[mb];
    for (int edge = 1; edge < 4; ++edge) {
        const unsigned columns = (coded | coded >> 1) >> (edge - 1);
        const unsigned rows = (coded | coded >> 4) >> (4 * (edge - 1));
        bs_ver[edge] = kStrengths.packed[0][first_column(columns)];
        bs_hor[edge] = kStrengths.packed[0][first_row(rows)];
    }
    bs_ver[0] = 0;
    if (mb_x > 0) {
        const unsigned columns = coded | picture.g_coded_blocks[left] >> 3;
        bs_ver[0] = is_intra(picture.g_mb_mode[left])
                        ? zolt::kStrongEdge
                        : kStrengths.packed[vectors_differ(mb, left)][first_column(columns)];
    }
    bs_hor[0] = 0;
    if (mb_y > 0) {
        const unsigned rows = coded | picture.g_coded_blocks[above] >> 12;
        bs_hor[0] = is_intra(picture.g_mb_mode[above])
                        ? zolt::kStrongEdge
                        : kStrengths.packed[vectors_differ(mb, above)][first_row(rows)];
    }
}

// Whether the vectors of two inter macroblocks differ by a sample or more; both have reference 0.
bool MacroblockCoder::vectors_differ(int mb, int other) const {
    const _mv& a = picture.g_mv_array[mb];
    const _mv& b = picture.g_mv_array[other];
    return std::abs(4 * (a.x - b.x) + a.dx - b.dx) >= 4 ||
           std::abs(4 * (a.y - b.y) + a.dy - b.dy) >= 4;
}
