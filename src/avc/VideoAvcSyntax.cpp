// The parsers of parameter sets and slice headers.

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>

#include "avc/BitStreamReader.h"
#include "avc/PictureParameterSet.h"
#include "avc/SequenceParameterSet.h"
#include "avc/SliceHeader.h"
#include "avc/VideoAvcParser.h"
#include "avc/rbsp.h"

namespace {

using zolt::kSliceB;
using zolt::kSliceI;
using zolt::kSliceP;
using zolt::kSliceSi;
using zolt::kSliceSp;
using zolt::read_log2_field;
using zolt::read_ue;

constexpr int kHeaderBits = 8;  // of the NAL unit header byte
constexpr std::int64_t kMaxSizeInMbs = 65535;

// What the diagnostic lines of a slice tell. Bit positions count from the byte behind the header.
struct SliceDiagnostics {
    std::array<unsigned char, 3> last_bytes = {};
    long long num_bits = 0;
    int trailing_bits = 0;
    int nal_ref_idc = 0;
    int nal_unit_type = 0;
    bool is_cabac = false;
    bool is_intra = false;
    std::int64_t slice_qp_delta = 0;
    long slice_data_pos = 0;
    long skip_run_pos = 0;
    std::uint64_t mb_skip_run = 0;
    std::int64_t num_mbs = 0;
    long mb_type_pos = 0;
    std::uint64_t mb_type = 0;
    long end_pos = 0;
};

// Macroblocks of a dimension, 0 for one that no picture has.
int size_in_mbs(std::uint32_t size_minus1) {
    const std::int64_t size = static_cast<std::int64_t>(size_minus1) + 1;
    return size <= kMaxSizeInMbs ? static_cast<int>(size) : 0;
}

// What can be said of a NAL unit (header byte first) without reading its syntax.
SliceDiagnostics describe_nal(const unsigned char* nal, int size) {
    const int header_byte = size > 0 ? nal[0] : 0;
    SliceDiagnostics found;
    found.num_bits = 8LL * std::max(size, 0);
    found.nal_ref_idc = header_byte >> 5 & 3;
    found.nal_unit_type = header_byte & 31;
    const int num_last = std::clamp(size, 0, 3);
    std::copy_n(nal + std::max(size, 0) - num_last, num_last, found.last_bytes.end() - num_last);
    // rbsp_trailing_bits: the stop bit and the zeros behind it.
    found.trailing_bits = 1;
    while (found.trailing_bits < 8 && !(found.last_bytes.back() >> (found.trailing_bits - 1) & 1)) {
        ++found.trailing_bits;
    }
    return found;
}

// The part of clause 7.3.3 that depends on the picture parameter set, up to slice_qp_delta.
void read_header_rest(BitStreamReader& reader, const VideoAvcSeqParSet& sps,
                      const VideoAvcPicParSet& pps, bool is_field, std::uint32_t slice_type,
                      VideoAvcSliceHeader& header, SliceDiagnostics& found) {
    const bool has_bottom_delta = pps.pic_order_present_flag != 0 && !is_field;
    if (sps.pic_order_cnt_type == 0) {
        header.pic_order_cnt_lsb = read_log2_field(reader, sps.log2_max_pic_order_cnt_lsb_minus4);
        if (has_bottom_delta) {
            reader.SkipSignedExpGolomb();  // delta_pic_order_cnt_bottom
        }
    } else if (sps.pic_order_cnt_type == 1 && sps.delta_pic_order_always_zero_flag == 0) {
        reader.SkipSignedExpGolomb();  // delta_pic_order_cnt[0]
        if (has_bottom_delta) {
            reader.SkipSignedExpGolomb();  // delta_pic_order_cnt[1]
        }
    }
    if (slice_type == kSliceB) {
        reader.SkipBoolean();  // direct_spatial_mv_pred_flag
    }
    if (slice_type == kSliceP || slice_type == kSliceB || slice_type == kSliceSp) {
        if (reader.ReadBoolean()) {  // num_ref_idx_active_override_flag
            reader.SkipExpGolomb();  // num_ref_idx_l0_active_minus1
            if (slice_type == kSliceB) {
                reader.SkipExpGolomb();  // num_ref_idx_l1_active_minus1
            }
        }
    }
    if (!found.is_intra) {
        reader.SkipBoolean();  // ref_pic_list_modification_flag_l0
    }
    if (found.nal_unit_type == 5) {
        reader.SkipBoolean();  // no_output_of_prior_pics_flag
    }
    reader.SkipBoolean();  // long_term_reference_flag or adaptive_ref_pic_marking_mode_flag
    if (found.is_cabac && !found.is_intra) {
        reader.SkipExpGolomb();  // cabac_init_idc
    }
}

// From slice_qp_delta to the first mb_type of the slice data.
void read_slice_start(BitStreamReader& reader, SliceDiagnostics& found) {
    found.slice_qp_delta = reader.ReadSignedExpGolomb();
    found.slice_data_pos = reader.GetBitPos();
    if (found.is_cabac) {
        reader.AlignNextByte();
    }
    if (!found.is_intra) {
        found.skip_run_pos = reader.GetBitPos();
        found.mb_skip_run = reader.ReadExpGolomb();
    }
    found.mb_type_pos = reader.GetBitPos();
    found.mb_type = reader.ReadExpGolomb();
    found.end_pos = reader.GetBitPos();
}

void print_binary(std::FILE* output, unsigned byte) {
    for (int bit = 7; bit >= 0; --bit) {
        std::fputs(byte >> bit & 1U ? "1" : "0", output);
        if (bit == 4) {
            std::fputs(".", output);
        }
    }
}

void print_nal_lines(std::FILE* output, const SliceDiagnostics& found,
                     const VideoAvcSliceHeader& header) {
    std::fprintf(output, "Number of bits = %lld\n", found.num_bits);
    std::fputs("Last byte = ", output);
    print_binary(output, found.last_bytes.back());
    std::fprintf(output, "\nNumber of trailing bits = %d\n", found.trailing_bits);
    std::fprintf(output, "nal_ref_idc       = %d\n", found.nal_ref_idc);
    std::fprintf(output, "nal_unit_type     = %d\n", found.nal_unit_type);
    std::fprintf(output, "frame_num         = %u\n", unsigned{header.frame_num});
}

void print_slice_lines(std::FILE* output, const SliceDiagnostics& found) {
    std::fprintf(output, "slice_qp_delta    = %lld\n",
                 static_cast<long long>(found.slice_qp_delta));
    std::fprintf(output, "slice_data() bit pos = %ld\n", found.slice_data_pos);
    if (!found.is_intra && !found.is_cabac) {
        std::fprintf(output, "Current bit pos = %ld\n", found.skip_run_pos);
        std::fprintf(output, "mb_skip_run       = %5llu (total = %5lld)\n",
                     static_cast<unsigned long long>(found.mb_skip_run),
                     static_cast<long long>(found.num_mbs));
        std::fprintf(output, "Current bit pos = %ld\n", found.mb_type_pos);
    }
    std::fprintf(output, "mb_type    = %llu\n", static_cast<unsigned long long>(found.mb_type));
    std::fprintf(output, "Current bit pos = %ld\n", found.end_pos);
    std::fputs("Last 3 bytes =", output);
    for (const unsigned char byte : found.last_bytes) {
        std::fputs(" ", output);
        print_binary(output, byte);
    }
    std::fprintf(output, "\nCurrent bit pos = %ld (%lld remaining)\n", found.end_pos,
                 found.num_bits - found.end_pos - found.trailing_bits - kHeaderBits);
}

}  // namespace

