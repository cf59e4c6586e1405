#include <algorithm>
#include <cstring>
#include <limits>

#include "encoder/CEncoder.h"

namespace {

constexpr int kMaxQp = 51;
constexpr int kOverflowQpStep = 4;

// The most bits that a macroblock can take, which is an intra 4x4 one in a P picture with 28-bit
// levels only: blocks that have all their levels carry no total_zeros.
constexpr unsigned kHeaderBits = 31 + 5 + 16 * 4 + 5 + 11 + 1;  // mb_skip_run to mb_qp_delta
constexpr unsigned kLumaBlockBits = 16 + 16 * 28;               // coeff_token and levels
constexpr unsigned kChromaDcBits = 6 + 4 * 28;
constexpr unsigned kChromaAcBits = 16 + 15 * 28;
constexpr unsigned kMaxMacroblockBits =
    kHeaderBits + 16 * kLumaBlockBits + 2 * kChromaDcBits + 8 * kChromaAcBits;

void copy_plane(std::uint8_t* dst, std::ptrdiff_t dst_stride, const std::uint8_t* src,
                std::ptrdiff_t src_stride, int width, int height) {
    for (int y = 0; y < height; ++y) {
        std::memcpy(dst + y * dst_stride, src + y * src_stride, static_cast<std::size_t>(width));
    }
}

int next_in_16_bits(int count) {
    return (count + 1) & 0xffff;
}

}  // namespace

void CEncoder::set_qp(int q) {
    g_qp = std::clamp(q, 0, kMaxQp);
    g_mbQp = g_qp;
}

int CEncoder::set_bit_rate(int bps) {
    const int previous = g_bit_rate;
    g_bit_rate = bps;
    g_rc_enable = bps > 0;
    g_rc_target_rate = static_cast<unsigned>(std::max(bps, 0));
    return previous;
}

double CEncoder::set_frame_rate(double fps) {
    const double previous = g_frame_rate;
    g_frame_rate = fps;
    UpdateRateControlFrameRate(fps);
    return previous;
}

unsigned CEncoder::set_intra_period(int n) {
    const unsigned previous = g_intra_period;
    g_intra_period = static_cast<unsigned>(std::max(n, 1));
    return previous;
}

unsigned CEncoder::set_inter_period(int n) {
    const unsigned previous = g_inter_period;
    g_inter_period = n == 0 ? 0 : 1;
    return previous;
}

void CEncoder::initialize_encoder() {
    *g_sps = {};
    g_sps->profile_idc = 77;  // Main
    g_sps->level_idc = 22;
    g_sps->log2_max_frame_num_minus4 = 12;
    g_sps->log2_max_pic_order_cnt_lsb_minus4 = 12;
    g_sps->num_ref_frames = 1;
    g_sps->pic_width_in_mbs_minus1 = static_cast<unsigned>(g_mb_width - 1);
    g_sps->pic_height_in_map_units_minus1 = static_cast<unsigned>(g_mb_height - 1);
    g_sps->frame_mbs_only_flag = 1;

    *g_pps = {};
    g_pps->pic_init_qp_minus26 = 15;
    g_pps->pic_init_qs_minus26 = -11;

    g_prev_idr = 0;
    g_rc_initialized = false;
    g_rc_period = 0;
    g_inter_period = 1;
    g_coded_frames = 0;
    g_frame_num = -1;
    g_frame_counter = 0;
    if (g_rc_enable) {
        InitRateControl();
        check_level_limit();
    }
}

void CEncoder::encode_frame(const void* frame) {
    const unsigned position = g_frame_counter % g_intra_period;
    g_frame = static_cast<const std::uint8_t*>(frame);
    g_pic_type = position == 0 ? I_SLICE : P_SLICE;
    g_idr_flag = position == 0;
    g_gop_pos = static_cast<int>(position);
    if (g_pic_type == I_SLICE) {
        g_frame_num = 0;
        g_poc = 0;
        doFrameI();
    } else {
        g_frame_num = next_in_16_bits(g_frame_num);
        g_poc = next_in_16_bits(g_poc);
        doFrameP();
    }
    g_frame = nullptr;
    ++g_frame_counter;
}

// Copies a macroblock row of the frame into the current picture.
void CEncoder::load_row(int mb_y) {
    const std::ptrdiff_t width = g_width;
    const std::ptrdiff_t chroma_width = g_width / 2;
    const std::uint8_t* y = g_frame;
    const std::uint8_t* u = y + width * g_height;
    const std::uint8_t* v = u + chroma_width * (g_height / 2);
    const std::ptrdiff_t row = 16 * mb_y;
    const std::ptrdiff_t chroma_row = 8 * mb_y;
    copy_plane(g_cur_y + row * g_stride_luma, g_stride_luma, y + row * width, width, g_width16, 16);
    copy_plane(g_cur_u + chroma_row * g_stride_chroma, g_stride_chroma,
               u + chroma_row * chroma_width, chroma_width, g_cwidth, 8);
    copy_plane(g_cur_v + chroma_row * g_stride_chroma, g_stride_chroma,
               v + chroma_row * chroma_width, chroma_width, g_cwidth, 8);
}

void CEncoder::copy_reconstruction(unsigned char* dst) const {
    copy_plane(dst, g_width16, g_ref_y, g_stride_luma, g_width16, g_height16);
    dst += static_cast<std::ptrdiff_t>(g_width16) * g_height16;
    copy_plane(dst, g_cwidth, g_ref_u, g_stride_chroma, g_cwidth, g_cheight);
    dst += static_cast<std::ptrdiff_t>(g_cwidth) * g_cheight;
    copy_plane(dst, g_cwidth, g_ref_v, g_stride_chroma, g_cwidth, g_cheight);
}

