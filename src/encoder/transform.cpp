#include <algorithm>

#include "encoder/MacroblockCoder.h"
#include "encoder/tables.h"

namespace {

using zolt::Quantizer;

// Forward quantiser factors by QP % 6 and position class: both coordinates even, both odd, other.
constexpr std::int16_t quant_coef[6][3] = {{13107, 5243, 8066}, {11916, 4660, 7490},
                                           {10082, 4194, 6554}, {9362, 3647, 5825},
                                           {8192, 3355, 5243},  {7282, 2893, 4559}};

// normAdjust4x4 in the same order (clause 8.5.9).
constexpr std::int16_t dequant_coef[6][3] = {{10, 16, 13}, {11, 18, 14}, {13, 20, 16},
                                             {14, 23, 18}, {16, 25, 20}, {18, 29, 23}};

constexpr int kQpCount = 52;

struct QuantizerTable {
    Quantizer by_qp[kQpCount];
};

// divisor: 3 for intra rounding, 6 for inter rounding.
constexpr QuantizerTable make_quantizers(int divisor) {
    QuantizerTable table{};
    for (int qp = 0; qp < kQpCount; ++qp) {
        Quantizer& q = table.by_qp[qp];
        q.shift = 15 + qp / 6;
        q.rounding = (1 << q.shift) / divisor;
        q.dc_dead_zone = ((2 << q.shift) - 1 - 2 * q.rounding) / quant_coef[qp % 6][0];
        for (int position = 0; position < 16; ++position) {
            const int odd = (position & 1) + (position >> 2 & 1);
            const int position_class = odd == 0 ? 0 : odd == 2 ? 1 : 2;
            const int factor = quant_coef[qp % 6][position_class];
            q.forward[position] = static_cast<std::int16_t>(factor);
            q.dequant[position] =
                static_cast<std::int16_t>(dequant_coef[qp % 6][position_class] << (qp / 6));
            q.dead_zone[position] =
                static_cast<std::int16_t>(((1 << q.shift) - 1 - q.rounding) / factor);
        }
    }
    return table;
}

constexpr QuantizerTable kIntraQuantizers = make_quantizers(3);
constexpr QuantizerTable kInterQuantizers = make_quantizers(6);

// Cost of a block with a level beyond 1.
constexpr int kLargeLevelCost = 9999;

// An 8x8 block whose cost is lower than kMin8x8Cost, and a macroblock lower than
// kMinMacroblockCost, is not worth its levels.
constexpr int kMin8x8Cost = 5;
constexpr int kMinMacroblockCost = 6;

// Numbers of set bits of each four.
std::uint16_t count_by_fours(std::uint16_t bits) {
    const std::uint16_t pairs = static_cast<std::uint16_t>(bits - (bits >> 1 & 0x5555));
    return static_cast<std::uint16_t>((pairs & 0x3333) + (pairs >> 2 & 0x3333));
}

// Costs of 16 blocks whose levels are ones, from the masks of their levels in zig-zag order: by the
// number of zeros before it a level costs 3 (none), 2 (one or two), 1 (three to five) or nothing.
void costs_of_ones(const std::uint16_t* nonzero, std::uint16_t* costs) {
    for (int k = 0; k < 16; ++k) {
        const std::uint16_t levels = nonzero[k];
        // Positions with no, at most two and at most five zeros before them.
        const std::uint16_t none = static_cast<std::uint16_t>(levels << 1 | 1);
        const std::uint16_t two = static_cast<std::uint16_t>(none | none << 1 | none << 2);
        const std::uint16_t five = static_cast<std::uint16_t>(two | two << 3);
        const std::uint16_t fours = static_cast<std::uint16_t>(count_by_fours(levels & none) +
                                                               count_by_fours(levels & two) +
                                                               count_by_fours(levels & five));
        const std::uint16_t eights =
            static_cast<std::uint16_t>((fours & 0x0f0f) + (fours >> 4 & 0x0f0f));
        costs[k] = static_cast<std::uint16_t>((eights + (eights >> 8)) & 0xff);
    }
}

}  // namespace

const zolt::Quantizer& zolt::intra_quantizer(int qp) {
    return kIntraQuantizers.by_qp[qp];
}

const zolt::Quantizer& zolt::inter_quantizer(int qp) {
    return kInterQuantizers.by_qp[qp];
}

