#include "avc/PictureParameterSet.h"

#include "avc/BitStreamReader.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

// What follows a num_slice_groups_minus1; false for values that do not exist.
bool skip_slice_groups(BitStreamReader& reader, std::uint32_t last_group) {
    if (last_group == 0) {
        return true;
    }
    if (last_group > 7) {
        return false;
    }
    const std::uint64_t map_type = reader.ReadExpGolomb();
    if (map_type == 0) {
        for (std::uint32_t group = 0; group <= last_group; ++group) {
            reader.SkipExpGolomb();  // run_length_minus1
        }
    } else if (map_type == 2) {
        for (std::uint32_t group = 0; group < last_group; ++group) {
            reader.SkipExpGolomb();  // top_left
            reader.SkipExpGolomb();  // bottom_right
        }
    } else if (map_type >= 3 && map_type <= 5) {
        reader.SkipBoolean();    // slice_group_change_direction_flag
        reader.SkipExpGolomb();  // slice_group_change_rate_minus1
    } else if (map_type == 6) {
        const int id_bits = last_group > 3 ? 3 : last_group > 1 ? 2 : 1;
        const std::uint64_t last_unit = reader.ReadExpGolomb();
        for (std::uint64_t unit = 0; unit <= last_unit; ++unit) {
            if (reader.SkipBits(id_bits) != 0) {  // slice_group_id
                return false;                     // the end, which such a skip does not reach
            }
        }
    }
    return map_type <= 6;
}

}  // namespace

PictureParameterSet PictureParameterSet::read(const unsigned char* rbsp, int size) {
    BitStreamReader reader(rbsp, size);
    PictureParameterSet set;
    set.pic_parameter_set_id = read_ue(reader);
    set.seq_parameter_set_id = read_ue(reader);
    set.entropy_coding_mode_flag = reader.ReadBoolean();
    set.bottom_field_pic_order_in_frame_present_flag = reader.ReadBoolean();
    set.num_slice_groups_minus1 = read_ue(reader);
    set.is_valid = skip_slice_groups(reader, set.num_slice_groups_minus1);
    for (std::uint64_t& num_ref_idx : set.num_ref_idx_default_active) {
        num_ref_idx = reader.ReadExpGolomb() + 1;
        set.is_valid = set.is_valid && num_ref_idx <= kMaxRefIdx;
    }
    set.weighted_pred_flag = reader.ReadBoolean();
    set.weighted_bipred_idc = reader.ReadUnsInt1(2);
    set.pic_init_qp_minus26 = reader.ReadSignedExpGolomb();
    reader.SkipSignedExpGolomb();  // pic_init_qs_minus26
    reader.SkipSignedExpGolomb();  // chroma_qp_index_offset
    reader.SkipBoolean();          // deblocking_filter_control_present_flag
    reader.SkipBoolean();          // constrained_intra_pred_flag
    set.redundant_pic_cnt_present_flag = reader.ReadBoolean();
    set.is_valid = set.is_valid && reader.GetBytePos() < size;
    return set;
}

}  // namespace zolt
