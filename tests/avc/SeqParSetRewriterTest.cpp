#include "avc/SeqParSetRewriter.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "avc/AvcLevel.h"
#include "avc/BitStreamWriter.h"
#include "avc/SequenceParameterSet.h"
#include "avc/rbsp.h"

namespace {

using zolt::AvcLevel;
using zolt::BitStreamWriter;
using zolt::SeqParSetRewriter;
using zolt::SequenceParameterSet;
using zolt::VuiParameters;
using Bytes = std::vector<unsigned char>;

Bytes rewrite(const Bytes& nal, const SeqParSetRewriter::Properties& properties) {
    return SeqParSetRewriter(properties).rewrite(nal.data(), static_cast<int>(nal.size()));
}

// A set of Main profile, 4:2:0, without cropping or VUI.
Bytes main_set(unsigned width, unsigned height, unsigned ref_frames = 1) {
    BitStreamWriter bits;
    bits.u(8, 0x47).u(8, 77).u(8, 0).u(8, 22).ue(0).ue(0).ue(2).ue(ref_frames).u(1, 0);
    bits.ue(width / 16 - 1).ue(height / 16 - 1).u(1, 1).u(3, 0);
    return bits.trailing().escaped();
}

SequenceParameterSet read(const Bytes& nal) {
    return SequenceParameterSet::read(
        zolt::rbsp_bytes(nal.data(), static_cast<int>(nal.size()), 4096));
}

// Every field that can stand before the VUI, which is written by hand here.
TEST(SeqParSetRewriter, ChangesLevelAndVuiAlone) {
    const auto set_with = [](unsigned level_idc, const auto& write_vui) {
        BitStreamWriter bits;
        bits.u(8, 0x67).u(8, 244).u(8, 0x5c).u(8, level_idc).ue(17);
        bits.ue(3).u(1, 1).ue(5).ue(6).u(1, 1).u(1, 1);
        for (int list = 0; list < 12; ++list) {
            bits.u(1, list % 3 == 0);
            for (int i = 0; list % 3 == 0 && i < (list < 6 ? 16 : 64); ++i) {
                bits.se(i % 5 - 2 == 0 ? 3 : 2 - i % 5);
            }
        }
        bits.ue(11).ue(1).u(1, 1).se(-70000).se(8).ue(3).se(2).se(-3).se(4);
        bits.ue(4).u(1, 1).ue(19).ue(14).u(1, 0).u(1, 1).u(1, 1).u(1, 1).ue(12).ue(13).ue(14).ue(0);
        write_vui(bits);
        return bits.trailing().escaped();
    };
    const Bytes before = set_with(51, [](BitStreamWriter& bits) { bits.u(1, 0); });
    SeqParSetRewriter::Properties properties;
    properties.bit_rate_kbs = 4000;
    properties.vui = {40, 33, true, 9, 16, 9, 1001, 60000, true, 0, 1};
    // 20x30 macroblocks at 29.97 frames/s, 4 reference frames.
    const Bytes after = set_with(21, [](BitStreamWriter& bits) {
        bits.u(1, 1).u(1, 1).u(8, 5).u(1, 0);
        bits.u(1, 1).u(3, 5).u(1, 1).u(1, 1).u(8, 9).u(8, 16).u(8, 9).u(1, 0);
        bits.u(1, 1).u(32, 1001).u(32, 60000).u(1, 1).u(3, 0);
        bits.u(1, 1).u(1, 1).ue(0).ue(0).ue(15).ue(15).ue(0).ue(4);
    });
    EXPECT_EQ(rewrite(before, properties), after);
    EXPECT_EQ(rewrite(after, properties), after);
}

TEST(SeqParSetRewriter, LeavesOutWhatIsNotKnown) {
    const Bytes plain = main_set(176, 144);
    const auto vui_of = [&plain](const VuiParameters& vui) {
        SeqParSetRewriter::Properties properties;
        properties.vui = vui;
        const Bytes nal = rewrite(plain, properties);
        // Behind the bytes up to level_idc.
        return nal.empty() ? Bytes() : Bytes(nal.begin() + 4, nal.end());
    };
    const auto expected = [](const auto& write_vui) {
        BitStreamWriter bits;
        bits.ue(0).ue(0).ue(2).ue(1).u(1, 0).ue(10).ue(8).u(1, 1).u(2, 0).u(1, 1);
        write_vui(bits);
        return bits.u(1, 1).u(1, 1).ue(0).ue(0).ue(15).ue(15).ue(0).ue(1).trailing().escaped();
    };
    EXPECT_EQ(vui_of({}), expected([](BitStreamWriter& bits) { bits.u(8, 0); }));
    VuiParameters range;
    range.video_full_range_flag = false;
    EXPECT_EQ(vui_of(range), expected([](BitStreamWriter& bits) {
                  bits.u(2, 0).u(1, 1).u(3, 5).u(1, 0).u(1, 0).u(5, 0);
              }));
    VuiParameters shape;
    shape.sar_width = 2 * 1000;
    shape.sar_height = 2 * 1001;
    EXPECT_EQ(vui_of(shape), expected([](BitStreamWriter& bits) {
                  bits.u(1, 1).u(8, 255).u(16, 1000).u(16, 1001).u(7, 0);
              }));
    shape.sar_width = 1 << 20;
    shape.sar_height = 3;
    EXPECT_EQ(vui_of(shape), vui_of({}));
}

TEST(SeqParSetRewriter, CropsWhatIsNotShown) {
    struct Case {
        int shown_width, shown_height;
        std::uint32_t right, bottom;
    };
    for (const Case& c : {Case{64, 48, 0, 0}, Case{0, 0, 0, 0}, Case{51, 39, 6, 4},
                          Case{52, 48, 6, 0}, Case{63, 47, 0, 0}, Case{100, 34, 0, 7}}) {
        SeqParSetRewriter::Properties properties;
        properties.shown_width = c.shown_width;
        properties.shown_height = c.shown_height;
        const SequenceParameterSet set = read(rewrite(main_set(64, 48), properties));
        ASSERT_TRUE(set.is_complete);
        EXPECT_EQ(set.frame_cropping_flag, c.right + c.bottom > 0) << c.shown_width;
        EXPECT_EQ(set.frame_crop_right_offset, c.right);
        EXPECT_EQ(set.frame_crop_bottom_offset, c.bottom);
        EXPECT_EQ(set.frame_crop_left_offset + set.frame_crop_top_offset, 0U);
    }
}

TEST(SeqParSetRewriter, RefusesDamagedSets) {
    const Bytes whole = main_set(176, 144);
    for (std::size_t size = 0; size + 1 < whole.size(); ++size) {
        EXPECT_TRUE(
            rewrite(Bytes(whole.begin(), whole.begin() + static_cast<long>(size)), {}).empty());
    }
}

// Values of Table A-1 and its neighbours.
TEST(SeqParSetRewriter, DeclaresTheLowestLevel) {
    struct Case {
        unsigned width, height, frames_per_second;
        int bit_rate_kbs;
        std::uint32_t level_idc;
        bool is_1b = false;
    };
    for (const Case& c : {
             Case{176, 144, 15, 64, 10},
             Case{176, 144, 15, 65, 11, true},
             Case{176, 144, 15, 129, 11},
             Case{176, 144, 16, 0, 11},
             Case{176, 144, 0, 0, 10},
             Case{352, 288, 7, 0, 11},
             Case{352, 288, 15, 0, 12},
             Case{352, 288, 30, 0, 13},
             Case{352, 288, 30, 769, 20},
             Case{352, 288, 31, 0, 21},
             Case{720, 480, 15, 4000, 22},
             Case{720, 480, 15, 4001, 30},
             Case{720, 576, 25, 0, 30},
             Case{1280, 720, 30, 0, 31},
             Case{1280, 720, 60, 0, 32},
             Case{1920, 1088, 30, 0, 40},
             Case{1920, 1088, 30, 20001, 41},
             Case{1920, 1088, 60, 0, 42},
             Case{2560, 1440, 30, 0, 50},
             Case{3840, 2160, 30, 0, 51},
             Case{3840, 2160, 60, 0, 52},
             Case{8192, 4352, 30, 0, 60},
             Case{8192, 4352, 60, 0, 61},
             Case{8192, 4352, 120, 0, 62},
             Case{8192, 4352, 1000, 900000, 62},
             // Sides of more than the square root of 8 MaxFS macroblocks.
             Case{448, 16, 1, 0, 10},
             Case{464, 16, 1, 0, 11},
             Case{16, 16880, 1, 0, 60},
         }) {
        SeqParSetRewriter::Properties properties;
        properties.bit_rate_kbs = c.bit_rate_kbs;
        properties.vui.num_units_in_tick = 1;
        properties.vui.time_scale = 2 * c.frames_per_second;
        const SequenceParameterSet set = read(rewrite(main_set(c.width, c.height), properties));
        EXPECT_EQ(set.level_idc, c.level_idc)
            << c.width << "x" << c.height << "@" << c.frames_per_second << ", " << c.bit_rate_kbs;
        EXPECT_EQ(set.constraint_set_flags, c.is_1b ? 0x10U : 0U);
    }
    EXPECT_EQ(AvcLevel::lowest({11, 9, 4, 15.0, 64}).level_idc, 10U);
    EXPECT_EQ(AvcLevel::lowest({11, 9, 5, 15.0, 64}).level_idc, 11U);
    EXPECT_FALSE(AvcLevel::lowest({11, 9, 5, 15.0, 64}).is_1b);
}

}  // namespace
