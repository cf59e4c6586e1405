#include "avc/ParameterSets.h"

#include <algorithm>
#include <iterator>
#include <vector>

#include "avc/BitStreamReader.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

// More than any valid set takes, but for one with explicit slice groups for every macroblock.
constexpr int kMaxBytes = 65536;
constexpr std::uint64_t kMaxLog2Minus4 = 12;
constexpr std::uint64_t kMaxRefIdx = 32;

bool is_cut_off(const BitStreamReader& reader, const std::vector<unsigned char>& bytes) {
    return reader.GetBytePos() >= static_cast<int>(bytes.size());
}

// Clause 7.3.2.1.1: these profiles tell their chroma format.
bool has_chroma_format(int profile_idc) {
    constexpr int kProfiles[] = {44, 83, 86, 100, 110, 118, 122, 128, 134, 135, 138, 139, 244};
    return std::find(std::begin(kProfiles), std::end(kProfiles), profile_idc) !=
           std::end(kProfiles);
}

// scaling_list, clause 7.3.2.1.1.1.
void skip_scaling_list(BitStreamReader& reader, int size) {
    std::int64_t last = 8;
    for (int i = 0; i < size; ++i) {
        const std::int64_t next = (last + reader.ReadSignedExpGolomb()) & 255;
        if (next == 0) {
            return;
        }
        last = next;
    }
}

void read_chroma_format(BitStreamReader& reader, SeqParSet& set) {
    constexpr std::uint64_t kFormat444 = 3;
    set.chroma_format_idc = reader.ReadExpGolomb();
    if (set.chroma_format_idc == kFormat444) {
        set.separate_colour_planes = reader.ReadBoolean();
    }
    reader.SkipExpGolomb();      // bit_depth_luma_minus8
    reader.SkipExpGolomb();      // bit_depth_chroma_minus8
    reader.SkipBoolean();        // qpprime_y_zero_transform_bypass_flag
    if (reader.ReadBoolean()) {  // seq_scaling_matrix_present_flag
        const int lists = set.chroma_format_idc == kFormat444 ? 12 : 8;
        for (int i = 0; i < lists; ++i) {
            if (reader.ReadBoolean()) {
                skip_scaling_list(reader, i < 6 ? 16 : 64);
            }
        }
    }
}

// The slice group part of a picture parameter set; false for values that do not exist.
bool skip_slice_groups(BitStreamReader& reader) {
    const std::uint64_t last_group = reader.ReadExpGolomb();
    if (last_group == 0) {
        return true;
    }
    if (last_group > 7) {
        return false;
    }
    const std::uint64_t map_type = reader.ReadExpGolomb();
    if (map_type == 0) {
        for (std::uint64_t group = 0; group <= last_group; ++group) {
            reader.SkipExpGolomb();  // run_length_minus1
        }
    } else if (map_type == 2) {
        for (std::uint64_t group = 0; group < last_group; ++group) {
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

void ParameterSets::add_seq_par_set(const unsigned char* nal, int size) {
    const std::vector<unsigned char> bytes = rbsp_bytes(nal, size, kMaxBytes);
    BitStreamReader reader(bytes.data(), static_cast<int>(bytes.size()));
    reader.SkipBytes(1);
    const int profile_idc = reader.ReadUnsInt1();
    reader.SkipBytes(2);  // constraint_set flags, level_idc

    SeqParSet set;
    const std::uint64_t id = reader.ReadExpGolomb();
    if (has_chroma_format(profile_idc)) {
        read_chroma_format(reader, set);
    }
    const std::uint64_t log2_frame_num_minus4 = reader.ReadExpGolomb();
    const std::uint64_t pic_order_cnt_type = reader.ReadExpGolomb();
    std::uint64_t log2_lsb_minus4 = 0;
    if (pic_order_cnt_type == 0) {
        log2_lsb_minus4 = reader.ReadExpGolomb();
    } else if (pic_order_cnt_type == 1) {
        set.delta_pic_order_always_zero = reader.ReadBoolean();
        reader.SkipSignedExpGolomb();  // offset_for_non_ref_pic
        reader.SkipSignedExpGolomb();  // offset_for_top_to_bottom_field
        const std::uint64_t cycle = reader.ReadExpGolomb();
        for (std::uint64_t i = 0; i < cycle && !is_cut_off(reader, bytes); ++i) {
            reader.SkipSignedExpGolomb();  // offset_for_ref_frame
        }
    }
    reader.SkipExpGolomb();  // max_num_ref_frames
    reader.SkipBoolean();    // gaps_in_frame_num_value_allowed_flag
    reader.SkipExpGolomb();  // pic_width_in_mbs_minus1
    reader.SkipExpGolomb();  // pic_height_in_map_units_minus1
    set.frame_mbs_only = reader.ReadBoolean();

    if (is_cut_off(reader, bytes) || id >= seq_par_sets_.size() || set.chroma_format_idc > 3 ||
        log2_frame_num_minus4 > kMaxLog2Minus4 || pic_order_cnt_type > 2 ||
        log2_lsb_minus4 > kMaxLog2Minus4) {
        return;
    }
    set.id = id;
    set.frame_num_bits = static_cast<int>(log2_frame_num_minus4) + 4;
    set.pic_order_cnt_type = pic_order_cnt_type;
    set.pic_order_cnt_lsb_bits = static_cast<int>(log2_lsb_minus4) + 4;
    seq_par_sets_[id] = set;
}

void ParameterSets::add_pic_par_set(const unsigned char* nal, int size) {
    const std::vector<unsigned char> bytes = rbsp_bytes(nal, size, kMaxBytes);
    BitStreamReader reader(bytes.data(), static_cast<int>(bytes.size()));
    reader.SkipBytes(1);

    PicParSet set;
    const std::uint64_t id = reader.ReadExpGolomb();
    const std::uint64_t seq_par_set_id = reader.ReadExpGolomb();
    set.is_cabac = reader.ReadBoolean();
    set.bottom_field_pic_order_in_frame_present = reader.ReadBoolean();
    bool is_valid = skip_slice_groups(reader);
    for (std::uint64_t& num_ref_idx : set.num_ref_idx_default_active) {
        const std::uint64_t last = reader.ReadExpGolomb();
        is_valid = is_valid && last < kMaxRefIdx;
        num_ref_idx = last + 1;
    }
    set.weighted_pred = reader.ReadBoolean();
    set.weighted_bipred_idc = reader.ReadUnsInt1(2);
    set.pic_init_qp = 26 + reader.ReadSignedExpGolomb();
    reader.SkipSignedExpGolomb();  // pic_init_qs_minus26
    reader.SkipSignedExpGolomb();  // chroma_qp_index_offset
    reader.SkipBoolean();          // deblocking_filter_control_present_flag
    reader.SkipBoolean();          // constrained_intra_pred_flag
    set.redundant_pic_cnt_present = reader.ReadBoolean();

    if (!is_valid || is_cut_off(reader, bytes) || id >= pic_par_sets_.size() ||
        seq_par_set_id >= seq_par_sets_.size()) {
        return;
    }
    set.id = id;
    set.seq_par_set_id = seq_par_set_id;
    pic_par_sets_[id] = set;
}

const SeqParSet* ParameterSets::seq_par_set(std::uint64_t id) const {
    return id < seq_par_sets_.size() && seq_par_sets_[id] ? &*seq_par_sets_[id] : nullptr;
}

const PicParSet* ParameterSets::pic_par_set(std::uint64_t id) const {
    return id < pic_par_sets_.size() && pic_par_sets_[id] ? &*pic_par_sets_[id] : nullptr;
}

}  // namespace zolt
