#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "avc/BitStreamWriter.h"
#include "avc/VideoAvcParser.h"

namespace {

using zolt::BitStreamWriter;
using Bytes = std::vector<unsigned char>;

int size_of(const Bytes& bytes) {
    return static_cast<int>(bytes.size());
}

BitStreamWriter seq_par_set_head(int profile_idc) {
    return BitStreamWriter().u(8, 0x67).u(8, static_cast<unsigned>(profile_idc)).u(8, 0).u(8, 31);
}

// What follows pic_order_cnt_type and its fields.
BitStreamWriter& picture_size(BitStreamWriter& bits, std::uint64_t width_in_mbs,
                              std::uint64_t height_in_mbs) {
    return bits.ue(3).u(1, 1).ue(width_in_mbs - 1).ue(height_in_mbs - 1).u(1, 1).u(3, 0).trailing();
}

TEST(VideoAvcSyntax, ReadsASeqParSetOfEachPicOrderCntType) {
    for (const int type : {0, 1, 2}) {
        BitStreamWriter bits = seq_par_set_head(77);
        bits.ue(5).ue(12).ue(static_cast<unsigned>(type));
        if (type == 0) {
            bits.ue(9);
        } else if (type == 1) {
            bits.u(1, 1).se(-4).se(1000).ue(3).se(1).se(-1).se(2);
        }
        const Bytes nal = picture_size(bits, 40, 30).bytes();
        VideoAvcSeqParSet set;
        VideoAvcParser::ParseSeqParSet(nal.data(), size_of(nal), &set);
        EXPECT_EQ(set.profile_idc, 77U);
        EXPECT_EQ(set.level_idc, 31U);
        EXPECT_EQ(set.seq_parameter_set_id, 5U);
        EXPECT_EQ(set.log2_max_frame_num_minus4, 12U);
        EXPECT_EQ(set.pic_order_cnt_type, static_cast<std::uint32_t>(type));
        EXPECT_EQ(set.log2_max_pic_order_cnt_lsb_minus4, type == 0 ? 9U : 0U);
        EXPECT_EQ(set.delta_pic_order_always_zero_flag, type == 1 ? 1 : 0);
        EXPECT_EQ(set.num_ref_frames, 3U);
        EXPECT_EQ(set.gaps_in_frame_num_value_allowed_flag, 1);
        EXPECT_EQ(set.pic_width_in_mbs_minus1, 39U);
        EXPECT_EQ(set.pic_height_in_map_units_minus1, 29U);
        EXPECT_EQ(set.frame_mbs_only_flag, 1);
    }
}

TEST(VideoAvcSyntax, ReadsASeqParSetWithChromaFormat) {
    for (const int profile_idc : {100, 110, 122, 244, 44, 83, 86, 118, 128}) {
        for (const int chroma_format_idc : {1, 3}) {
            BitStreamWriter bits = seq_par_set_head(profile_idc);
            bits.ue(0).ue(static_cast<unsigned>(chroma_format_idc));
            if (chroma_format_idc == 3) {
                bits.u(1, 0);
            }
            bits.ue(2).ue(2).u(1, 0).u(1, 1);
            for (int list = 0; list < (chroma_format_idc == 3 ? 12 : 8); ++list) {
                // One list in full, one that ends at its third entry, one from the default.
                const int entries = list % 3 == 0 ? (list < 6 ? 16 : 64) : list % 3 == 1 ? 2 : -1;
                bits.u(1, entries >= 0 ? 1 : 0);
                for (int i = 0; i < entries; ++i) {
                    bits.se(i % 2 == 0 ? 100 : -100);
                }
                if (entries == 2) {
                    bits.se(-8);
                }
            }
            bits.ue(0).ue(0).ue(2);
            picture_size(bits, 120, 68);
            // The fields stay where they are when emulation prevention comes between them.
            for (const Bytes& nal : {bits.bytes(), bits.escaped()}) {
                int width = 0;
                int height = 0;
                VideoAvcParser::ParseSeqParSet(nal.data(), size_of(nal), &width, &height);
                EXPECT_EQ(width, 1920) << profile_idc;
                EXPECT_EQ(height, 1088) << profile_idc;
            }
        }
    }
}

TEST(VideoAvcSyntax, ReadsASeqParSetWithEmulationPrevention) {
    BitStreamWriter bits = seq_par_set_head(66);
    // The operands of type 1 give runs of zero bytes.
    bits.ue(0).ue(0).ue(1).u(1, 0).se(1 << 24).se(1 << 24).ue(0);
    picture_size(bits, 11, 9);
    ASSERT_NE(bits.bytes(), bits.escaped());
    int width = 0;
    int height = 0;
    VideoAvcParser::ParseSeqParSet(bits.escaped().data(), size_of(bits.escaped()), &width, &height);
    EXPECT_EQ(width, 176);
    EXPECT_EQ(height, 144);
}

TEST(VideoAvcSyntax, GivesNoSizeThatNoPictureHas) {
    struct Case {
        std::uint64_t mbs;
        int samples;
    };
    for (const Case& c : {Case{1, 16}, Case{65535, 1048560}, Case{65536, 0},
                          Case{std::uint64_t{1} << 32, 0}, Case{(std::uint64_t{1} << 33) - 1, 0}}) {
        BitStreamWriter bits = seq_par_set_head(77);
        bits.ue(0).ue(0).ue(2);
        const Bytes nal = picture_size(bits, c.mbs, c.mbs).bytes();
        int width = -1;
        int height = -1;
        VideoAvcParser::ParseSeqParSet(nal.data(), size_of(nal), &width, &height);
        EXPECT_EQ(width, c.samples);
        EXPECT_EQ(height, c.samples);
    }
}

TEST(VideoAvcSyntax, EndsTheOffsetLoopWithTheData) {
    BitStreamWriter bits = seq_par_set_head(77);
    bits.ue(0).ue(0).ue(1).u(1, 0).se(0).se(0).ue(0xfffffffe).se(1).se(1);
    VideoAvcSeqParSet set;
    VideoAvcParser::ParseSeqParSet(bits.bytes().data(), size_of(bits.bytes()), &set);
    EXPECT_EQ(set.pic_order_cnt_type, 1U);
    EXPECT_EQ(set.num_ref_frames, 0U);
}

TEST(VideoAvcSyntax, ReadsAPicParSet) {
    const Bytes bytes = BitStreamWriter().ue(200).ue(17).u(1, 1).u(1, 1).ue(6).trailing().bytes();
    VideoAvcPicParSet set;
    VideoAvcParser::ParsePicParSet(bytes.data(), size_of(bytes), &set);
    EXPECT_EQ(set.pic_parameter_set_id, 200U);
    EXPECT_EQ(set.seq_parameter_set_id, 17U);
    EXPECT_EQ(set.entropy_coding_mode_flag, 1);
    EXPECT_EQ(set.pic_order_present_flag, 1);
    EXPECT_EQ(set.num_slice_groups_minus1, 6U);
}

// The lines that ParseSliceHeader writes.
std::string lines_of(const Bytes& nal, const VideoAvcSeqParSet& sps, const VideoAvcPicParSet* pps,
                     VideoAvcSliceHeader* header) {
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::tmpfile(), std::fclose);
    VideoAvcParser::ParseSliceHeader(nal.data(), size_of(nal), &sps, pps, header, file.get());
    std::string text(4096, '\0');
    std::rewind(file.get());
    text.resize(std::fread(&text[0], 1, text.size(), file.get()));
    return text;
}

