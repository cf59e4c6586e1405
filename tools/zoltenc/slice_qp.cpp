#include "zoltenc/slice_qp.h"

#include <vector>

#include "avc/BitStreamReader.h"
#include "avc/VideoAvcParser.h"
#include "avc/rbsp.h"
#include "media/IConfigVideoAvc.h"

namespace zolt {
namespace {

// Enough for every syntax element that is read.
constexpr int kMaxHeaderBytes = 64;
constexpr int kNalHeaderBits = 8;
constexpr std::uint32_t kSliceTypes = 5;  // values from here on repeat the first ones

// The fields of a picture parameter set (clause 7.3.2.2) that a slice header depends on.
struct PicParSet {
    bool bottom_field_pic_order = false;
    int pic_init_qp = 26;
};

PicParSet read_pic_par_set(const std::vector<unsigned char>& rbsp) {
    BitStreamReader reader(rbsp.data(), static_cast<int>(rbsp.size()));
    PicParSet set;
    reader.SkipBits(kNalHeaderBits);
    reader.SkipExpGolomb();  // pic_parameter_set_id
    reader.SkipExpGolomb();  // seq_parameter_set_id
    reader.SkipBoolean();    // entropy_coding_mode_flag
    set.bottom_field_pic_order = reader.ReadBoolean();
    reader.SkipExpGolomb();  // num_slice_groups_minus1, 0
    reader.SkipExpGolomb();  // num_ref_idx_l0_default_active_minus1
    reader.SkipExpGolomb();  // num_ref_idx_l1_default_active_minus1
    reader.SkipBoolean();    // weighted_pred_flag
    reader.SkipBits(2);      // weighted_bipred_idc
    set.pic_init_qp = 26 + static_cast<int>(reader.ReadSignedExpGolomb());
    return set;
}

}  // namespace

int slice_qp(IConfigVideoAvc& stream, const unsigned char* nal, std::size_t size) {
    VideoAvcSeqParSet sps;
    VideoAvcParser::ParseSeqParSet(stream.GetSeqParSetData(), stream.GetSeqParSetSize(), &sps);
    const PicParSet pps = read_pic_par_set(
        rbsp_bytes(stream.GetPicParSetData(), stream.GetPicParSetSize(), kMaxHeaderBytes));
    const std::vector<unsigned char> rbsp =
        rbsp_bytes(nal, static_cast<int>(size), kMaxHeaderBytes);

    // Slice header, clause 7.3.3.
    BitStreamReader reader(rbsp.data(), static_cast<int>(rbsp.size()));
    reader.SkipBits(kNalHeaderBits);
    reader.SkipExpGolomb();  // first_mb_in_slice
    const auto slice_type = static_cast<std::uint32_t>(reader.ReadExpGolomb()) % kSliceTypes;
    reader.SkipExpGolomb();  // pic_parameter_set_id
    reader.SkipBits(static_cast<int>(sps.log2_max_frame_num_minus4) + 4);
    if (VideoAvcParser::IsSyncNalu(nal)) {
        reader.SkipExpGolomb();  // idr_pic_id
    }
    reader.SkipBits(static_cast<int>(sps.log2_max_pic_order_cnt_lsb_minus4) + 4);
    if (pps.bottom_field_pic_order) {
        reader.SkipSignedExpGolomb();  // delta_pic_order_cnt_bottom
    }
    if (slice_type == 0) {           // P
        if (reader.ReadBoolean()) {  // num_ref_idx_active_override_flag
            reader.SkipExpGolomb();
        }
        reader.SkipBoolean();  // ref_pic_list_modification_flag_l0
    }
    const bool is_reference = (nal[0] >> 5 & 3) != 0;
    if (is_reference) {
        // Two flags of an IDR picture, adaptive_ref_pic_marking_mode_flag of any other.
        reader.SkipBits(VideoAvcParser::IsSyncNalu(nal) ? 2 : 1);
    }
    return pps.pic_init_qp + static_cast<int>(reader.ReadSignedExpGolomb());
}

}  // namespace zolt
