#include "avc/seq_par_set.h"

#include <cstdint>
#include <vector>

#include "avc/BitStreamReader.h"
#include "avc/VideoAvcParser.h"
#include "avc/rbsp.h"
#include "avc/read_ue.h"

namespace zolt {
namespace {

constexpr std::uint32_t kChromaFormat444 = 3;

// Clause 7.3.2.1.1: these profiles tell their chroma format.
bool has_chroma_format(std::uint32_t profile_idc) {
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

// scaling_list, clause 7.3.2.1.1.1.
void skip_scaling_list(BitStreamReader& reader, int size) {
    std::int64_t last_scale = 8;
    std::int64_t next_scale = 8;
    for (int i = 0; i < size && next_scale != 0; ++i) {
        next_scale = (last_scale + reader.ReadSignedExpGolomb()) & 255;
        last_scale = next_scale != 0 ? next_scale : last_scale;
    }
}

void read_chroma_format(BitStreamReader& reader, VideoAvcSeqParSet& set) {
    set.chroma_format_idc = read_ue(reader);
    if (set.chroma_format_idc == kChromaFormat444) {
        set.separate_colour_plane_flag = reader.ReadBoolean();
    }
    reader.SkipExpGolomb();      // bit_depth_luma_minus8
    reader.SkipExpGolomb();      // bit_depth_chroma_minus8
    reader.SkipBoolean();        // qpprime_y_zero_transform_bypass_flag
    if (reader.ReadBoolean()) {  // seq_scaling_matrix_present_flag
        const int lists = set.chroma_format_idc == kChromaFormat444 ? 12 : 8;
        for (int i = 0; i < lists; ++i) {
            if (reader.ReadBoolean()) {
                skip_scaling_list(reader, i < 6 ? 16 : 64);
            }
        }
    }
}

}  // namespace

bool read_seq_par_set(const unsigned char* nal, int size, VideoAvcSeqParSet& set) {
    // More than the fields of any valid set take, and a bound for what a damaged one costs.
    constexpr int kMaxBytes = 8192;
    const std::vector<unsigned char> bytes = rbsp_bytes(nal, size, kMaxBytes);
    const int num_bytes = static_cast<int>(bytes.size());
    BitStreamReader reader(bytes.data(), num_bytes);

    set = {};
    reader.SkipBits(8);  // header byte
    set.profile_idc = reader.ReadUnsInt1();
    reader.SkipBits(8);  // constraint_set flags
    set.level_idc = reader.ReadUnsInt1();
    set.seq_parameter_set_id = read_ue(reader);
    if (has_chroma_format(set.profile_idc)) {
        read_chroma_format(reader, set);
    }
    set.log2_max_frame_num_minus4 = read_ue(reader);
    set.pic_order_cnt_type = read_ue(reader);
    if (set.pic_order_cnt_type == 0) {
        set.log2_max_pic_order_cnt_lsb_minus4 = read_ue(reader);
    } else if (set.pic_order_cnt_type == 1) {
        set.delta_pic_order_always_zero_flag = reader.ReadBoolean();
        reader.SkipSignedExpGolomb();  // offset_for_non_ref_pic
        reader.SkipSignedExpGolomb();  // offset_for_top_to_bottom_field
        const std::uint32_t cycle = read_ue(reader);
        for (std::uint32_t i = 0; i < cycle && reader.GetBytePos() < num_bytes; ++i) {
            reader.SkipSignedExpGolomb();  // offset_for_ref_frame
        }
    }
    set.num_ref_frames = read_ue(reader);
    set.gaps_in_frame_num_value_allowed_flag = reader.ReadBoolean();
    set.pic_width_in_mbs_minus1 = read_ue(reader);
    set.pic_height_in_map_units_minus1 = read_ue(reader);
    set.frame_mbs_only_flag = reader.ReadBoolean();
    return reader.GetBytePos() < num_bytes;
}

}  // namespace zolt
