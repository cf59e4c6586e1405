#include <algorithm>
#include <cstring>

#include "encoder/MacroblockCoder.h"
#include "encoder/errors.h"
#include "encoder/prefetch.h"
#include "encoder/tables.h"

namespace {

// Writes value to the 4x4 entries at p of a map with `stride` entries per row.
template <typename T>
void fill_blocks(T* p, std::ptrdiff_t stride, T value) {
    const T row_values[4] = {value, value, value, value};
    for (int row = 0; row < 4; ++row) {
        std::memcpy(p + row * stride, row_values, sizeof row_values);
    }
}

// Copies size x size samples.
template <int size>
void copy_block(std::uint8_t* dst, std::ptrdiff_t dst_stride, const std::uint8_t* src,
                std::ptrdiff_t src_stride) {
    for (int y = 0; y < size; ++y) {
        std::memcpy(dst + y * dst_stride, src + y * src_stride, size);
    }
}

// Asks for the share of macroblock column mb_x in the samples of a macroblock row, at y, u and v: a
// cache line of four rows of luma and of one row of either chroma plane, since 64 bytes are 4
// macroblocks of luma and 8 of chroma.
void prefetch_share(int mb_x, const std::uint8_t* y, const std::uint8_t* u, const std::uint8_t* v,
                    std::ptrdiff_t stride, std::ptrdiff_t chroma_stride) {
    const std::uint8_t* luma = y + 4 * (mb_x & 3) * stride;
    for (int row = 0; row < 4; ++row) {
        zolt::prefetch(luma + row * stride);
    }
    const std::ptrdiff_t chroma = (mb_x & 7) * chroma_stride;
    zolt::prefetch(u + chroma);
    zolt::prefetch(v + chroma);
}

// A mask of luma blocks in decoding order, in raster order: the two exchange the middle pairs of
// every two block rows.
std::uint16_t raster_mask(unsigned mask) {
    return static_cast<std::uint16_t>((mask & 0xc3c3) | (mask & 0x0c0c) << 2 |
                                      (mask & 0x3030) >> 2);
}

}  // namespace

void MacroblockCoder::code_macroblock(int mb_x, int mb_y) {
    g_mb_x = mb_x;
    g_mb_y = mb_y;
    g_mapMBNumber = mb_y * picture.g_mb_width + mb_x;
    if (picture.g_slp->sliceType == P_SLICE) {
        processCurrentMB_P();
        writeMBSyntax_P();
    } else {
        processCurrentMB_I();
        writeMBSyntax();
    }
}

// A macroblock of an I picture: decisions, levels, reconstruction, maps.
void MacroblockCoder::processCurrentMB_I() {
    setMBOffsets();
    prefetch_samples();
    code_intra();
}

// A macroblock of a P picture.
void MacroblockCoder::processCurrentMB_P() {
    setMBOffsets();
    prefetch_samples();
    generatePredError16x16();
    g_skip_flag = 0;
    if (!setLearnPIMode()) {
        const std::ptrdiff_t block = first_block();
        fill_blocks(picture.g_blk_mvx + block, picture.g_blk_width, std::int16_t{0});
        fill_blocks(picture.g_blk_mvy + block, picture.g_blk_width, std::int16_t{0});
        code_intra();
        return;
    }
    g_cur_mb_mode = MB_P16x16;
    picture.g_mb_mode[g_mapMBNumber] = MB_P16x16;
    quantTransform_luma_16x16P();
    picture.g_coded_blocks[g_mapMBNumber] = raster_mask(g_luma_mask);
    predict_inter_chroma();
    quantTransform_chroma(g_mb_pred + 256);
    setMBValues_P();
}