VideoAvcSeqParSet cif_set() {
    VideoAvcSeqParSet sps;
    sps.log2_max_frame_num_minus4 = 12;
    sps.log2_max_pic_order_cnt_lsb_minus4 = 4;
    sps.pic_width_in_mbs_minus1 = 21;
    sps.pic_height_in_map_units_minus1 = 17;
    sps.frame_mbs_only_flag = 1;
    return sps;
}

TEST(VideoAvcSyntax, DescribesAnIdrSlice) {
    const Bytes nal = BitStreamWriter()
                          .u(8, 0x65)
                          .ue(7)
                          .ue(2)
                          .ue(0)
                          .u(16, 258)
                          .ue(3)
                          .u(8, 97)
                          .u(2, 0)
                          .se(-5)
                          .ue(11)
                          .u(5, 21)
                          .trailing()
                          .bytes();
    VideoAvcSliceHeader header;
    const VideoAvcPicParSet pps;
    EXPECT_EQ(lines_of(nal, cif_set(), &pps, &header),
              "Number of bits = 72\n"
              "Last byte = 1010.1100\n"
              "Number of trailing bits = 3\n"
              "nal_ref_idc       = 3\n"
              "nal_unit_type     = 5\n"
              "frame_num         = 258\n"
              "pic_order_cnt_lsb = 97\n"
              "slice_qp_delta    = -5\n"
              "slice_data() bit pos = 49\n"
              "mb_type    = 11\n"
              "Current bit pos = 56\n"
              "Last 3 bytes = 0000.0101 1000.1100 1010.1100\n"
              "Current bit pos = 56 (5 remaining)\n");
    EXPECT_EQ(header.first_mb_in_slice, 7U);
    EXPECT_EQ(header.slice_type, 2U);
    EXPECT_EQ(header.pic_parameter_set_id, 0U);
    EXPECT_EQ(header.frame_num, 258U);
    EXPECT_EQ(header.idr_pic_id, 3U);
    EXPECT_EQ(header.pic_order_cnt_lsb, 97U);

    EXPECT_EQ(lines_of(nal, cif_set(), nullptr, &header),
              "Number of bits = 72\n"
              "Last byte = 1010.1100\n"
              "Number of trailing bits = 3\n"
              "nal_ref_idc       = 3\n"
              "nal_unit_type     = 5\n"
              "frame_num         = 258\n");
    EXPECT_EQ(header.idr_pic_id, 3U);
    EXPECT_EQ(header.pic_order_cnt_lsb, 0U);
}