void CEncoder::doFrameI() {
    g_slp->sliceType = I_SLICE;
    code_picture();
}

void CEncoder::doFrameP() {
    g_slp->sliceType = P_SLICE;
    code_picture();
}

// The road of one picture. A picture that does not fit the NAL buffer is coded again, coarser.
void CEncoder::code_picture() {
    if (g_rc_enable) {
        FrameLevelRateControl();
    }
    const int picture_qp = g_mbQp;
    setSliceHeader();
    for (;;) {
        writeNALbyte(0, 2, g_idr_flag ? 5 : 1);
        writeSliceHeader();
        initFrameParams();
        if (g_slp->sliceType == P_SLICE) {
            framePredInitP();
        }
        if (code_slice_data() && writeNALUnit()) {
            break;
        }
        if (g_mbQp == kMaxQp) {
            exitOnError("Coded picture exceeds the NAL buffer at QP 51", -1);
        }
        ResetNALUnit();
        g_mbQp = std::min(g_mbQp + kOverflowQpStep, kMaxQp);
    }
    if (g_rc_enable) {
        UpdateFrameLevelRateControl();
    } else {
        g_rc_period = 0;
        g_mbQp = picture_qp;
    }
    manageRefBuffers();
    g_coded_frames = std::min(g_coded_frames, std::numeric_limits<int>::max() - 1) + 1;
}

// slice_data(), clause 7.3.4, and deblocking. Works in macroblock rows so that what a row needs is
// still in the cache: its input is loaded just before it is coded, and the row above is deblocked
// just after, when nothing predicts from it any more. Returns false when the NAL buffer might not
// hold the next macroblock.
bool CEncoder::code_slice_data() {
    const bool inter = g_slp->sliceType == P_SLICE;
    const unsigned capacity = static_cast<unsigned>(g_nal_buf_size) * 8;
    for (int mb_y = 0; mb_y < g_mb_height; ++mb_y) {
        load_row(mb_y);
        for (int mb_x = 0; mb_x < g_mb_width; ++mb_x) {
            if (g_nal_bitpos + kMaxMacroblockBits > capacity) {
                return false;
            }
            g_mapMBNumber = mb_y * g_mb_width + mb_x;
            if (inter) {
                processCurrentMB_P();
                writeMBSyntax_P();
            } else {
                processCurrentMB_I();
                writeMBSyntax();
            }
        }
        if (mb_y > 0) {
            filter_mb_row(mb_y - 1);
        }
    }
    filter_mb_row(g_mb_height - 1);
    g_slice_bits = g_nal_bitpos;
    return true;
}

void CEncoder::setSliceHeader() {
    g_mapMBNumber = 0;
    g_slp->ppsId = 0;
    g_slp->idr_pic_id = g_prev_idr ? static_cast<std::uint16_t>(g_slp->idr_pic_id + 1) : 0;
    g_prev_idr = g_idr_flag;
    g_num_ref_active = static_cast<std::uint8_t>(g_pps->num_ref_idx_l0_active_minus1 + 1);
    g_slp->disable_deblocking_filter_idc = g_pps->deblocking_filter_control_present_flag ? 1 : 0;
    g_slp->slice_alpha_c0_offset = 0;
    g_slp->slice_beta_offset = 0;
}

// slice_header(), clause 7.3.3.
void CEncoder::writeSliceHeader() {
    write_uvlc_unsigned(0);  // first_mb_in_slice
    write_uvlc_unsigned(g_slp->sliceType);
    write_uvlc_unsigned(g_slp->ppsId);
    write_bits(static_cast<unsigned>(g_frame_num),
               static_cast<int>(g_sps->log2_max_frame_num_minus4) + 4);
    if (g_idr_flag) {
        write_uvlc_unsigned(g_slp->idr_pic_id);
    }
    write_bits(static_cast<unsigned>(g_poc),
               static_cast<int>(g_sps->log2_max_pic_order_cnt_lsb_minus4) + 4);
    if (g_slp->sliceType == P_SLICE) {
        write_bits(0, 1);  // num_ref_idx_active_override_flag
        write_bits(0, 1);  // ref_pic_list_reordering_flag_l0
    }
    if (g_idr_flag) {
        write_bits(0, 1);  // no_output_of_prior_pics_flag
        write_bits(0, 1);  // long_term_reference_flag
    } else {
        write_bits(0, 1);  // adaptive_ref_pic_marking_mode_flag
    }
    write_uvlc_signed(g_mbQp - (26 + g_pps->pic_init_qp_minus26));  // slice_qp_delta
}

// Clears the maps that a picture starts with.
void CEncoder::initFrameParams() {
    const std::size_t blocks =
        static_cast<std::size_t>(g_blk_width) * static_cast<std::size_t>(g_blk_height);
    std::memset(
        g_i4mode, 2,
        static_cast<std::size_t>(g_blk_width + 2) * static_cast<std::size_t>(g_blk_height + 1));
    std::memset(g_blk_mvx, 0, blocks * sizeof *g_blk_mvx);
    std::memset(g_blk_mvy, 0, blocks * sizeof *g_blk_mvy);
    std::memset(g_cnum_l, 0, blocks);
    std::memset(g_cnum_u, 0, blocks / 4);
    std::memset(g_cnum_v, 0, blocks / 4);
    g_skip_run = 0;
}

// The deblocked picture becomes the reference; its predecessor gives room for the next frame.
void CEncoder::manageRefBuffers() {
    std::swap(g_cur_y, g_ref_y);
    std::swap(g_cur_u, g_ref_u);
    std::swap(g_cur_v, g_ref_v);
}
