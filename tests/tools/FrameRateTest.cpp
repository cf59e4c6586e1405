#include "io/FrameRate.h"

#include <gtest/gtest.h>

#include "io/PictureFormat.h"
#include "io/SyntheticSource.h"
#include "io/ToolError.h"

namespace zolt {
namespace {

TEST(FrameRate, ReadsWholeNumbersFractionsAndDecimals) {
    const std::pair<const char*, const char*> cases[] = {
        {"25", "25"},          {"50/2", "25"},  {"30000:1001", "30000/1001"}, {"29.97", "2997/100"},
        {"12.500000", "25/2"}, {"0.1", "1/10"}, {"2147483647", "2147483647"},
    };
    for (const auto& [text, expected] : cases) {
        const auto rate = FrameRate::parse(text);
        ASSERT_TRUE(rate) << text;
        EXPECT_EQ(rate->to_string(), expected);
    }
    for (const char* text :
         {"",          "0",   "-25", "+25",    "25 ",        " 25",          "25/0",
          "0/1",       "25/", "/1",  "25/1/1", "0.0",        "25.",          ".5",
          "1.1234567", "1e3", "nan", "inf",    "2147483648", "2147483647.5", "99999999999999999999",
          "1.-5"}) {
        EXPECT_FALSE(FrameRate::parse(text)) << text;
    }
}

TEST(FrameRate, SampleTimesAreRoundedDownAndNeverOverflow) {
    const FrameRate ntsc{30000, 1001};
    EXPECT_EQ(ntsc.sample_time(0), 0);
    EXPECT_EQ(ntsc.sample_time(1), 33366);  // 33366.67
    EXPECT_EQ(ntsc.sample_time(30000), 1001000000);
    EXPECT_EQ((FrameRate{30, 1}).sample_time(3), 100000);
    EXPECT_EQ((FrameRate{2147483647, 1}).sample_time(2147), 0);
    EXPECT_EQ((FrameRate{2147483647, 1}).sample_time(2148), 1);

    // A product of index, denominator and 1000000 that leaves 64 bits, and a time that would.
    EXPECT_EQ((FrameRate{30000, 1001}).sample_time(4294967295), 143308742076500);
    const FrameRate slowest{1, 2147483647};
    EXPECT_GT(slowest.sample_time(4294967295), 9000000000000000000);
}

TEST(PictureFormat, KnowsEveryFormatByNameAndSize) {
    struct Case {
        const char* name;
        std::size_t sample_bytes;  // of 17x19
        std::size_t file_bytes;
    };
    const Case cases[] = {
        {"IYUV", 17 * 19 + 2 * 8 * 9, 17 * 19 + 2 * 9 * 10},
        {"YUY2", 17 * 19 * 2, 18 * 19 * 2},
        {"AYUV", 17 * 19 * 4, 17 * 19 * 4},
        {"bgra", 17 * 19 * 4, 17 * 19 * 4},
        {"RGBA", 17 * 19 * 4, 17 * 19 * 4},
        {"ARGB", 17 * 19 * 4, 17 * 19 * 4},
        {"BGR ", 17 * 19 * 3, 17 * 19 * 3},
        {"RGB", 17 * 19 * 3, 17 * 19 * 3},
    };
    for (const Case& expected : cases) {
        const auto code = PictureFormat::parse_fourcc(expected.name);
        ASSERT_TRUE(code) << expected.name;
        const PictureFormat format{*code, 17, 19};
        EXPECT_EQ(format.sample_bytes(), expected.sample_bytes) << expected.name;
        EXPECT_EQ(format.file_bytes(), expected.file_bytes) << expected.name;
    }
    for (const char* name : {"", "RG", "NV12", "IYUV ", "RGB2", "I420"}) {
        EXPECT_FALSE(PictureFormat::parse_fourcc(name)) << name;
    }
}

TEST(SyntheticSource, ReadsItsSettings) {
    const auto plain = SyntheticSource::parse("synthetic");
    EXPECT_GT(plain.frames, 0);
    EXPECT_FALSE(plain.frame_rate);
    const auto full = SyntheticSource::parse("synthetic:64x48@30000/1001:7");
    EXPECT_EQ(full.width, 64);
    EXPECT_EQ(full.height, 48);
    EXPECT_EQ(full.frame_rate->to_string(), "30000/1001");
    EXPECT_EQ(full.frames, 7);
    for (const char* text :
         {"synthetic:", "synthetic:64", "synthetic:64x", "synthetic:x48", "synthetic:64x48x3",
          "synthetic:64x48@", "synthetic:64x48@0", "synthetic:64x48@25:", "synthetic:64x48@25:0",
          "synthetic:64x48@25:-1", "synthetic:64x48:9", "synthetic:8x48", "synthetic:99999x48"}) {
        EXPECT_THROW(SyntheticSource::parse(text), UsageError) << text;
    }
    EXPECT_FALSE(SyntheticSource::recognises("synthetic.y4m"));
}

TEST(SyntheticSource, MovesAndIsTheSameEveryTime) {
    const SyntheticSource::Settings settings = SyntheticSource::parse("synthetic:71x50@25:3");
    SyntheticSource first(settings);
    SyntheticSource second(settings);
    const std::size_t bytes = first.format().sample_bytes();
    std::vector<unsigned char> before(bytes);
    std::vector<unsigned char> a(bytes);
    std::vector<unsigned char> b(bytes);
    for (int frame = 0; frame < 3; ++frame) {
        ASSERT_TRUE(first.read(a));
        ASSERT_TRUE(second.read(b));
        EXPECT_EQ(a, b);
        EXPECT_NE(a, before);
        before = a;
    }
    EXPECT_FALSE(first.read(a));
}

}  // namespace
}  // namespace zolt