TEST(VideoAvcSyntax, DescribesInterSlices) {
    struct Case {
        int slice_type;
        bool is_cabac;
        int order_type;
    };
    const std::vector<Case> cases = {{0, false, 0}, {6, false, 1}, {5, true, 2}};
    for (const Case& c : cases) {
        VideoAvcSeqParSet sps = cif_set();
        sps.pic_order_cnt_type = static_cast<std::uint32_t>(c.order_type);
        VideoAvcPicParSet pps;
        pps.pic_order_present_flag = 1;
        pps.entropy_coding_mode_flag = c.is_cabac ? 1 : 0;
        const bool is_b = c.slice_type % 5 == 1;

        BitStreamWriter bits =
            BitStreamWriter().u(8, 0x41).ue(0).ue(static_cast<unsigned>(c.slice_type)).ue(0);
        bits.u(16, 77);
        if (c.order_type == 0) {
            bits.u(8, 97).se(1);
        } else if (c.order_type == 1) {
            bits.se(-2).se(3);
        }
        bits.u(is_b ? 1 : 0, 1).u(1, 1).ue(2);  // direct_spatial, override, list sizes
        if (is_b) {
            bits.ue(1);
        }
        bits.u(2, 0);  // no modification, no marking
        if (c.is_cabac) {
            bits.ue(2);
        }
        // Positions in the lines count from the byte behind the header.
        const auto position = [&](const char* name) {
            return name + std::to_string(bits.num_bits() - 8) + "\n";
        };
        std::string expected = "frame_num         = 77\n";
        expected += c.order_type == 0 ? "pic_order_cnt_lsb = 97\n" : "";
        expected += "slice_qp_delta    = 4\n";
        bits.se(4);
        expected += position("slice_data() bit pos = ");
        if (c.is_cabac) {
            bits.u(static_cast<int>((8 - bits.num_bits() % 8) % 8), 0xff).ue(100);
        } else {
            expected += position("Current bit pos = ");
            expected += "mb_skip_run       =   100 (total =   396)\n";
            bits.ue(100);
            expected += position("Current bit pos = ");
        }
        bits.ue(3);
        expected += "mb_type    = 3\n" + position("Current bit pos = ");
        bits.trailing();
        VideoAvcSliceHeader header;
        const std::string lines = lines_of(bits.bytes(), sps, &pps, &header);
        EXPECT_EQ(header.frame_num, 77U);
        EXPECT_NE(lines.find(expected), std::string::npos) << lines;
        EXPECT_NE(lines.find(" (0 remaining)\n"), std::string::npos) << lines;
    }
}

TEST(VideoAvcSyntax, ReadsFieldSlices) {
    VideoAvcSeqParSet sps = cif_set();
    sps.frame_mbs_only_flag = 0;
    VideoAvcPicParSet pps;
    pps.pic_order_present_flag = 1;
    const Bytes field = BitStreamWriter()
                            .u(8, 0x41)
                            .ue(0)
                            .ue(0)
                            .ue(0)
                            .u(16, 5)
                            .u(2, 3)
                            .u(8, 33)
                            .u(3, 0)
                            .se(0)
                            .ue(0)
                            .ue(9)
                            .trailing()
                            .bytes();
    VideoAvcSliceHeader header;
    const std::string lines = lines_of(field, sps, &pps, &header);
    EXPECT_EQ(header.pic_order_cnt_lsb, 33U);
    EXPECT_NE(lines.find("mb_skip_run       =     0 (total =   396)\n"), std::string::npos);
    EXPECT_NE(lines.find("mb_type    = 9\n"), std::string::npos);

    const Bytes frame = BitStreamWriter()
                            .u(8, 0x41)
                            .ue(0)
                            .ue(0)
                            .ue(0)
                            .u(16, 5)
                            .u(1, 0)
                            .u(8, 33)
                            .se(1)
                            .u(3, 0)
                            .se(0)
                            .ue(0)
                            .ue(9)
                            .trailing()
                            .bytes();
    EXPECT_NE(lines_of(frame, sps, &pps, &header).find("(total =   792)\n"), std::string::npos);
}

TEST(VideoAvcSyntax, SurvivesSlicesOfAnyLength) {
    VideoAvcSeqParSet sps = cif_set();
    sps.log2_max_frame_num_minus4 = 0xffffffff;
    sps.log2_max_pic_order_cnt_lsb_minus4 = 29;
    sps.pic_width_in_mbs_minus1 = 0xffffffff;
    const VideoAvcPicParSet pps;
    const Bytes nal = {0x65, 0xff, 0xff};
    VideoAvcSliceHeader header;
    EXPECT_NE(lines_of({}, sps, &pps, &header).find("Last 3 bytes = 0000.0000 0000.0000 0000.0000"),
              std::string::npos);
    for (std::size_t size = 1; size <= nal.size(); ++size) {
        // An exact copy, so that a read behind it is seen.
        const Bytes cut(nal.begin(), nal.begin() + static_cast<std::ptrdiff_t>(size));
        const std::string lines = lines_of(cut, sps, &pps, &header);
        EXPECT_NE(lines.find("Number of bits = " + std::to_string(8 * size) + "\n"),
                  std::string::npos);
        EXPECT_NE(lines.find("frame_num         = 0\n"), std::string::npos);
    }
}

}  // namespace