// What every macroblock starts with.
void MacroblockCoder::setMBOffsets() {
    lfdata& lf = picture.g_lf_data[g_mapMBNumber];
    lf.disable_flag = static_cast<std::uint8_t>(picture.g_slp->disable_deblocking_filter_idc);
    lf.alpha_offset = static_cast<std::int8_t>(picture.g_slp->slice_alpha_c0_offset);
    lf.beta_offset = static_cast<std::int8_t>(picture.g_slp->slice_beta_offset);
    g_chroma_mode = 0;
    picture.g_mb_qp[g_mapMBNumber] = static_cast<std::uint8_t>(picture.g_mbQp);

    g_mb_up = g_mb_y > 0;
    g_mb_left = g_mb_x > 0;
    const std::ptrdiff_t luma_row = 16 * g_mb_y;
    const std::ptrdiff_t chroma_row = 8 * g_mb_y;
    const std::ptrdiff_t width = picture.g_width;
    const std::ptrdiff_t chroma_width = picture.g_width / 2;
    g_mb_src_y = picture.g_frame + luma_row * width + 16 * g_mb_x;
    g_mb_src_u =
        picture.g_frame + width * picture.g_height + chroma_row * chroma_width + 8 * g_mb_x;
    g_mb_src_v = g_mb_src_u + chroma_width * (picture.g_height / 2);
    const std::ptrdiff_t chroma = chroma_row * picture.g_stride_chroma + 8 * g_mb_x;
    g_mb_rec_y = picture.g_cur_y + luma_row * picture.g_stride_luma + 16 * g_mb_x;
    g_mb_rec_u = picture.g_cur_u + chroma;
    g_mb_rec_v = picture.g_cur_v + chroma;

    g_sad_lambda = zolt::QP2QUANT[std::max(0, picture.g_mbQp - 12)];
    g_intra_lambda = g_sad_lambda;
}

// Asks for samples that later macroblocks start with: the row below those of the caller's frame and
// in P pictures of the reference, those to the right their place in the current picture. The row
// below may be another worker's to write.
void MacroblockCoder::prefetch_samples() const {
    constexpr int kRight = 8;  // macroblocks
    const std::ptrdiff_t stride = picture.g_stride_luma;
    const std::ptrdiff_t chroma_stride = picture.g_stride_chroma;
    if (g_mb_y + 1 < picture.g_mb_height) {
        const std::ptrdiff_t width = picture.g_width;
        const std::ptrdiff_t chroma = 8 * (width / 2);
        prefetch_share(g_mb_x, g_mb_src_y + 16 * width, g_mb_src_u + chroma, g_mb_src_v + chroma,
                       width, width / 2);
    }
    if (g_mb_x + kRight < picture.g_mb_width) {
        prefetch_share(g_mb_x, g_mb_rec_y + 16 * kRight, g_mb_rec_u + 8 * kRight,
                       g_mb_rec_v + 8 * kRight, stride, chroma_stride);
    }
    if (picture.g_slp->sliceType == P_SLICE) {
        const std::ptrdiff_t luma = (16 * g_mb_y + 16) * stride + 16 * g_mb_x;
        const std::ptrdiff_t chroma = (8 * g_mb_y + 8) * chroma_stride + 8 * g_mb_x;
        prefetch_share(g_mb_x, picture.g_ref_y + luma, picture.g_ref_u + chroma,
                       picture.g_ref_v + chroma, stride, chroma_stride);
    }
}

// Entry of the macroblock's top left block in the per-4x4-block maps.
std::ptrdiff_t MacroblockCoder::first_block() const {
    return static_cast<std::ptrdiff_t>(4 * g_mb_y) * picture.g_blk_width + 4 * g_mb_x;
}

// Copies the macroblock into the current picture, where intra coding replaces it by its
// reconstruction: its kernels read source samples and their reconstructed neighbours in one plane.
void MacroblockCoder::load_intra() const {
    copy_block<16>(g_mb_rec_y, picture.g_stride_luma, g_mb_src_y, picture.g_width);
    copy_block<8>(g_mb_rec_u, picture.g_stride_chroma, g_mb_src_u, picture.g_width / 2);
    copy_block<8>(g_mb_rec_v, picture.g_stride_chroma, g_mb_src_v, picture.g_width / 2);
}

