#pragma once

#include <array>
#include <cstdint>
#include <optional>

#include "avc/ParameterSets.h"

namespace zolt {

// slice_type modulo 5, table 7-6.
enum SliceType : std::uint32_t { kSliceP, kSliceB, kSliceI, kSliceSp, kSliceSi };

// A slice header up to slice_qp_delta, named as in clause 7.3.3; elements that a slice lacks have
// their inferred values.
struct SliceHeader {
    int nal_ref_idc = 0;
    bool is_idr = false;
    std::uint64_t first_mb_in_slice = 0;
    std::uint64_t slice_type = 0;  // a SliceType
    std::uint64_t pic_parameter_set_id = 0;

    // False when the slice refers to a parameter set that is missing, is cut off, or is damaged:
    // what follows is then not known.
    bool is_complete = false;
    std::uint32_t frame_num = 0;
    bool field_pic = false;
    bool bottom_field = false;
    std::uint64_t idr_pic_id = 0;
    std::optional<std::uint32_t> pic_order_cnt_lsb;            // of pic_order_cnt_type 0 only
    std::array<std::int64_t, 2> delta_pic_order_cnt = {0, 0};  // the bottom one of type 0 at [1]
    std::uint64_t redundant_pic_cnt = 0;
    std::int64_t slice_qp = 0;  // SliceQPY

    // Reads a slice NAL unit, header byte first; nothing for one without even a slice type.
    static std::optional<SliceHeader> read(const unsigned char* nal, int size,
                                           const ParameterSets& sets);

    // Whether this slice and `previous`, the one before it in the stream, belong to different
    // pictures (clause 7.4.1.2.4).
    bool starts_picture_after(const SliceHeader& previous) const;
};

}  // namespace zolt
