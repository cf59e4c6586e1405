#include <algorithm>
#include <cstring>
#include <limits>

#include "encoder/CEncoder.h"
#include "encoder/errors.h"

namespace {

constexpr int kMaxQp = 51;
constexpr int kOverflowQpStep = 4;

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
    picture.g_mbQp = g_qp;
}

int CEncoder::set_bit_rate(int bps) {
    const int previous = g_bit_rate;
    g_bit_rate = bps;
    g_rc_enable = bps > 0;
    rate_control.g_rc_target_rate = static_cast<unsigned>(std::max(bps, 0));
    return previous;
}

double CEncoder::set_frame_rate(double fps) {
    const double previous = g_frame_rate;
    g_frame_rate = fps;
    rate_control.UpdateRateControlFrameRate(fps);
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
    g_sps->pic_width_in_mbs_minus1 = static_cast<unsigned>(picture.g_mb_width - 1);
    g_sps->pic_height_in_map_units_minus1 = static_cast<unsigned>(picture.g_mb_height - 1);
    g_sps->frame_mbs_only_flag = 1;

    *g_pps = {};
    g_pps->pic_init_qp_minus26 = 15;
    g_pps->pic_init_qs_minus26 = -11;

    g_prev_idr = 0;
    rate_control.g_rc_initialized = false;
    rate_control.g_rc_period = 0;
    g_inter_period = 1;
    g_coded_frames = 0;
    g_frame_num = -1;
    g_frame_counter = 0;
    if (g_rc_enable) {
        rate_control.InitRateControl(rate_control_stream());
        rate_control.check_level_limit();
    }
}

void CEncoder::encode_frame(const void* frame) {
    const unsigned position = g_frame_counter % g_intra_period;
    picture.g_frame = static_cast<const std::uint8_t*>(frame);
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
    picture.g_frame = nullptr;
    ++g_frame_counter;
}

void Picture::copy_reference(unsigned char* dst) const {
    copy_plane(dst, g_width16, g_ref_y, g_stride_luma, g_width16, g_height16);
    dst += static_cast<std::ptrdiff_t>(g_width16) * g_height16;
    copy_plane(dst, g_cwidth, g_ref_u, g_stride_chroma, g_cwidth, g_cheight);
    dst += static_cast<std::ptrdiff_t>(g_cwidth) * g_cheight;
    copy_plane(dst, g_cwidth, g_ref_v, g_stride_chroma, g_cwidth, g_cheight);
}

void CEncoder::copy_reconstruction(unsigned char* dst) const {
    picture.copy_reference(dst);
}

void CEncoder::doFrameI() {
    picture.g_slp->sliceType = I_SLICE;
    code_picture();
}

void CEncoder::doFrameP() {
    picture.g_slp->sliceType = P_SLICE;
    code_picture();
}

// The road of one picture. A picture that does not fit the NAL buffer is coded again, coarser.
void CEncoder::code_picture() {
    const rc_stream_t stream = rate_control_stream();
    const rc_picture_t coming = rate_control_picture();
    if (g_rc_enable) {
        picture.g_mbQp = rate_control.FrameLevelRateControl(stream, coming);
    }
    const int picture_qp = picture.g_mbQp;
    const int workers = g_worker_pool == nullptr ? 1 : g_worker_pool->threads();
    setSliceHeader();
    for (;;) {
        writeNALbyte(0, 2, g_idr_flag ? 5 : 1);
        writeSliceHeader();
        picture.initFrameParams();
        if (picture.g_slp->sliceType == P_SLICE) {
            picture.framePredInitP();
        }
        const bool fits = rows.code_slice_data(nal, static_cast<unsigned>(g_nal_buf_size) * 8,
                                               g_worker_pool, workers);
        g_slice_bits = nal.g_nal_bitpos;
        if (fits && writeNALUnit()) {
            break;
        }
        if (picture.g_mbQp == kMaxQp) {
            exitOnError("Coded picture exceeds the NAL buffer at QP 51", -1);
        }
        ResetNALUnit();
        picture.g_mbQp = std::min(picture.g_mbQp + kOverflowQpStep, kMaxQp);
    }
    if (g_rc_enable) {
        rate_control.UpdateFrameLevelRateControl(stream, coming, picture.g_mbQp,
                                                 static_cast<int>(g_slice_bits),
                                                 sum_of_distortions(), picture.g_num_mbs);
    } else {
        rate_control.g_rc_period = 0;
        picture.g_mbQp = picture_qp;
    }
    picture.manageRefBuffers();
    g_coded_frames = std::min(g_coded_frames, std::numeric_limits<int>::max() - 1) + 1;
}

rc_stream_t CEncoder::rate_control_stream() const {
    return {g_bit_rate, g_frame_rate, g_intra_period, g_qp, g_sps->level_idc};
}

rc_picture_t CEncoder::rate_control_picture() const {
    return {g_pic_type == P_SLICE, g_gop_pos, g_coded_frames, picture.g_mbQp};
}

// Of the searches of all macroblocks of a P picture.
std::int64_t CEncoder::sum_of_distortions() const {
    std::int64_t sum = 0;
    for (int mb = 0; mb < picture.g_num_mbs; ++mb) {
        sum += picture.g_mv_array[mb].sad;
    }
    return sum;
}

void CEncoder::setSliceHeader() {
    picture.g_slp->ppsId = 0;
    picture.g_slp->idr_pic_id =
        g_prev_idr ? static_cast<std::uint16_t>(picture.g_slp->idr_pic_id + 1) : 0;
    g_prev_idr = g_idr_flag;
    picture.g_num_ref_active = static_cast<std::uint8_t>(g_pps->num_ref_idx_l0_active_minus1 + 1);
    picture.g_slp->disable_deblocking_filter_idc =
        g_pps->deblocking_filter_control_present_flag ? 1 : 0;
    picture.g_slp->slice_alpha_c0_offset = 0;
    picture.g_slp->slice_beta_offset = 0;
}

// slice_header(), clause 7.3.3.
void CEncoder::writeSliceHeader() {
    nal.write_uvlc_unsigned(0);  // first_mb_in_slice
    nal.write_uvlc_unsigned(picture.g_slp->sliceType);
    nal.write_uvlc_unsigned(picture.g_slp->ppsId);
    nal.write_bits(static_cast<unsigned>(g_frame_num),
                   static_cast<int>(g_sps->log2_max_frame_num_minus4) + 4);
    if (g_idr_flag) {
        nal.write_uvlc_unsigned(picture.g_slp->idr_pic_id);
    }
    nal.write_bits(static_cast<unsigned>(g_poc),
                   static_cast<int>(g_sps->log2_max_pic_order_cnt_lsb_minus4) + 4);
    if (picture.g_slp->sliceType == P_SLICE) {
        nal.write_bits(0, 1);  // num_ref_idx_active_override_flag
        nal.write_bits(0, 1);  // ref_pic_list_reordering_flag_l0
    }
    if (g_idr_flag) {
        nal.write_bits(0, 1);  // no_output_of_prior_pics_flag
        nal.write_bits(0, 1);  // long_term_reference_flag
    } else {
        nal.write_bits(0, 1);  // adaptive_ref_pic_marking_mode_flag
    }
    nal.write_uvlc_signed(picture.g_mbQp - (26 + g_pps->pic_init_qp_minus26));  // slice_qp_delta
}

void Picture::initFrameParams() {
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
}

void Picture::manageRefBuffers() {
    std::swap(g_cur_y, g_ref_y);
    std::swap(g_cur_u, g_ref_u);
    std::swap(g_cur_v, g_ref_v);
}