void VideoAvcParser::ParseSeqParSet(const unsigned char* nal, int size, VideoAvcSeqParSet* set) {
    // More than the fields of any valid set take, and a bound for what a damaged one costs.
    constexpr int kMaxBytes = 8192;
    const auto from = zolt::SequenceParameterSet::read(zolt::rbsp_bytes(nal, size, kMaxBytes));
    set->profile_idc = from.profile_idc;
    set->level_idc = from.level_idc;
    set->seq_parameter_set_id = from.seq_parameter_set_id;
    set->log2_max_frame_num_minus4 = from.log2_max_frame_num_minus4;
    set->pic_order_cnt_type = from.pic_order_cnt_type;
    set->log2_max_pic_order_cnt_lsb_minus4 = from.log2_max_pic_order_cnt_lsb_minus4;
    set->delta_pic_order_always_zero_flag = from.delta_pic_order_always_zero_flag;
    set->num_ref_frames = from.max_num_ref_frames;
    set->gaps_in_frame_num_value_allowed_flag = from.gaps_in_frame_num_value_allowed_flag;
    set->pic_width_in_mbs_minus1 = from.pic_width_in_mbs_minus1;
    set->pic_height_in_map_units_minus1 = from.pic_height_in_map_units_minus1;
    set->frame_mbs_only_flag = from.frame_mbs_only_flag;
}

