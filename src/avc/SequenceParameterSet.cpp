#include "avc/SequenceParameterSet.h"

#include "avc/BitStreamReader.h"
#include "avc/BitStreamWriter.h"
#include "avc/VuiParameters.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

constexpr std::uint32_t kMaxLog2Minus4 = 12;
constexpr std::uint32_t kFormat444 = 3;

std::size_t scaling_lists(const SequenceParameterSet& set) {
    return set.chroma_format_idc == kFormat444 ? 12 : 8;
}

// scaling_list, clause 7.3.2.1.1.1.
std::vector<std::int64_t> read_scaling_list(BitStreamReader& reader, std::size_t size) {
    std::vector<std::int64_t> deltas;
    std::int64_t next_scale = 8;
    while (next_scale != 0 && deltas.size() < size) {
        deltas.push_back(reader.ReadSignedExpGolomb());
        next_scale = (next_scale + deltas.back()) & 255;
    }
    return deltas;
}

void read_chroma_format(BitStreamReader& reader, SequenceParameterSet& set) {
    set.chroma_format_idc = read_ue(reader);
    if (set.chroma_format_idc == kFormat444) {
        set.separate_colour_plane_flag = reader.ReadBoolean();
    }
    set.bit_depth_luma_minus8 = read_ue(reader);
    set.bit_depth_chroma_minus8 = read_ue(reader);
    set.qpprime_y_zero_transform_bypass_flag = reader.ReadBoolean();
    set.seq_scaling_matrix_present_flag = reader.ReadBoolean();
    if (set.seq_scaling_matrix_present_flag) {
        for (std::size_t i = 0; i < scaling_lists(set); ++i) {
            if (reader.ReadBoolean()) {  // seq_scaling_list_present_flag
                set.delta_scale[i] = read_scaling_list(reader, i < 6 ? 16 : 64);
            }
        }
    }
}

void write_chroma_format(BitStreamWriter& bits, const SequenceParameterSet& set) {
    bits.ue(set.chroma_format_idc);
    if (set.chroma_format_idc == kFormat444) {
        bits.u(1, set.separate_colour_plane_flag);
    }
    bits.ue(set.bit_depth_luma_minus8).ue(set.bit_depth_chroma_minus8);
    bits.u(1, set.qpprime_y_zero_transform_bypass_flag);
    bits.u(1, set.seq_scaling_matrix_present_flag);
    if (set.seq_scaling_matrix_present_flag) {
        for (std::size_t i = 0; i < scaling_lists(set); ++i) {
            bits.u(1, !set.delta_scale[i].empty());
            for (const std::int64_t delta : set.delta_scale[i]) {
                bits.se(delta);
            }
        }
    }
}

void write_pic_order_cnt(BitStreamWriter& bits, const SequenceParameterSet& set) {
    bits.ue(set.pic_order_cnt_type);
    if (set.pic_order_cnt_type == 0) {
        bits.ue(set.log2_max_pic_order_cnt_lsb_minus4);
    } else if (set.pic_order_cnt_type == 1) {
        bits.u(1, set.delta_pic_order_always_zero_flag);
        bits.se(set.offset_for_non_ref_pic).se(set.offset_for_top_to_bottom_field);
        bits.ue(set.num_ref_frames_in_pic_order_cnt_cycle);
        for (const std::int64_t offset : set.offset_for_ref_frame) {
            bits.se(offset);
        }
    }
}

}  // namespace

