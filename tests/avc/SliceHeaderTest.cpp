#include "avc/SliceHeader.h"

#include <gtest/gtest.h>

#include <optional>
#include <vector>

#include "avc/ParameterSets.h"
#include "avc/VideoAvcParser.h"
#include "units.h"

namespace {

using zolt::BitStreamWriter;
using zolt::idr_slice;
using zolt::ParameterSets;
using zolt::pic_par_set;
using zolt::PicParSetFields;
using zolt::seq_par_set;
using zolt::SliceHeader;
using Bytes = std::vector<unsigned char>;

void add_set(ParameterSets& sets, const BitStreamWriter& bits) {
    const Bytes nal = bits.escaped();
    if (VideoAvcParser::GetNaluType(nal.data()) == 7) {
        sets.add_seq_par_set(nal.data(), static_cast<int>(nal.size()));
    } else {
        sets.add_pic_par_set(nal.data(), static_cast<int>(nal.size()));
    }
}

std::optional<SliceHeader> header_of(const ParameterSets& sets, const BitStreamWriter& bits) {
    const Bytes nal = bits.escaped();
    return SliceHeader::read(nal.data(), static_cast<int>(nal.size()), sets);
}

TEST(SliceHeader, ReadsHeadersOfEveryPicParSet) {
    for (const int slice_group_type : {-1, 0, 1, 2, 4, 6}) {
        ParameterSets sets;
        add_set(sets, seq_par_set(3, true));
        PicParSetFields fields;
        fields.id = 200;
        fields.seq_par_set_id = 3;
        fields.slice_group_type = slice_group_type;
        add_set(sets, pic_par_set(fields));
        const std::optional<SliceHeader> header = header_of(sets, idr_slice(200, 1));
        ASSERT_TRUE(header && header->is_complete) << slice_group_type;
        EXPECT_EQ(header->slice_qp, 27) << slice_group_type;
    }
}

// Every optional part of a slice header at once, for P and B slices, with runs of zeros that need
// emulation prevention.
TEST(SliceHeader, ReadsWholeSliceHeaders) {
    for (const bool is_b : {false, true}) {
        for (const bool is_cabac : {false, true}) {
            ParameterSets sets;
            PicParSetFields fields;
            fields.is_cabac = is_cabac;
            fields.weighted_pred = true;
            fields.weighted_bipred_idc = 1;
            fields.redundant_pic_cnt_present = true;
            add_set(sets, seq_par_set(0, false, false));
            add_set(sets, pic_par_set(fields));

            BitStreamWriter bits;
            bits.u(8, 0x61).ue(0).ue(is_b ? 6 : 0).ue(0).u(16, 0).u(1, 0).u(16, 2).se(0).ue(0);
            bits.u(is_b ? 1 : 0, 1);
            bits.u(1, 1).ue(1);  // two entries in list 0, one in list 1
            if (is_b) {
                bits.ue(0);
            }
            bits.u(1, 1).ue(0).ue(70000).ue(1).ue(0).ue(2).ue(4).ue(3);  // modification
            if (is_b) {
                bits.u(1, 0);
            }
            bits.ue(5).ue(4);
            bits.u(1, 1).se(-128).se(127).u(1, 0).u(1, 0).u(1, 1).se(1).se(2).se(3).se(4);
            if (is_b) {
                bits.u(1, 1).se(7).se(-7).u(1, 0);
            }
            bits.u(1, 1).ue(1).ue(9).ue(2).ue(1);  // marking; operation 3 has two operands
            bits.ue(3).ue(5).ue(9).ue(4).ue(2).ue(5).ue(6).ue(0).ue(0);
            if (is_cabac) {
                bits.ue(2);
            }
            bits.se(-9).u(16, 0xffff).trailing();
            ASSERT_NE(bits.bytes(), bits.escaped());

            const std::optional<SliceHeader> header = header_of(sets, bits);
            ASSERT_TRUE(header && header->is_complete);
            EXPECT_EQ(header->slice_type, is_b ? 1U : 0U);
            EXPECT_EQ(header->frame_num, 0U);
            EXPECT_EQ(header->pic_order_cnt_lsb, 2U);
            EXPECT_EQ(header->slice_qp, 14);
        }
    }
}

TEST(SliceHeader, FollowsParameterSetsByTheirIdentifiers) {
    ParameterSets sets;
    add_set(sets, seq_par_set(0, true));
    add_set(sets, seq_par_set(31, true, true));
    PicParSetFields fields;
    add_set(sets, pic_par_set(fields));
    fields.id = 255;
    fields.seq_par_set_id = 31;
    add_set(sets, pic_par_set(fields));

    EXPECT_TRUE(header_of(sets, idr_slice(0, 0))->is_complete);
    BitStreamWriter bits;  // with colour_plane_id
    bits.u(8, 0x65).ue(0).ue(7).ue(255).u(2, 1).u(16, 9).ue(0).u(16, 0).se(0).u(2, 0).se(4);
    const std::optional<SliceHeader> header = header_of(sets, bits.u(8, 0xff).trailing());
    EXPECT_TRUE(header->is_complete);
    EXPECT_EQ(header->frame_num, 9U);
    EXPECT_FALSE(header_of(sets, idr_slice(7, 0))->is_complete);
}

TEST(SliceHeader, MarksDamagedHeaders) {
    ParameterSets sets;
    add_set(sets, seq_par_set(0, true));
    add_set(sets, pic_par_set({}));
    const Bytes whole = idr_slice(0, 0).escaped();
    for (int size = 0; size < 8; ++size) {
        // An exact copy, so that a read behind it is seen.
        const Bytes cut(whole.begin(), whole.begin() + size);
        const std::optional<SliceHeader> header = SliceHeader::read(cut.data(), size, sets);
        EXPECT_FALSE(header && header->is_complete) << size;
        EXPECT_EQ(header.has_value(), size > 2) << size;
    }
    BitStreamWriter bad_type;
    bad_type.u(8, 0x65).ue(0).ue(10).ue(0).u(32, 1);
    EXPECT_FALSE(header_of(sets, bad_type));
    BitStreamWriter endless_modification;
    endless_modification.u(8, 0x41).ue(0).ue(0).ue(0).u(16, 1).u(16, 1).se(0).u(1, 0).u(1, 1);
    for (int i = 0; i < 200; ++i) {
        endless_modification.ue(0).ue(0);
    }
    EXPECT_FALSE(header_of(sets, endless_modification.trailing())->is_complete);

    // A set that announces four billion slice groups costs no more than its bytes.
    BitStreamWriter many_groups;
    many_groups.u(8, 0x68).ue(1).ue(0).u(2, 0).ue(2).ue(6).ue(0xfffffffe).u(43, 0x155555);
    add_set(sets, many_groups);

    // A damaged set does not replace a good one.
    BitStreamWriter bad_set;
    bad_set.u(8, 0x67).u(8, 77).u(8, 0).u(8, 31).ue(0).ue(13).ue(0).ue(0).u(32, ~0U);
    add_set(sets, bad_set);
    EXPECT_TRUE(header_of(sets, idr_slice(0, 0))->is_complete);
}

}  // namespace
