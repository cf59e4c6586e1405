#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "BitWriter.h"
#include "avcdump/RowFormat.h"
#include "avcdump/UnitLister.h"

namespace {

using zolt::BitWriter;
using zolt::FrameRate;
using zolt::RowFormat;
using zolt::UnitLister;
using zolt::UnitRow;
using Bytes = std::vector<unsigned char>;

Bytes unit_of(const BitWriter& bits) {
    Bytes unit = {0, 0, 1};
    const Bytes nal = bits.escaped();
    unit.insert(unit.end(), nal.begin(), nal.end());
    return unit;
}

UnitRow add(UnitLister& lister, const BitWriter& bits) {
    const Bytes unit = unit_of(bits);
    return lister.add(unit.data(), static_cast<int>(unit.size()));
}

// A sequence parameter set with 16-bit frame_num and pic_order_cnt_lsb.
BitWriter seq_par_set(unsigned id, bool frame_mbs_only, bool is_444 = false) {
    BitWriter bits;
    bits.u(8, 0x67).u(8, is_444 ? 244 : 77).u(8, 0).u(8, 31).ue(id);
    if (is_444) {
        bits.ue(3).u(1, 1).ue(0).ue(0).u(1, 0).u(1, 1).u(1, 1).se(5).se(-13).u(11, 0);
    }
    bits.ue(12).ue(0).ue(12).ue(1).u(1, 0).ue(10).ue(8).u(1, frame_mbs_only);
    return bits.u(frame_mbs_only ? 3 : 4, 0).trailing();
}

struct PicParSetFields {
    unsigned id = 0;
    unsigned seq_par_set_id = 0;
    bool is_cabac = false;
    int slice_group_type = -1;  // none
    bool weighted_pred = false;
    unsigned weighted_bipred_idc = 0;
    bool redundant_pic_cnt_present = false;
};

BitWriter pic_par_set(const PicParSetFields& fields) {
    BitWriter bits;
    bits.u(8, 0x68).ue(fields.id).ue(fields.seq_par_set_id).u(1, fields.is_cabac).u(1, 1);
    bits.ue(fields.slice_group_type < 0 ? 0 : 2);
    if (fields.slice_group_type >= 0) {
        bits.ue(static_cast<unsigned>(fields.slice_group_type));
    }
    switch (fields.slice_group_type) {
        case 0:
            bits.ue(4).ue(5).ue(600);
            break;
        case 2:
            bits.ue(0).ue(9).ue(3).ue(44);
            break;
        case 4:
            bits.u(1, 1).ue(40);
            break;
        case 6:
            bits.ue(98);
            for (int unit = 0; unit < 99; ++unit) {
                bits.u(2, static_cast<unsigned>(unit) % 3);
            }
            break;
        default:
            break;
    }
    bits.ue(2).ue(1).u(1, fields.weighted_pred).u(2, fields.weighted_bipred_idc);
    bits.se(-3).se(0).se(2).u(1, 1).u(1, 0).u(1, fields.redundant_pic_cnt_present);
    return bits.trailing();
}

// An IDR slice of the parameter sets above, up to and with the data behind slice_qp_delta.
BitWriter idr_slice(unsigned set_id, unsigned idr_pic_id, unsigned first_mb = 0) {
    BitWriter bits;
    bits.u(8, 0x65).ue(first_mb).ue(7).ue(set_id).u(16, 0).ue(idr_pic_id).u(16, 0).se(0);
    return bits.u(2, 0).se(4).u(20, 0xabcde).trailing();
}

TEST(Avcdump, ReadsHeadersOfEveryPicParSet) {
    for (const int slice_group_type : {-1, 0, 1, 2, 4, 6}) {
        UnitLister lister(FrameRate{25, 1});
        add(lister, seq_par_set(3, true));
        PicParSetFields fields;
        fields.id = 200;
        fields.seq_par_set_id = 3;
        fields.slice_group_type = slice_group_type;
        add(lister, pic_par_set(fields));
        const UnitRow row = add(lister, idr_slice(200, 1));
        ASSERT_TRUE(row.header && row.header->is_complete) << slice_group_type;
        EXPECT_EQ(row.header->slice_qp, 27) << slice_group_type;
    }
}

// Every optional part of a slice header at once, for P and B slices, with runs of zeros that need
// emulation prevention.
TEST(Avcdump, ReadsWholeSliceHeaders) {
    for (const bool is_b : {false, true}) {
        for (const bool is_cabac : {false, true}) {
            UnitLister lister(FrameRate{25, 1});
            PicParSetFields fields;
            fields.is_cabac = is_cabac;
            fields.weighted_pred = true;
            fields.weighted_bipred_idc = 1;
            fields.redundant_pic_cnt_present = true;
            add(lister, seq_par_set(0, false, false));
            add(lister, pic_par_set(fields));

            BitWriter bits;
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

            const UnitRow row = add(lister, bits);
            ASSERT_TRUE(row.header && row.header->is_complete);
            EXPECT_EQ(row.header->slice_type, is_b ? 1U : 0U);
            EXPECT_EQ(row.header->frame_num, 0U);
            EXPECT_EQ(row.header->pic_order_cnt_lsb, 2U);
            EXPECT_EQ(row.header->slice_qp, 14);
        }
    }
}

TEST(Avcdump, FollowsParameterSetsByTheirIdentifiers) {
    UnitLister lister(FrameRate{25, 1});
    add(lister, seq_par_set(0, true));
    add(lister, seq_par_set(31, true, true));
    PicParSetFields fields;
    add(lister, pic_par_set(fields));
    fields.id = 255;
    fields.seq_par_set_id = 31;
    add(lister, pic_par_set(fields));

    EXPECT_TRUE(add(lister, idr_slice(0, 0)).header->is_complete);
    BitWriter bits;  // with colour_plane_id
    bits.u(8, 0x65).ue(0).ue(7).ue(255).u(2, 1).u(16, 9).ue(0).u(16, 0).se(0).u(2, 0).se(4);
    const UnitRow row = add(lister, bits.u(8, 0xff).trailing());
    EXPECT_TRUE(row.header->is_complete);
    EXPECT_EQ(row.header->frame_num, 9U);
    EXPECT_FALSE(add(lister, idr_slice(7, 0)).header->is_complete);
}

TEST(Avcdump, MarksDamagedHeaders) {
    UnitLister lister(FrameRate{25, 1});
    add(lister, seq_par_set(0, true));
    add(lister, pic_par_set({}));
    const Bytes whole = unit_of(idr_slice(0, 0));
    for (int size = 0; size < 11; ++size) {
        // An exact copy, so that a read behind it is seen.
        const Bytes cut(whole.begin(), whole.begin() + size);
        const UnitRow row = lister.add(cut.data(), size);
        EXPECT_FALSE(row.header && row.header->is_complete) << size;
        EXPECT_EQ(row.header.has_value(), size > 5) << size;
    }
    BitWriter bad_type;
    bad_type.u(8, 0x65).ue(0).ue(10).ue(0).u(32, 1);
    EXPECT_FALSE(add(lister, bad_type).header);
    BitWriter endless_modification;
    endless_modification.u(8, 0x41).ue(0).ue(0).ue(0).u(16, 1).u(16, 1).se(0).u(1, 0).u(1, 1);
    for (int i = 0; i < 200; ++i) {
        endless_modification.ue(0).ue(0);
    }
    EXPECT_FALSE(add(lister, endless_modification.trailing()).header->is_complete);

    // A set that announces four billion slice groups costs no more than its bytes.
    BitWriter many_groups;
    many_groups.u(8, 0x68).ue(1).ue(0).u(2, 0).ue(2).ue(6).ue(0xfffffffe).u(43, 0x155555);
    add(lister, many_groups);

    // A damaged set does not replace a good one.
    BitWriter bad_set;
    bad_set.u(8, 0x67).u(8, 77).u(8, 0).u(8, 31).ue(0).ue(13).ue(0).ue(0).u(32, ~0U);
    add(lister, bad_set);
    EXPECT_TRUE(add(lister, idr_slice(0, 0)).header->is_complete);
}

TEST(Avcdump, CountsPicturesAndTheirTimes) {
    UnitLister lister(FrameRate{25, 1});
    const Bytes aud = {0, 0, 1, 9, 0x10};
    const auto check = [](const UnitRow& row, std::int64_t picture, std::int64_t time) {
        EXPECT_EQ(row.picture, picture);
        EXPECT_EQ(row.time, time);
    };
    check(add(lister, seq_par_set(0, false)), 0, 0);
    check(add(lister, pic_par_set({})), 0, 0);
    EXPECT_FALSE(lister.summary().kbits_per_second);

    // Frames: field_pic_flag is 0 before idr_pic_id.
    const auto idr = [](unsigned first_mb, unsigned idr_pic_id) {
        BitWriter bits;
        bits.u(8, 0x65).ue(first_mb).ue(7).ue(0).u(16, 0).u(1, 0).ue(idr_pic_id).u(16, 0).se(0);
        return bits.u(2, 0).se(4).u(20, 0xabcde).trailing();
    };
    const auto field = [](bool is_bottom) {
        BitWriter bits;
        bits.u(8, 0x61).ue(0).ue(7).ue(0).u(16, 1).u(1, 1).u(1, is_bottom).u(16, 2);
        return bits.u(1, 0).se(0).u(20, 0xabcde).trailing();
    };
    check(add(lister, idr(0, 0)), 0, 0);
    check(add(lister, idr(50, 0)), 0, 0);
    check(add(lister, idr(0, 1)), 1, 40000);
    check(lister.add(aud.data(), 5), 2, 80000);
    check(add(lister, idr(0, 1)), 2, 80000);  // same values, but an access unit delimiter between
    check(add(lister, field(false)), 3, 120000);
    check(add(lister, field(true)), 4, 140000);
    const Bytes end_of_stream = {0, 0, 1, 11};
    check(lister.add(end_of_stream.data(), 4), 4, 140000);

    const zolt::StreamSummary summary = lister.summary();
    EXPECT_EQ(summary.units, 10);
    EXPECT_EQ(summary.pictures, 5);
    EXPECT_EQ(summary.idr_pictures, 3);
    EXPECT_DOUBLE_EQ(summary.kbits_per_second.value(),
                     static_cast<double>(summary.bytes) * 8 / 160.0);
}

TEST(Avcdump, WritesEachFormat) {
    UnitLister lister(FrameRate{30000, 1001});
    const std::vector<UnitRow> rows = {add(lister, seq_par_set(0, true)),
                                       add(lister, pic_par_set({})), add(lister, idr_slice(0, 6)),
                                       add(lister, idr_slice(1, 7))};
    const auto text_of = [&](RowFormat& format) {
        std::string text = format.head();
        for (const UnitRow& row : rows) {
            text += format.row(row);
        }
        return text + format.tail(lister.summary());
    };
    EXPECT_EQ(text_of(*RowFormat::csv()),
              "offset,size,type,type_name,picture,time_us,sync,first_mb,slice_type,frame_num,"
              "idr_pic_id,pic_order_cnt_lsb,qp\n"
              "0,12,7,SPS,0,0,0,,,,,,\n"
              "12,8,8,PPS,0,0,0,,,,,,\n"
              "20,14,5,IDR slice,0,0,1,0,I,0,6,0,27\n"
              "34,15,5,IDR slice,1,33366,1,0,I,,,,\n");
    EXPECT_EQ(
        text_of(*RowFormat::table()),
        "    OFFSET     SIZE TYPE               PICTURE         TIME SYNC FIRST_MB SLICE FRAME_NUM"
        " IDR_PIC_ID POC_LSB  QP\n"
        "         0       12  7 SPS                   0     0.000000 -           - -             -"
        "          -       -   -\n"
        "        12        8  8 PPS                   0     0.000000 -           - -             -"
        "          -       -   -\n"
        "        20       14  5 IDR slice             0     0.000000 sync        0 I             0"
        "          6       0  27\n"
        "        34       15  5 IDR slice             1     0.033366 sync        0 I             -"
        "          -       -   -\n"
        "4 units, 2 pictures (2 IDR), 49 bytes, 5.87 kbit/s at 30000/1001 frames/s\n");
}

}  // namespace