void VideoAvcParser::ParseSeqParSet(const unsigned char* nal, int size, int* picWidth,
                                    int* picHeight) {
    VideoAvcSeqParSet set;
    ParseSeqParSet(nal, size, &set);
    *picWidth = size_in_mbs(set.pic_width_in_mbs_minus1) * 16;
    *picHeight = size_in_mbs(set.pic_height_in_map_units_minus1) * 16;
}

void VideoAvcParser::ParsePicParSet(const unsigned char* bytes, int size, VideoAvcPicParSet* set) {
    const auto from = zolt::PictureParameterSet::read(bytes, size);
    set->pic_parameter_set_id = from.pic_parameter_set_id;
    set->seq_parameter_set_id = from.seq_parameter_set_id;
    set->entropy_coding_mode_flag = from.entropy_coding_mode_flag;
    set->pic_order_present_flag = from.bottom_field_pic_order_in_frame_present_flag;
    set->num_slice_groups_minus1 = from.num_slice_groups_minus1;
}

void VideoAvcParser::ParseSliceHeader(const unsigned char* nal, int size,
                                      const VideoAvcSeqParSet* sps, const VideoAvcPicParSet* pps,
                                      VideoAvcSliceHeader* header, std::FILE* output) {
    SliceDiagnostics found = describe_nal(nal, size);
    *header = {};
    BitStreamReader reader(size > 1 ? nal + 1 : nullptr, size - 1);
    header->first_mb_in_slice = read_ue(reader);
    header->slice_type = read_ue(reader);
    header->pic_parameter_set_id = read_ue(reader);
    header->frame_num = read_log2_field(reader, sps->log2_max_frame_num_minus4);
    bool is_field = false;
    if (sps->frame_mbs_only_flag == 0) {
        is_field = reader.ReadBoolean();
        if (is_field) {
            reader.SkipBoolean();  // bottom_field_flag
        }
    }
    if (found.nal_unit_type == 5) {
        header->idr_pic_id = read_ue(reader);
    }
    if (output != nullptr) {
        print_nal_lines(output, found, *header);
    }
    if (pps == nullptr) {
        return;
    }

    const std::uint32_t slice_type = header->slice_type % 5;
    found.is_intra = slice_type == kSliceI || slice_type == kSliceSi;
    found.is_cabac = pps->entropy_coding_mode_flag != 0;
    const int rows_per_map_unit = sps->frame_mbs_only_flag != 0 || is_field ? 1 : 2;
    found.num_mbs = static_cast<std::int64_t>(size_in_mbs(sps->pic_width_in_mbs_minus1)) *
                    size_in_mbs(sps->pic_height_in_map_units_minus1) * rows_per_map_unit;
    read_header_rest(reader, *sps, *pps, is_field, slice_type, *header, found);
    read_slice_start(reader, found);
    if (output != nullptr) {
        if (sps->pic_order_cnt_type == 0) {
            std::fprintf(output, "pic_order_cnt_lsb = %u\n", unsigned{header->pic_order_cnt_lsb});
        }
        print_slice_lines(output, found);
    }
}

void VideoAvcParser::ParseSliceHeader(const unsigned char* nal, int size,
                                      const VideoAvcSeqParSet* sps, VideoAvcSliceHeader* header,
                                      std::FILE* output) {
    ParseSliceHeader(nal, size, sps, nullptr, header, output);
}
