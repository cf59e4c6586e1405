#include "color/ColorConverter.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstring>
#include <memory>
#include <numeric>
#include <random>

#include "HostErrors.h"
#include "ReferenceConverter.h"
#include "color/color_tables.h"
#include "common/Thread.h"
#include "support/Util.h"

namespace {

using Converter = std::unique_ptr<ColorConverter>;

Converter make_converter(Size source, int source_format, int result_format, int width_multiple = 1,
                         int height_multiple = 1) {
    return Converter(ColorConverter::GetNewColorConverter(source.width, source.height,
                                                          source_format, result_format,
                                                          width_multiple, height_multiple));
}

// The whole picture in its own allocation, so that a read beyond its bytes is caught.
Picture convert(ColorConverter& converter, const Picture& source) {
    converter.Convert(source.data());
    return {converter.GetOutputBuffer(), converter.GetOutputBuffer() + converter.GetOutputSize()};
}

Picture random_picture(Size size, int format, unsigned seed) {
    std::mt19937 random(seed);
    Picture picture(static_cast<size_t>(picture_size(size, format)));
    for (unsigned char& byte : picture) {
        // One byte in four is an extreme: sums and clamps are tried to their ends.
        const unsigned value = random();
        byte = static_cast<unsigned char>(value % 4 != 0 ? value >> 8 : value % 8 != 0 ? 255 : 0);
    }
    return picture;
}

std::string format_name(int format) {
    char text[5];
    std::string name = Util::FourccToString(format, text);
    return name[3] == ' ' ? name.substr(0, 3) : name;
}

class FromEveryFormat : public testing::TestWithParam<int> {};
INSTANTIATE_TEST_SUITE_P(Formats, FromEveryFormat, testing::ValuesIn(kAllFormats),
                         [](const auto& format) { return format_name(format.param); });

// All 8 x 8 pairs of formats, without cropping, with it, and for sources of odd size.
TEST_P(FromEveryFormat, ConvertsLikeTheReference) {
    struct Case {
        Size source;
        int width_multiple, height_multiple;
        int output_width[2], output_height[2];  // single pixels; pixel pairs in that direction
    };
    const Case kCases[] = {
        {{48, 32}, 16, 16, {48, 48}, {32, 32}}, {{45, 37}, 16, 16, {32, 32}, {32, 32}},
        {{35, 21}, 1, 1, {35, 34}, {21, 20}},   {{22, 13}, 3, 5, {21, 18}, {10, 10}},
        {{9, 11}, 4, 4, {8, 8}, {8, 8}},        {{6, 3}, 0, -7, {6, 6}, {3, 2}},
        {{3, 6}, 1, 1, {3, 2}, {6, 6}},         {{1, 8}, 1, 1, {1, 0}, {8, 8}},
        {{8, 1}, 1, 1, {8, 8}, {1, 0}},         {{1, 1}, 1, 1, {1, 0}, {1, 0}},
        {{7, 5}, 5, 3, {5, 0}, {3, 0}},         {{15, 14}, 7, 2, {14, 14}, {14, 14}},
    };
    const int source_format = GetParam();
    for (const int result_format : kAllFormats) {
        for (const Case& c : kCases) {
            SCOPED_TRACE(format_name(result_format) + " from " + std::to_string(c.source.width) +
                         "x" + std::to_string(c.source.height));
            const Size output = {
                c.output_width[ColorConverter::GetMinWidthMultiple(result_format) - 1],
                c.output_height[ColorConverter::GetMinHeightMultiple(result_format) - 1]};
            const Converter converter = make_converter(c.source, source_format, result_format,
                                                       c.width_multiple, c.height_multiple);
            if (output.width == 0 || output.height == 0) {
                EXPECT_EQ(converter, nullptr);
                continue;
            }
            ASSERT_NE(converter, nullptr);
            ASSERT_EQ(converter->GetOutputWidth(), output.width);
            ASSERT_EQ(converter->GetOutputHeight(), output.height);
            for (unsigned seed = 1; seed <= 3; ++seed) {
                const Picture source = random_picture(c.source, source_format, seed);
                ASSERT_EQ(
                    convert(*converter, source),
                    reference_convert(source, c.source, source_format, output, result_format));
            }
        }
    }
}

// Blank pictures are the same black in every format, so each converts to each.
TEST_P(FromEveryFormat, BlankPicturesStayBlank) {
    const Size size = {18, 10};
    const auto blank = [&](int format) {
        const std::unique_ptr<unsigned char[]> image(
            ColorConverter::GetNewBlankImage(size.width, size.height, format));
        return Picture(image.get(), image.get() + picture_size(size, format));
    };
    for (const int result_format : kAllFormats) {
        SCOPED_TRACE(format_name(result_format));
        const Converter converter = make_converter(size, GetParam(), result_format);
        EXPECT_EQ(convert(*converter, blank(GetParam())), blank(result_format));
    }
    EXPECT_EQ(ColorConverter::GetNewBlankImage(0, 10, GetParam()), nullptr);
    EXPECT_EQ(ColorConverter::GetNewBlankImage(10, -1, GetParam()), nullptr);
    EXPECT_EQ(ColorConverter::GetNewBlankImage(INT_MAX, INT_MAX, GetParam()), nullptr);
}

TEST(ColorConverter, RoundTripsKeepWhatBothFormatsHold) {
    const Size size = {34, 18};
    const auto round_trip = [&](const Picture& picture, const char(&from)[5],
                                const char(&by_way_of)[5]) {
        const Converter there = make_converter(size, zolt::fourcc(from), zolt::fourcc(by_way_of));
        const Converter back = make_converter(size, zolt::fourcc(by_way_of), zolt::fourcc(from));
        return convert(*back, convert(*there, picture));
    };
    const Picture rgba = random_picture(size, ColorConverter::kRGBA, 1);
    EXPECT_EQ(round_trip(rgba, "RGBA", "ARGB"), rgba);
    EXPECT_EQ(round_trip(rgba, "RGBA", "BGRA"), rgba);
    const Picture bgr = random_picture(size, ColorConverter::kBGR, 2);
    EXPECT_EQ(round_trip(bgr, "BGR ", "ARGB"), bgr);
    const Picture yuy2 = random_picture(size, ColorConverter::kYUY2, 3);
    EXPECT_EQ(round_trip(yuy2, "YUY2", "AYUV"), yuy2);
    const Picture iyuv = random_picture(size, ColorConverter::kIYUV, 4);
    EXPECT_EQ(round_trip(iyuv, "IYUV", "YUY2"), iyuv);
    EXPECT_EQ(round_trip(iyuv, "IYUV", "AYUV"), iyuv);

    // Colours that YUV can hold without clamping come back within the rounding of the rules.
    Picture grey_to_colour(static_cast<size_t>(picture_size(size, ColorConverter::kRGBA)));
    std::iota(grey_to_colour.begin(), grey_to_colour.end(), 0);
    for (unsigned char& byte : grey_to_colour) {
        byte = static_cast<unsigned char>(64 + byte % 97);
    }
    const Picture returned = round_trip(grey_to_colour, "RGBA", "AYUV");
    for (size_t i = 0; i < returned.size(); ++i) {
        EXPECT_NEAR(returned[i], grey_to_colour[i], 3) << i;
    }
}

TEST(ColorConverter, ConvertsKnownColours) {
    struct {
        int r, g, b, y, u, v;
    } const kColours[] = {
        {255, 255, 255, 255, 128, 128}, {0, 0, 0, 0, 128, 128}, {255, 0, 0, 77, 85, 255}};
    for (const auto& colour : kColours) {
        unsigned char y, u, v;
        ColorConverter::RGB2YUV(static_cast<unsigned char>(colour.r),
                                static_cast<unsigned char>(colour.g),
                                static_cast<unsigned char>(colour.b), &y, &u, &v);
        EXPECT_EQ(y, colour.y);
        EXPECT_EQ(u, colour.u);
        EXPECT_EQ(v, colour.v);
    }
}

// Tables made of integers against the rules in real numbers.
TEST(ColorConverter, TablesHoldTheRules) {
    ColorConverter::FillTablesRGB2YUV();
    ColorConverter::FillTablesYUV2RGB();
    for (int i = 0; i < 256; ++i) {
        EXPECT_EQ(zolt::TableCr[i], std::floor(0.3 * i + 0.5)) << i;
        EXPECT_EQ(zolt::TableCg[i], std::floor(0.59 * i + 0.5)) << i;
        EXPECT_EQ(zolt::TableCb[i], std::floor(0.11 * i + 0.5)) << i;
        const int c = i - 128;
        EXPECT_EQ(zolt::TableE02xCr[i], std::round(1.4 * c)) << c;
        EXPECT_EQ(zolt::TableE11xCb[i], std::round(-0.33186440677966106 * c)) << c;
        EXPECT_EQ(zolt::TableE12xCr[i], std::round(-0.711864406779661 * c)) << c;
        EXPECT_EQ(zolt::TableE21xCb[i], std::round(1.78 * c)) << c;
    }
    const auto clamped = [](double value) { return std::clamp(value, 0.0, 255.0); };
    for (int d = -255; d <= 255; ++d) {
        EXPECT_EQ(zolt::TableCu[d + 255], clamped(std::round(128 + d * 0.5617977528089888))) << d;
        EXPECT_EQ(zolt::TableCv[d + 255], clamped(std::round(128 + d * 0.7142857142857143))) << d;
    }
}

TEST(ColorConverter, TakesHdPicturesFromTheMiddleRows) {
    const Size size = {1920, 1080};
    Picture source(static_cast<size_t>(picture_size(size, ColorConverter::kBGRA)));
    for (int y = 0; y < size.height; ++y) {
        std::memset(source.data() + 4 * size.width * y, y % 251,
                    static_cast<size_t>(4 * size.width));
    }
    const Converter converter =
        make_converter(size, ColorConverter::kBGRA, ColorConverter::kIYUV, 16, 16);
    ASSERT_EQ(converter->GetOutputWidth(), 1920);
    ASSERT_EQ(converter->GetOutputHeight(), 1072);
    ASSERT_EQ(converter->GetOutputSize(), 1920 * 1072 * 3 / 2);
    converter->Convert(source.data());
    for (const int row : {0, 1, 500, 1071}) {
        const auto grey = static_cast<unsigned char>((row + 4) % 251);
        unsigned char y, u, v;
        ColorConverter::RGB2YUV(grey, grey, grey, &y, &u, &v);
        EXPECT_EQ(converter->GetOutputBuffer()[1920 * row], y) << row;
        EXPECT_EQ(converter->GetOutputBuffer()[1920 * row + 1919], y) << row;
    }
}

TEST(ColorConverter, FactoryReportsWhatItCannotConvert) {
    constexpr int kBGRA = ColorConverter::kBGRA, kIYUV = ColorConverter::kIYUV;
    struct {
        int width, height, source_format, result_format, width_multiple, height_multiple;
        std::string message;
    } const kCases[] = {
        {0, 480, kBGRA, kIYUV, 16, 16, "Source dimensions (0,480) must be positive"},
        {640, -1, kBGRA, kIYUV, 16, 16, "Source dimensions (640,-1) must be positive"},
        {0, 480, 0, 0, 16, 16, "Source dimensions (0,480) must be positive"},
        {64, 64, zolt::fourcc("bgra"), 0, 16, 16, "Source color format undefined: bgra"},
        {64, 64, kBGRA, zolt::fourcc("####"), 16, 16, "Result color format undefined: ####"},
        {15, 15, kBGRA, kIYUV, 16, 16,
         "Source dimensions (15,15) too small to be the requested/required multiple of (16,16)"},
        {640, 1, kBGRA, kIYUV, 0, 1,
         "Source dimensions (640,1) too small to be the requested/required multiple of (2,2)"},
        {1, 8, kBGRA, ColorConverter::kYUY2, 1, 1,
         "Source dimensions (1,8) too small to be the requested/required multiple of (2,1)"},
        {4, 4, kBGRA, kIYUV, 3, INT_MAX,
         "Source dimensions (4,4) too small to be the requested/required multiple of "
         "(6,2147483647)"},
        {40000, 40000, kBGRA, kIYUV, 16, 16, "Source dimensions (40000,40000) are too large"},
        {30000, 30000, kIYUV, kBGRA, 16, 16, "Source dimensions (30000,30000) are too large"},
        {INT_MAX, INT_MAX, kIYUV, kIYUV, 1, 1,
         "Source dimensions (2147483647,2147483647) are too large"},
    };
    for (const auto& c : kCases) {
        EXPECT_EQ(make_converter({c.width, c.height}, c.source_format, c.result_format,
                                 c.width_multiple, c.height_multiple),
                  nullptr);
        EXPECT_EQ(take_errors(), "ColorConverter.GetNewColorConverter: " + c.message + "\n");
    }
    EXPECT_NE(make_converter({16, 16}, kBGRA, kIYUV, 16, 16), nullptr);
    EXPECT_EQ(take_errors(), "");
}

TEST(ColorConverter, DoesNothingOutsideItsContract) {
    const Picture source(4 * 64 * 64, 200);
    struct {
        int width, height, source_format, result_format;
    } const kCases[] = {
        {64, 64, 0, ColorConverter::kBGRA},                      // undefined formats
        {64, 64, ColorConverter::kBGRA, 0},                      //
        {65, 64, ColorConverter::kBGRA, ColorConverter::kBGRA},  // larger than the source
        {63, 64, ColorConverter::kBGRA, ColorConverter::kYUY2},  // half a pixel pair
        {-4, 64, ColorConverter::kBGRA, ColorConverter::kBGRA},
    };
    for (const auto& c : kCases) {
        ColorConverter converter(64, 64, c.source_format, c.width, c.height, c.result_format);
        const Picture result = convert(converter, source);
        EXPECT_EQ(result, Picture(result.size(), 0));
    }
}

TEST(ColorConverter, AnswersForUndefinedFormats) {
    const int undefined = zolt::fourcc("BGRX");
    EXPECT_EQ(ColorConverter::ColorFormatUndefined(undefined), 1);
    EXPECT_EQ(ColorConverter::GetBufferSize(16, 16, undefined), 0);
    EXPECT_EQ(ColorConverter::RoundDownWidth(17, undefined), 0);
    EXPECT_EQ(ColorConverter::RoundDownHeight(17, undefined), 0);
    EXPECT_EQ(ColorConverter::GetNewBlankImage(16, 16, undefined), nullptr);
    int offsets[4] = {9, 9, 9, 9};
    ColorConverter::GetOffsetsRGBA(undefined, &offsets[0], &offsets[1], &offsets[2], &offsets[3]);
    EXPECT_EQ(std::accumulate(offsets, offsets + 4, 0), 0);

    EXPECT_EQ(ColorConverter::ColorFormatUndefined(ColorConverter::kBGR), 0);
    EXPECT_EQ(ColorConverter::RoundDownWidth(17, ColorConverter::kYUY2), 16);
    EXPECT_EQ(ColorConverter::RoundDownHeight(17, ColorConverter::kYUY2), 17);
    EXPECT_EQ(ColorConverter::RoundDownHeight(17, ColorConverter::kIYUV), 16);
}

// Meaningful where it is the first test of its process, as under ctest.
TEST(ColorConverter, FirstConvertersMayBeMadeByTwoThreadsAtOnce) {
    const Size size = {32, 32};
    const Picture source = random_picture(size, ColorConverter::kRGB, 7);
    Picture results[2];
    const auto use_first_converter = [&](Picture* result) {
        const Converter converter =
            make_converter(size, ColorConverter::kRGB, ColorConverter::kIYUV, 16, 16);
        *result = convert(*converter, source);
    };
    Thread other([&] { use_first_converter(&results[0]); });
    use_first_converter(&results[1]);
    other.join();
    const Picture expected =
        reference_convert(source, size, ColorConverter::kRGB, size, ColorConverter::kIYUV);
    EXPECT_EQ(results[0], expected);
    EXPECT_EQ(results[1], expected);
}

}  // namespace
