#include "avc/SliceHeader.h"

#include <iterator>
#include <vector>

#include "avc/BitStreamReader.h"
#include "avc/VideoAvcParser.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

// More than any valid slice header takes.
constexpr int kMaxHeaderBytes = 4096;

// Reads the part of a slice header that depends on its parameter sets.
class HeaderReader {
public:
    HeaderReader(BitStreamReader& reader, const SequenceParameterSet& sps,
                 const PictureParameterSet& pps, SliceHeader& header)
        : reader_(reader),
          sps_(sps),
          pps_(pps),
          header_(header),
          num_ref_idx_(pps.num_ref_idx_default_active) {}

    // False for values that the standard does not allow.
    bool read() {
        read_picture_identity();
        if (has_list(0) && !read_num_ref_idx()) {
            return false;
        }
        if (!skip_ref_pic_list_modification()) {
            return false;
        }
        skip_pred_weight_table();
        if (header_.nal_ref_idc != 0 && !skip_dec_ref_pic_marking()) {
            return false;
        }
        if (pps_.entropy_coding_mode_flag && has_list(0)) {
            reader_.SkipExpGolomb();  // cabac_init_idc
        }
        header_.slice_qp = 26 + pps_.pic_init_qp_minus26 + reader_.ReadSignedExpGolomb();
        return true;
    }

private:
    bool has_list(int list) const {
        const bool is_b = header_.slice_type == kSliceB;
        return list == 1 ? is_b
                         : is_b || header_.slice_type == kSliceP || header_.slice_type == kSliceSp;
    }

    void read_picture_identity() {
        if (sps_.separate_colour_plane_flag) {
            reader_.SkipBits(2);  // colour_plane_id
        }
        header_.frame_num = read_log2_field(reader_, sps_.log2_max_frame_num_minus4);
        if (!sps_.frame_mbs_only_flag) {
            header_.field_pic = reader_.ReadBoolean();
            header_.bottom_field = header_.field_pic && reader_.ReadBoolean();
        }
        if (header_.is_idr) {
            header_.idr_pic_id = reader_.ReadExpGolomb();
        }
        const bool has_bottom_delta =
            pps_.bottom_field_pic_order_in_frame_present_flag && !header_.field_pic;
        if (sps_.pic_order_cnt_type == 0) {
            header_.pic_order_cnt_lsb =
                read_log2_field(reader_, sps_.log2_max_pic_order_cnt_lsb_minus4);
        }
        if (sps_.pic_order_cnt_type == 1 && !sps_.delta_pic_order_always_zero_flag) {
            header_.delta_pic_order_cnt[0] = reader_.ReadSignedExpGolomb();
        }
        if (has_bottom_delta &&
            (sps_.pic_order_cnt_type == 0 ||
             (sps_.pic_order_cnt_type == 1 && !sps_.delta_pic_order_always_zero_flag))) {
            header_.delta_pic_order_cnt[1] = reader_.ReadSignedExpGolomb();
        }
        if (pps_.redundant_pic_cnt_present_flag) {
            header_.redundant_pic_cnt = reader_.ReadExpGolomb();
        }
    }

    bool read_num_ref_idx() {
        if (has_list(1)) {
            reader_.SkipBoolean();  // direct_spatial_mv_pred_flag
        }
        if (!reader_.ReadBoolean()) {  // num_ref_idx_active_override_flag
            return true;
        }
        for (int list = 0; list < 2 && has_list(list); ++list) {
            const std::uint64_t last = reader_.ReadExpGolomb();
            if (last >= PictureParameterSet::kMaxRefIdx) {
                return false;
            }
            num_ref_idx_[list] = last + 1;
        }
        return true;
    }

    // Clause 7.3.3.1. The end of the data reads as an end of the list.
    bool skip_ref_pic_list_modification() {
        constexpr std::uint64_t kEnd = 3;
        for (int list = 0; list < 2 && has_list(list); ++list) {
            if (!reader_.ReadBoolean()) {
                continue;
            }
            for (int i = 0; i <= kMaxCommands; ++i) {
                const std::uint64_t modification = reader_.ReadExpGolomb();
                if (modification == kEnd) {
                    break;
                }
                if (modification > kEnd || i == kMaxCommands) {
                    return false;
                }
                reader_.SkipExpGolomb();
            }
        }
        return true;
    }

