#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace zolt {

class BitStreamWriter;
struct VuiParameters;

// Every field of a sequence parameter set, named as in clause 7.3.2.1.1, up to its VUI parameters;
// a field that does not occur has its inferred value, one that damaged data lack is 0.
struct SequenceParameterSet {
    static constexpr std::size_t kMaxOffsets = 255;  // of offset_for_ref_frame

    std::uint32_t profile_idc = 0;
    std::uint32_t constraint_set_flags = 0;  // the byte of them, constraint_set0_flag first
    std::uint32_t level_idc = 0;
    std::uint32_t seq_parameter_set_id = 0;

    // Where has_chroma_format() only.
    std::uint32_t chroma_format_idc = 1;
    bool separate_colour_plane_flag = false;
    std::uint32_t bit_depth_luma_minus8 = 0;
    std::uint32_t bit_depth_chroma_minus8 = 0;
    bool qpprime_y_zero_transform_bypass_flag = false;
    bool seq_scaling_matrix_present_flag = false;
    // The elements of each scaling list, none where seq_scaling_list_present_flag is 0.
    std::array<std::vector<std::int64_t>, 12> delta_scale;

    std::uint32_t log2_max_frame_num_minus4 = 0;
    std::uint32_t pic_order_cnt_type = 0;
    std::uint32_t log2_max_pic_order_cnt_lsb_minus4 = 0;  // of type 0; the next five are of type 1
    bool delta_pic_order_always_zero_flag = false;
    std::int64_t offset_for_non_ref_pic = 0;
    std::int64_t offset_for_top_to_bottom_field = 0;
    std::uint32_t num_ref_frames_in_pic_order_cnt_cycle = 0;
    std::vector<std::int64_t> offset_for_ref_frame;  // no more than kMaxOffsets of them

    std::uint32_t max_num_ref_frames = 0;
    bool gaps_in_frame_num_value_allowed_flag = false;
    std::uint32_t pic_width_in_mbs_minus1 = 0;
    std::uint32_t pic_height_in_map_units_minus1 = 0;
    bool frame_mbs_only_flag = false;
    bool mb_adaptive_frame_field_flag = false;
    bool direct_8x8_inference_flag = false;
    bool frame_cropping_flag = false;
    std::uint32_t frame_crop_left_offset = 0;
    std::uint32_t frame_crop_right_offset = 0;
    std::uint32_t frame_crop_top_offset = 0;
    std::uint32_t frame_crop_bottom_offset = 0;
    bool vui_parameters_present_flag = false;

    // The data hold everything up to frame_mbs_only_flag, and what slice headers depend on is in
    // its range.
    bool is_valid = false;
    // They also hold the rest, as far as it is in this record.
    bool is_complete = false;

    // Reads the bytes of the NAL unit, header byte first, without emulation prevention.
    static SequenceParameterSet read(const std::vector<unsigned char>& rbsp);

    // Writes seq_parameter_set_data() of a complete set, with these VUI parameters whatever
    // vui_parameters_present_flag is.
    void write(BitStreamWriter& bits, const VuiParameters& vui) const;

    // Whether sets of this profile tell their chroma format.
    bool has_chroma_format() const;
    // ChromaArrayType
    std::uint32_t chroma_array_type() const {
        return separate_colour_plane_flag ? 0 : chroma_format_idc;
    }
};

}  // namespace zolt
