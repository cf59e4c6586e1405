#include "avc/SequenceParameterSet.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <vector>

#include "avc/BitStreamWriter.h"

namespace {

using zolt::BitStreamWriter;
using zolt::SequenceParameterSet;
using Bytes = std::vector<unsigned char>;

// Every field that can occur in one set, each with a value of its own, and where the data must
// reach for the set to be valid and to be complete.
TEST(SequenceParameterSet, HoldsEveryField) {
    BitStreamWriter bits;
    bits.u(8, 0x67).u(8, 244).u(8, 0x5c).u(8, 41).ue(17);
    bits.ue(3).u(1, 1).ue(5).ue(6).u(1, 1).u(1, 1);
    std::vector<std::vector<std::int64_t>> lists(12);
    lists[0] = std::vector<std::int64_t>(16, 3);
    lists[5] = {-8};
    lists[11] = std::vector<std::int64_t>(8, -1);  // the eighth of them ends the list
    for (const std::vector<std::int64_t>& list : lists) {
        bits.u(1, !list.empty());
        for (const std::int64_t delta : list) {
            bits.se(delta);
        }
    }
    bits.ue(11).ue(1).u(1, 1).se(-70000).se(8).ue(3).se(2).se(-3).se(4);
    bits.ue(9).u(1, 1).ue(119).ue(33).u(1, 0);
    const long end_of_slice_fields = bits.num_bits();
    bits.u(1, 1).u(1, 1).u(1, 1).ue(12).ue(13).ue(14).ue(15).u(1, 1);
    const long end_of_fields = bits.num_bits();
    const Bytes whole = bits.u(20, 0).trailing().bytes();

    const SequenceParameterSet set = SequenceParameterSet::read(whole);
    EXPECT_EQ(set.profile_idc, 244U);
    EXPECT_EQ(set.constraint_set_flags, 0x5cU);
    EXPECT_EQ(set.level_idc, 41U);
    EXPECT_EQ(set.seq_parameter_set_id, 17U);
    EXPECT_EQ(set.chroma_format_idc, 3U);
    EXPECT_TRUE(set.separate_colour_plane_flag);
    EXPECT_EQ(set.chroma_array_type(), 0U);
    EXPECT_EQ(set.bit_depth_luma_minus8, 5U);
    EXPECT_EQ(set.bit_depth_chroma_minus8, 6U);
    EXPECT_TRUE(set.qpprime_y_zero_transform_bypass_flag);
    EXPECT_TRUE(set.seq_scaling_matrix_present_flag);
    for (std::size_t i = 0; i < lists.size(); ++i) {
        EXPECT_EQ(set.delta_scale[i], lists[i]) << i;
    }
    EXPECT_EQ(set.log2_max_frame_num_minus4, 11U);
    EXPECT_EQ(set.pic_order_cnt_type, 1U);
    EXPECT_TRUE(set.delta_pic_order_always_zero_flag);
    EXPECT_EQ(set.offset_for_non_ref_pic, -70000);
    EXPECT_EQ(set.offset_for_top_to_bottom_field, 8);
    EXPECT_EQ(set.offset_for_ref_frame, (std::vector<std::int64_t>{2, -3, 4}));
    EXPECT_EQ(set.max_num_ref_frames, 9U);
    EXPECT_TRUE(set.gaps_in_frame_num_value_allowed_flag);
    EXPECT_EQ(set.pic_width_in_mbs_minus1, 119U);
    EXPECT_EQ(set.pic_height_in_map_units_minus1, 33U);
    EXPECT_FALSE(set.frame_mbs_only_flag);
    EXPECT_TRUE(set.mb_adaptive_frame_field_flag);
    EXPECT_TRUE(set.direct_8x8_inference_flag);
    EXPECT_TRUE(set.frame_cropping_flag);
    EXPECT_EQ(set.frame_crop_left_offset, 12U);
    EXPECT_EQ(set.frame_crop_right_offset, 13U);
    EXPECT_EQ(set.frame_crop_top_offset, 14U);
    EXPECT_EQ(set.frame_crop_bottom_offset, 15U);
    EXPECT_TRUE(set.vui_parameters_present_flag);

    for (std::size_t size = 0; size <= whole.size(); ++size) {
        // An exact copy, so that a read behind it is seen.
        const Bytes cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size));
        const SequenceParameterSet part = SequenceParameterSet::read(cut);
        const long num_bits = static_cast<long>(size) * 8;
        EXPECT_EQ(part.is_valid, num_bits > end_of_slice_fields) << size;
        EXPECT_EQ(part.is_complete, num_bits > end_of_fields) << size;
    }
}

// More offsets than the standard allows are passed over: the fields behind them are found, but the
// set cannot be written again from its record.
TEST(SequenceParameterSet, HoldsNoMoreOffsetsThanAValidSetHas) {
    for (const unsigned count : {255U, 256U, 3000U}) {
        BitStreamWriter bits;
        bits.u(8, 0x67).u(8, 77).u(8, 0).u(8, 31).ue(0).ue(0).ue(1).u(1, 0).se(0).se(0).ue(count);
        for (unsigned i = 0; i < count; ++i) {
            bits.se(-static_cast<int>(i));
        }
        bits.ue(1).u(1, 0).ue(21).ue(17).u(1, 1).u(3, 0);
        const SequenceParameterSet set = SequenceParameterSet::read(bits.trailing().bytes());
        EXPECT_TRUE(set.is_valid);
        EXPECT_EQ(set.is_complete, count == 255);
        EXPECT_EQ(set.num_ref_frames_in_pic_order_cnt_cycle, count);
        ASSERT_EQ(set.offset_for_ref_frame.size(), 255U);
        EXPECT_EQ(set.offset_for_ref_frame.back(), -254);
        EXPECT_EQ(set.pic_width_in_mbs_minus1, 21U);
    }
}

}  // namespace
