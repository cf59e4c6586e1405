#include "io/PaddedSource.h"

#include <gtest/gtest.h>

#include "ListSource.h"
#include "io/ToolError.h"

namespace zolt {
namespace {

// The value of a component at a pixel of a sample; where that has none of its own, as in half pairs
// of 4:2:0 and 4:2:2, the last one before it. Component 0 of YUV is luma.
int value_at(const PictureFormat& format, const ListSource::Picture& sample, int component, int x,
             int y) {
    const int w = format.width;
    const int h = format.height;
    if (format.fourcc_code == PictureFormat::kIyuv) {
        if (component == 0) {
            return sample[y * w + x];
        }
        const int plane = w * h + (component - 1) * (w / 2) * (h / 2);
        return sample[plane + std::min(y / 2, h / 2 - 1) * (w / 2) + std::min(x / 2, w / 2 - 1)];
    }
    if (format.fourcc_code == PictureFormat::kYuy2) {
        const int row = y * w * 2;
        if (component == 0) {
            return sample[row + 2 * x];
        }
        const int in_pair = component == 1 ? 1 : 3;
        const int pair = x / 2;
        return sample[row + (4 * pair + in_pair < 2 * w ? 4 * pair : 4 * pair - 4) + in_pair];
    }
    const int pixel_bytes = static_cast<int>(format.sample_bytes()) / (w * h);
    return sample[(y * w + x) * pixel_bytes + std::min(component, pixel_bytes - 1)];
}

TEST(PaddedSource, RepeatsTheEdgesInEveryFormat) {
    const char* const formats[] = {"IYUV", "YUY2", "AYUV", "BGRA", "RGBA", "ARGB", "BGR", "RGB"};
    const std::pair<int, int> sizes[] = {{17, 17}, {51, 39}, {16, 31},
                                         {30, 16}, {18, 46}, {33, 34}};
    for (const char* const name : formats) {
        for (const auto& [width, height] : sizes) {
            SCOPED_TRACE(name + (" " + std::to_string(width)) + "x" + std::to_string(height));
            const PictureFormat format{*PictureFormat::parse_fourcc(name), width, height};
            ListSource::Picture picture(format.sample_bytes());
            for (std::size_t i = 0; i < picture.size(); ++i) {
                picture[i] = static_cast<unsigned char>(i * 37 + i / 100);
            }
            PaddedSource source(
                std::make_unique<ListSource>(format, std::vector<ListSource::Picture>{picture}));
            const PictureFormat padded = source.format();
            EXPECT_EQ(padded.width, (width + 15) / 16 * 16);
            EXPECT_EQ(padded.height, (height + 15) / 16 * 16);
            EXPECT_EQ(source.traits().shown_width, width);
            EXPECT_EQ(source.traits().shown_height, height);

            ListSource::Picture result(padded.sample_bytes());
            ASSERT_TRUE(source.read(result));
            int wrong = 0;
            for (int y = 0; y < padded.height; ++y) {
                for (int x = 0; x < padded.width; ++x) {
                    for (int component = 0; component < 4; ++component) {
                        if (component == 3 && format.fourcc_code != fourcc("AYUV")) {
                            continue;
                        }
                        // A pair that is filled up has one chroma sample for both.
                        wrong += value_at(padded, result, component, x, y) !=
                                 value_at(format, picture, component, std::min(x, width - 1),
                                          std::min(y, height - 1));
                    }
                }
            }
            EXPECT_EQ(wrong, 0);
            EXPECT_FALSE(source.read(result));
        }
    }
}

TEST(PaddedSource, RefusesWhatIsTooLargeOnlyWhenPadded) {
    // 132 whole rows of 1055 macroblocks are the most; one more is not.
    const PictureFormat format{PictureFormat::kIyuv, 16880, 2127};
    ASSERT_EQ(PictureFormat::size_error(format.width, format.height), "");
    EXPECT_THROW(
        PaddedSource(std::make_unique<ListSource>(format, std::vector<ListSource::Picture>{})),
        ToolError);
}

}  // namespace
}  // namespace zolt
