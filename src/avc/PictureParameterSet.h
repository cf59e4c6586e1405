#pragma once

#include <array>
#include <cstdint>

namespace zolt {

// What a slice header's syntax depends on of a picture parameter set, named as in clause 7.3.2.2;
// what damaged data lack is 0.
struct PictureParameterSet {
    static constexpr std::uint64_t kMaxRefIdx = 32;  // entries of a reference picture list

    std::uint32_t pic_parameter_set_id = 0;
    std::uint32_t seq_parameter_set_id = 0;
    bool entropy_coding_mode_flag = false;
    bool bottom_field_pic_order_in_frame_present_flag = false;
    std::uint32_t num_slice_groups_minus1 = 0;
    // num_ref_idx_l0_default_active_minus1 + 1, and the same of list 1.
    std::array<std::uint64_t, 2> num_ref_idx_default_active = {1, 1};
    bool weighted_pred_flag = false;
    std::uint32_t weighted_bipred_idc = 0;
    std::int64_t pic_init_qp_minus26 = 0;
    bool redundant_pic_cnt_present_flag = false;

    // The data hold everything up to here, and slice groups and list sizes are in their range.
    // Without this only the fields up to num_slice_groups_minus1 are of use.
    bool is_valid = false;

    // Reads the bytes behind the header byte of the NAL unit, without emulation prevention.
    static PictureParameterSet read(const unsigned char* rbsp, int size);
};

}  // namespace zolt
