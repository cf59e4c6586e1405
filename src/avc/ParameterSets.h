#pragma once

#include <array>
#include <cstdint>
#include <optional>

namespace zolt {

// What a slice header's syntax depends on, of a sequence parameter set (clause 7.3.2.1).
struct SeqParSet {
    std::uint64_t id = 0;
    std::uint64_t chroma_format_idc = 1;
    bool separate_colour_planes = false;
    int frame_num_bits = 4;
    std::uint64_t pic_order_cnt_type = 0;
    int pic_order_cnt_lsb_bits = 4;
    bool delta_pic_order_always_zero = false;
    bool frame_mbs_only = true;

    // ChromaArrayType
    std::uint64_t chroma_array_type() const {
        return separate_colour_planes ? 0 : chroma_format_idc;
    }
};

// The same of a picture parameter set (clause 7.3.2.2).
struct PicParSet {
    std::uint64_t id = 0;
    std::uint64_t seq_par_set_id = 0;
    bool is_cabac = false;
    bool bottom_field_pic_order_in_frame_present = false;
    std::array<std::uint64_t, 2> num_ref_idx_default_active = {1, 1};  // lists 0 and 1
    bool weighted_pred = false;
    std::uint64_t weighted_bipred_idc = 0;
    std::int64_t pic_init_qp = 26;
    bool redundant_pic_cnt_present = false;
};

// The parameter sets of a stream as they stand at some unit: the last one of each identifier.
class ParameterSets {
public:
    // Take a parameter set NAL unit, header byte first. One that is cut off or has values that the
    // standard does not allow is left out, and whatever had its identifier stays.
    void add_seq_par_set(const unsigned char* nal, int size);
    void add_pic_par_set(const unsigned char* nal, int size);

    // Null when there is none of that identifier.
    const SeqParSet* seq_par_set(std::uint64_t id) const;
    const PicParSet* pic_par_set(std::uint64_t id) const;

private:
    std::array<std::optional<SeqParSet>, 32> seq_par_sets_;
    std::array<std::optional<PicParSet>, 256> pic_par_sets_;
};

}  // namespace zolt