void MacroblockCoder::code_intra() {
    load_intra();
    fill_blocks(picture.g_blk_ref + first_block(), picture.g_blk_width, std::int8_t{-1});
    g_cur_mb_mode = learn16_4() == 16 ? MB_INTRA16x16 : MB_INTRA4x4;
    picture.g_mb_mode[g_mapMBNumber] = g_cur_mb_mode;
    if (g_cur_mb_mode == MB_INTRA16x16) {
        // The chroma mode does not depend on luma, nor luma on chroma.
        g_ipMBPred[0] = static_cast<std::uint8_t>(learn16_mode());
        quantTransform_luma_16x16(g_intra_pred_16x16[g_ipMBPred[0]]);
    } else {
        code_intra4x4();
    }
    g_chroma_mode = static_cast<std::uint8_t>(learn_chroma_mode());
    quantTransform_chroma(g_intra_pred_chroma[g_chroma_mode]);
    setMBType_CBP();
}

// Intra 4x4 luma: every block is predicted from the reconstruction of those before it.
void MacroblockCoder::code_intra4x4() {
    const std::ptrdiff_t stride = picture.g_blk_width + 2;
    std::int8_t* modes = picture.g_i4mode + (4 * g_mb_y + 1) * stride + 4 * g_mb_x + 1;
    if (!g_mb_left) {
        for (int y = 0; y < 4; ++y) {
            modes[y * stride - 1] = -1;
        }
    }
    if (!g_mb_up) {
        std::memset(modes - stride, -1, 4);
    }
    std::uint8_t predicted[16];
    if (g_kernels->code_intra_4x4) {
        g_luma_mask = g_kernels->code_intra_4x4(intra4x4_rule(modes, stride, predicted));
    } else {
        code_intra4x4_by_block(modes, stride, predicted);
    }
    for (int k = 0; k < 16; ++k) {
        const int mode = g_ipMBPred[k];
        g_prev_intra4x4_pred_mode_flag[k] = mode == predicted[k];
        g_rem_intra4x4_pred_mode[k] =
            static_cast<std::uint8_t>(mode > predicted[k] ? mode - 1 : mode);
    }
}

// modes: the macroblock's entries in the map of modes, with `stride` entries a row; the predicted
// modes go to predicted.
void MacroblockCoder::code_intra4x4_by_block(std::int8_t* modes, std::ptrdiff_t stride,
                                             std::uint8_t* predicted) {
    set_block_availability();
    g_luma_mask = 0;
    for (int k = 0; k < 16; ++k) {
        std::int8_t* entry = modes + zolt::luma_scan_j[k] * stride + zolt::luma_scan_i[k];
        const int above = entry[-stride];
        const int left = entry[-1];
        predicted[k] =
            static_cast<std::uint8_t>(above >= 0 && left >= 0 ? std::min(above, left) : 2);

        alignas(32) std::uint8_t pred[16];
        const int mode = learn4_mode(k, predicted[k], pred);
        *entry = static_cast<std::int8_t>(mode);
        g_ipMBPred[k] = static_cast<std::uint8_t>(mode);
        quantTransform_luma_4x4(k, pred);
    }
}

// Neighbour availability of the 4x4 blocks, clause 6.4.11.4 for one slice per picture.
void MacroblockCoder::set_block_availability() {
    constexpr unsigned kTopRow = 1u << 0 | 1u << 1 | 1u << 4 | 1u << 5;
    constexpr unsigned kLeftColumn = 1u << 0 | 1u << 2 | 1u << 8 | 1u << 10;
    constexpr unsigned kNoUpRight = 1u << 3 | 1u << 7 | 1u << 11 | 1u << 13 | 1u << 15;
    for (int k = 0; k < 16; ++k) {
        g_blk_up[k] = (kTopRow >> k & 1) ? g_mb_up : 1;
        g_blk_left[k] = (kLeftColumn >> k & 1) ? g_mb_left : 1;
        g_blk_up_left[k] = g_blk_up[k] && g_blk_left[k];
        g_blk_up_right[k] = (kNoUpRight >> k & 1) ? 0 : g_blk_up[k];
    }
    g_blk_up_right[5] = has_up_right();
}

std::uint8_t MacroblockCoder::has_up_right() const {
    return g_mb_up && g_mb_x < picture.g_mb_width - 1;
}