    // Clause 7.3.3.2.
    void skip_pred_weight_table() {
        const bool is_b = header_.slice_type == kSliceB;
        if (!has_list(0) || (is_b ? pps_.weighted_bipred_idc != 1 : !pps_.weighted_pred_flag)) {
            return;
        }
        const bool has_chroma = sps_.chroma_array_type() != 0;
        reader_.SkipExpGolomb();  // luma_log2_weight_denom
        if (has_chroma) {
            reader_.SkipExpGolomb();  // chroma_log2_weight_denom
        }
        for (int list = 0; list < 2 && has_list(list); ++list) {
            for (std::uint64_t i = 0; i < num_ref_idx_[list]; ++i) {
                skip_weights(2);
                if (has_chroma) {
                    skip_weights(4);
                }
            }
        }
    }

    void skip_weights(int count) {
        if (reader_.ReadBoolean()) {
            for (int i = 0; i < count; ++i) {
                reader_.SkipSignedExpGolomb();
            }
        }
    }

    // Clause 7.3.3.3.
    bool skip_dec_ref_pic_marking() {
        if (header_.is_idr) {
            reader_.SkipBits(2);  // no_output_of_prior_pics_flag, long_term_reference_flag
            return true;
        }
        if (!reader_.ReadBoolean()) {  // adaptive_ref_pic_marking_mode_flag
            return true;
        }
        constexpr int kOperands[] = {0, 1, 1, 2, 1, 0, 1};
        for (int i = 0; i <= kMaxCommands; ++i) {
            const std::uint64_t operation = reader_.ReadExpGolomb();
            if (operation == 0) {
                return true;
            }
            if (operation >= std::size(kOperands)) {
                return false;
            }
            for (int operand = 0; operand < kOperands[operation]; ++operand) {
                reader_.SkipExpGolomb();
            }
        }
        return false;
    }

    // No valid slice has more modification or marking commands.
    static constexpr int kMaxCommands = 66;

    BitStreamReader& reader_;
    const SequenceParameterSet& sps_;
    const PictureParameterSet& pps_;
    SliceHeader& header_;
    std::array<std::uint64_t, 2> num_ref_idx_;
};

}  // namespace

std::optional<SliceHeader> SliceHeader::read(const unsigned char* nal, int size,
                                             const ParameterSets& sets) {
    const std::vector<unsigned char> bytes = rbsp_bytes(nal, size, kMaxHeaderBytes);
    const int num_bytes = static_cast<int>(bytes.size());
    BitStreamReader reader(bytes.data(), num_bytes);
    // Slice data follows the header, so a read that got to the end has met a cut.
    const auto is_cut_off = [&] { return reader.GetBytePos() >= num_bytes; };

    if (bytes.empty()) {
        return std::nullopt;
    }
    SliceHeader header;
    header.nal_ref_idc = reader.ReadUnsInt1() >> 5 & 3;
    header.is_idr = VideoAvcParser::IsSyncNalu(nal);
    header.first_mb_in_slice = reader.ReadExpGolomb();
    header.slice_type = reader.ReadExpGolomb();
    if (is_cut_off() || header.slice_type > 9) {
        return std::nullopt;
    }
    header.slice_type %= 5;
    header.pic_parameter_set_id = reader.ReadExpGolomb();

    const PictureParameterSet* const pps = sets.pic_par_set(header.pic_parameter_set_id);
    const SequenceParameterSet* const sps =
        pps != nullptr ? sets.seq_par_set(pps->seq_parameter_set_id) : nullptr;
    if (sps != nullptr) {
        header.is_complete = HeaderReader(reader, *sps, *pps, header).read() && !is_cut_off();
    }
    return header;
}

bool SliceHeader::starts_picture_after(const SliceHeader& previous) const {
    if (!is_complete || !previous.is_complete) {
        return first_mb_in_slice == 0;
    }
    if (redundant_pic_cnt > 0) {
        return false;
    }
    return frame_num != previous.frame_num ||
           pic_parameter_set_id != previous.pic_parameter_set_id ||
           field_pic != previous.field_pic || bottom_field != previous.bottom_field ||
           (nal_ref_idc == 0) != (previous.nal_ref_idc == 0) ||
           pic_order_cnt_lsb != previous.pic_order_cnt_lsb ||
           delta_pic_order_cnt != previous.delta_pic_order_cnt || is_idr != previous.is_idr ||
           idr_pic_id != previous.idr_pic_id;
}

}  // namespace zolt
