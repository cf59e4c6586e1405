#include <gtest/gtest.h>

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "avcdump/RowFormat.h"
#include "avcdump/UnitLister.h"
#include "units.h"

namespace {

using zolt::BitStreamWriter;
using zolt::FrameRate;
using zolt::idr_slice;
using zolt::pic_par_set;
using zolt::RowFormat;
using zolt::seq_par_set;
using zolt::UnitLister;
using zolt::UnitRow;
using Bytes = std::vector<unsigned char>;

Bytes unit_of(const BitStreamWriter& bits) {
    Bytes unit = {0, 0, 1};
    const Bytes nal = bits.escaped();
    unit.insert(unit.end(), nal.begin(), nal.end());
    return unit;
}

UnitRow add(UnitLister& lister, const BitStreamWriter& bits) {
    const Bytes unit = unit_of(bits);
    return lister.add(unit.data(), static_cast<int>(unit.size()));
}

// A set whose chroma-format fields are taken for others, or others for them, does not give the
// slice's QP.
TEST(Avcdump, KnowsTheProfilesWithChromaFormatFields) {
    const std::set<int> with_fields = {100, 110, 122, 244, 44, 83, 86, 118, 128};
    for (int profile_idc = 0; profile_idc < 256; ++profile_idc) {
        BitStreamWriter bits;
        bits.u(8, 0x67).u(8, static_cast<unsigned>(profile_idc)).u(16, 31).ue(0);
        if (with_fields.count(profile_idc) != 0) {
            bits.ue(1).ue(0).ue(0).u(2, 0);
        }
        bits.ue(12).ue(0).ue(12).ue(1).u(1, 0).ue(10).ue(8).u(1, 1).u(3, 0);
        UnitLister lister(FrameRate{25, 1});
        add(lister, bits.trailing());
        add(lister, pic_par_set({}));
        const UnitRow row = add(lister, idr_slice(0, 6));
        ASSERT_TRUE(row.header);
        EXPECT_TRUE(row.header->is_complete) << profile_idc;
        EXPECT_EQ(row.header->slice_qp, 27) << profile_idc;
    }
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
        BitStreamWriter bits;
        bits.u(8, 0x65).ue(first_mb).ue(7).ue(0).u(16, 0).u(1, 0).ue(idr_pic_id).u(16, 0).se(0);
        return bits.u(2, 0).se(4).u(20, 0xabcde).trailing();
    };
    const auto field = [](bool is_bottom) {
        BitStreamWriter bits;
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