// That of intra 4x4 blocks.
const Quantizer& MacroblockCoder::luma_quantizer() const {
    return picture.g_slp->sliceType == I_SLICE ? zolt::intra_quantizer(picture.g_mbQp)
                                               : zolt::inter_quantizer(picture.g_mbQp);
}

// Intra 4x4 block k: transform, levels, reconstruction in the current picture. pred: 4x4 samples.
void MacroblockCoder::quantTransform_luma_4x4(int k, const std::uint8_t* pred) {
    const Quantizer& q = luma_quantizer();
    std::uint8_t* block =
        g_mb_rec_y + 4 * zolt::luma_scan_j[k] * picture.g_stride_luma + 4 * zolt::luma_scan_i[k];
    std::int16_t* coefs = g_mb_coefs + 16 * k;
    const unsigned coded = g_kernels->code_residual_4x4(
        block, picture.g_stride_luma, pred, q, coefs, g_scan_levels + 16 * k, g_nonzero + k);
    g_luma_mask |= coded << k;
    if (coded) {
        g_kernels->reconstruct_4x4(coefs, pred, block, picture.g_stride_luma);
    } else {
        for (int y = 0; y < 4; ++y) {
            std::copy(pred + 4 * y, pred + 4 * y + 4, block + y * picture.g_stride_luma);
        }
    }
}

// Intra 16x16 luma (clause 8.5.2) from its prediction: the DC coefficients have a transform of
// their own.
void MacroblockCoder::quantTransform_luma_16x16(const std::uint8_t* pred) {
    const Quantizer& q = zolt::intra_quantizer(picture.g_mbQp);
    std::int16_t dc[16];
    g_luma_mask = 0xffff & g_kernels->code_residual_16x16(g_mb_src_y, picture.g_width, pred, q, dc,
                                                          g_mb_coefs, g_scan_levels, g_nonzero);
    const std::uint32_t constant = g_kernels->code_luma_dc(dc, q, g_mb_coefs, g_luma_dc);
    g_luma_dc_nonzero = static_cast<std::uint16_t>(constant);
    g_kernels->reconstruct_16x16(g_mb_coefs, g_luma_mask | constant >> 16, pred, g_mb_rec_y,
                                 picture.g_stride_luma);
}

// Inter luma: 8x8 blocks and macroblocks with cheap levels only are sent without them.
void MacroblockCoder::quantTransform_luma_16x16P() {
    const std::uint32_t coded = g_kernels->code_residual_16x16(
        g_mb_src_y, picture.g_width, g_mb_pred, zolt::inter_quantizer(picture.g_mbQp), nullptr,
        g_mb_coefs, g_scan_levels, g_nonzero);
    std::uint16_t costs[16];
    costs_of_ones(g_nonzero, costs);
    unsigned kept = 0;
    int macroblock_cost = 0;
    for (int block8x8 = 0; block8x8 < 4; ++block8x8) {
        const std::uint16_t* of = costs + 4 * block8x8;
        const bool large = (coded >> (16 + 4 * block8x8) & 0xf) != 0;
        const int cost = large ? kLargeLevelCost : of[0] + of[1] + of[2] + of[3];
        const bool keep = cost >= kMin8x8Cost;
        kept |= (keep ? 0xfu : 0u) << (4 * block8x8);
        macroblock_cost += keep ? cost : 0;
    }
    g_luma_mask = macroblock_cost >= kMinMacroblockCost ? coded & kept : 0;
    g_kernels->reconstruct_16x16(g_mb_coefs, g_luma_mask, g_mb_pred, g_mb_rec_y,
                                 picture.g_stride_luma);
}

// Chroma of any macroblock (clause 8.5.4) from the predictions of Cb and then Cr.
void MacroblockCoder::quantTransform_chroma(const std::uint8_t* pred) {
    const int qp = zolt::QP_SCALE_CR[picture.g_mbQp];
    const Quantizer& q =
        picture.g_slp->sliceType == I_SLICE ? zolt::intra_quantizer(qp) : zolt::inter_quantizer(qp);
    const std::uint32_t coded = g_kernels->code_chroma({{g_mb_src_u, g_mb_src_v},
                                                        picture.g_width / 2,
                                                        pred,
                                                        {g_mb_rec_u, g_mb_rec_v},
                                                        picture.g_stride_chroma,
                                                        &q,
                                                        g_scan_levels + 256,
                                                        g_nonzero + 16,
                                                        g_chroma_dc});
    g_chroma_ac_mask = coded & 0xff;
    g_chroma_dc_mask = coded >> 8;
}