// Search, vector maps and luma prediction of a P macroblock.
void MacroblockCoder::generatePredError16x16() {
    generateMBPred();
    const _mv& mv = picture.g_mv_array[g_mapMBNumber];
    const std::int16_t x = static_cast<std::int16_t>(4 * mv.x + mv.dx);
    const std::int16_t y = static_cast<std::int16_t>(4 * mv.y + mv.dy);
    const std::ptrdiff_t block = first_block();
    fill_blocks(picture.g_blk_mvx + block, picture.g_blk_width, x);
    fill_blocks(picture.g_blk_mvy + block, picture.g_blk_width, y);
    fill_blocks(picture.g_blk_ref + block, picture.g_blk_width, std::int8_t{0});
    qpmc_16x16_L0(g_mb_pred, x, y, 16 * g_mb_x, 16 * g_mb_y);
}

void MacroblockCoder::predict_inter_chroma() {
    const std::ptrdiff_t block = first_block();
    qpmc_c_core(g_mb_pred + 256, picture.g_blk_mvx[block], picture.g_blk_mvy[block], 8 * g_mb_x,
                8 * g_mb_y);
}

// mb_type and coded_block_pattern (Tables 7-11, 7-13; clause 7.4.5) of the coded blocks.
void MacroblockCoder::setMBType_CBP() {
    const int chroma = g_chroma_ac_mask ? 2 : g_chroma_dc_mask ? 1 : 0;
    unsigned luma = g_luma_mask;  // its bits 0, 4, 8 and 12 gather those of the 8x8 blocks
    luma |= luma >> 1;
    luma |= luma >> 2;
    luma = (luma & 1) | (luma >> 3 & 2) | (luma >> 6 & 4) | (luma >> 9 & 8);
    const int intra_base = picture.g_slp->sliceType == P_SLICE ? 5 : 0;  // P: after the inter types
    switch (g_cur_mb_mode) {
        case MB_P16x16:
            g_mb_type = 0;
            break;
        case MB_INTRA4x4:
            g_mb_type = intra_base;
            break;
        case MB_INTRA16x16:
            luma = luma ? 15 : 0;
            g_mb_type = intra_base + 1 + g_ipMBPred[0] + 4 * chroma + (luma ? 12 : 0);
            break;
        default:
            exitOnError("setMBType_CBP. Unsupported mode\n", -1);
    }
    g_coded_block_pattern = static_cast<int>(luma) + 16 * chroma;
}

// The vector prediction that the search used; the macroblock's neighbours have not changed since.
void MacroblockCoder::set_pred_MVD() {
    const std::ptrdiff_t block = first_block();
    g_mvd_x = static_cast<std::int16_t>(picture.g_blk_mvx[block] - g_pmv_x);
    g_mvd_y = static_cast<std::int16_t>(picture.g_blk_mvy[block] - g_pmv_y);
}

// Syntax values of an inter macroblock, and whether it is sent as P_Skip: when it has no levels and
// its vector is the one a decoder infers (clause 8.4.1.1).
void MacroblockCoder::setMBValues_P() {
    setMBType_CBP();
    set_pred_MVD();
    const bool last = g_mapMBNumber == picture.g_num_mbs - 1;
    if (last || g_coded_block_pattern != 0) {
        return;
    }
    const std::ptrdiff_t block = first_block();
    const auto is_zero = [this](std::ptrdiff_t b) {
        return picture.g_blk_mvx[b] == 0 && picture.g_blk_mvy[b] == 0;
    };
    const auto holds_still = [&](std::ptrdiff_t b) {
        return picture.g_blk_ref[b] == 0 && is_zero(b);
    };
    const bool zero_skip_vector = !g_mb_left || !g_mb_up || holds_still(block - 1) ||
                                  holds_still(block - picture.g_blk_width);
    if (zero_skip_vector ? is_zero(block) : g_mvd_x == 0 && g_mvd_y == 0) {
        // Without levels the reconstruction already is the prediction that the decoder forms.
        g_skip_flag = 1;
        picture.g_mb_mode[g_mapMBNumber] = MB_SKIP;
    }
}