SequenceParameterSet SequenceParameterSet::read(const std::vector<unsigned char>& rbsp) {
    const int size = static_cast<int>(rbsp.size());
    BitStreamReader reader(rbsp.data(), size);
    // More follows every field of this record, so a read that got to the end has met a cut.
    const auto is_cut_off = [&] { return reader.GetBytePos() >= size; };

    SequenceParameterSet set;
    reader.SkipBits(8);  // the header byte
    set.profile_idc = reader.ReadUnsInt1();
    if (size > 3) {  // else the third byte, as the last one, counts as level_idc
        set.constraint_set_flags = reader.ReadUnsInt1();
    }
    set.level_idc = reader.ReadUnsInt1();
    set.seq_parameter_set_id = read_ue(reader);
    if (set.has_chroma_format()) {
        read_chroma_format(reader, set);
    }
    set.log2_max_frame_num_minus4 = read_ue(reader);
    set.pic_order_cnt_type = read_ue(reader);
    if (set.pic_order_cnt_type == 0) {
        set.log2_max_pic_order_cnt_lsb_minus4 = read_ue(reader);
    } else if (set.pic_order_cnt_type == 1) {
        set.delta_pic_order_always_zero_flag = reader.ReadBoolean();
        set.offset_for_non_ref_pic = reader.ReadSignedExpGolomb();
        set.offset_for_top_to_bottom_field = reader.ReadSignedExpGolomb();
        set.num_ref_frames_in_pic_order_cnt_cycle = read_ue(reader);
        for (std::uint32_t i = 0; i < set.num_ref_frames_in_pic_order_cnt_cycle && !is_cut_off();
             ++i) {
            const std::int64_t offset = reader.ReadSignedExpGolomb();
            if (i < kMaxOffsets) {
                set.offset_for_ref_frame.push_back(offset);
            }
        }
    }
    set.max_num_ref_frames = read_ue(reader);
    set.gaps_in_frame_num_value_allowed_flag = reader.ReadBoolean();
    set.pic_width_in_mbs_minus1 = read_ue(reader);
    set.pic_height_in_map_units_minus1 = read_ue(reader);
    set.frame_mbs_only_flag = reader.ReadBoolean();
    set.is_valid = !is_cut_off() && set.chroma_format_idc <= 3 &&
                   set.log2_max_frame_num_minus4 <= kMaxLog2Minus4 && set.pic_order_cnt_type <= 2 &&
                   set.log2_max_pic_order_cnt_lsb_minus4 <= kMaxLog2Minus4;

    if (!set.frame_mbs_only_flag) {
        set.mb_adaptive_frame_field_flag = reader.ReadBoolean();
    }
    set.direct_8x8_inference_flag = reader.ReadBoolean();
    set.frame_cropping_flag = reader.ReadBoolean();
    if (set.frame_cropping_flag) {
        set.frame_crop_left_offset = read_ue(reader);
        set.frame_crop_right_offset = read_ue(reader);
        set.frame_crop_top_offset = read_ue(reader);
        set.frame_crop_bottom_offset = read_ue(reader);
    }
    set.vui_parameters_present_flag = reader.ReadBoolean();
    set.is_complete = set.is_valid && !is_cut_off() &&
                      set.num_ref_frames_in_pic_order_cnt_cycle == set.offset_for_ref_frame.size();
    return set;
}

void SequenceParameterSet::write(BitStreamWriter& bits, const VuiParameters& vui) const {
    bits.u(8, profile_idc).u(8, constraint_set_flags).u(8, level_idc).ue(seq_parameter_set_id);
    if (has_chroma_format()) {
        write_chroma_format(bits, *this);
    }
    bits.ue(log2_max_frame_num_minus4);
    write_pic_order_cnt(bits, *this);
    bits.ue(max_num_ref_frames).u(1, gaps_in_frame_num_value_allowed_flag);
    bits.ue(pic_width_in_mbs_minus1).ue(pic_height_in_map_units_minus1);
    bits.u(1, frame_mbs_only_flag);
    if (!frame_mbs_only_flag) {
        bits.u(1, mb_adaptive_frame_field_flag);
    }
    bits.u(1, direct_8x8_inference_flag).u(1, frame_cropping_flag);
    if (frame_cropping_flag) {
        bits.ue(frame_crop_left_offset).ue(frame_crop_right_offset);
        bits.ue(frame_crop_top_offset).ue(frame_crop_bottom_offset);
    }
    bits.u(1, 1);  // vui_parameters_present_flag
    vui.write(bits);
}

bool SequenceParameterSet::has_chroma_format() const {
    switch (profile_idc) {
        case 44:
        case 83:
        case 86:
        case 100:
        case 110:
        case 118:
        case 122:
        case 128:
        case 244:
            return true;
        default:
            return false;
    }
}

}  // namespace zolt
