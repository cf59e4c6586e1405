#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "ElementHarness.h"
#include "common/Encoding.h"
#include "input_caps.h"
#include "pictures.h"

namespace zolt_test {
namespace {

const char* const kFormats[] = {"I420", "YUY2", "AYUV", "BGRA", "RGBA", "ARGB",
                                "BGRx", "RGBx", "xRGB", "BGR",  "RGB"};

std::string caps_fields(const std::string& format, int width, int height) {
    return "format=" + format + ",width=" + std::to_string(width) +
           ",height=" + std::to_string(height) + ",framerate=30/1";
}

GstVideoInfo info_of(const std::string& format, int width, int height) {
    GstVideoInfo info;
    gst_video_info_set_format(&info, gst_video_format_from_string(format.c_str()),
                              static_cast<guint>(width), static_cast<guint>(height));
    return info;
}

// The engine's own stream of planar pictures has to be the element's: every sample then counts.
void expect_engine_stream(const ElementHarness& element, Encoding& engine,
                          const std::vector<std::uint8_t>& planar, int n) {
    const std::vector<std::uint8_t> expected = engine.encode(planar.data());
    const std::vector<Output> outputs = element.take();
    ASSERT_EQ(outputs.size(), 1u);
    const Units units = units_of(outputs[0].bytes, true);
    ASSERT_EQ(units.size(), n == 0 ? 3u : 1u);
    ASSERT_EQ(units.back(), expected) << "picture " << n;
}

TEST(Formats, EachIsCodedInItsColours) {
    for (const char* const format : kFormats) {
        for (const auto& [width, height] : {std::pair{64, 48}, {17, 21}, {50, 34}, {33, 16}}) {
            SCOPED_TRACE(format + (" " + std::to_string(width)) + "x" + std::to_string(height));
            const ElementHarness element("bitrate=0");
            ASSERT_TRUE(element.set_caps(caps_fields(format, width, height)));
            Encoding engine((width + 15) / 16 * 16, (height + 15) / 16 * 16, {});
            for (int n = 0; n < 3; ++n) {
                ASSERT_EQ(element.push(n), GST_FLOW_OK);
                expect_engine_stream(element, engine,
                                     padded_i420(info_of(format, width, height), n), n);
            }
        }
    }
}

TEST(Formats, RowsAndPlanesMayLieApart) {
    for (const char* const format : kFormats) {
        for (const auto& [width, height] : {std::pair{64, 48}, {41, 23}}) {
            SCOPED_TRACE(format + (" " + std::to_string(width)) + "x" + std::to_string(height));
            const GstVideoInfo info = info_of(format, width, height);
            const ElementHarness element("bitrate=0");
            ASSERT_TRUE(element.set_caps(caps_fields(format, width, height)));
            Encoding engine((width + 15) / 16 * 16, (height + 15) / 16 * 16, {});
            for (int n = 0; n < 3; ++n) {
                ASSERT_EQ(element.push(scattered_picture(info, n, 8 + 28 * n)), GST_FLOW_OK);
                expect_engine_stream(element, engine, padded_i420(info, n), n);
            }
        }
    }
}

TEST(Formats, FitCropCodesTheMiddle) {
    for (const char* const format : {"I420", "YUY2", "AYUV", "RGB"}) {
        for (const auto& [width, height] : {std::pair{64, 48}, {50, 46}, {37, 39}}) {
            SCOPED_TRACE(format + (" " + std::to_string(width)) + "x" + std::to_string(height));
            const GstVideoInfo info = info_of(format, width, height);
            const ElementHarness element("bitrate=0 fit=crop");
            ASSERT_TRUE(element.set_caps(caps_fields(format, width, height)));
            EXPECT_EQ(element.output_field("width"), std::to_string(width / 16 * 16));
            EXPECT_EQ(element.output_field("height"), std::to_string(height / 16 * 16));
            Encoding engine(width / 16 * 16, height / 16 * 16, {});
            for (int n = 0; n < 3; ++n) {
                ASSERT_EQ(element.push(n), GST_FLOW_OK);
                expect_engine_stream(element, engine, cropped_i420(info, n), n);
            }
        }
    }
}

TEST(Formats, ThreadsDoNotChangeTheStream) {
    const GstVideoInfo info = info_of("I420", 176, 144);
    for (const char* const threads : {"threads=0", "threads=1", "threads=4"}) {
        const ElementHarness element(std::string("bitrate=0 ") + threads);
        ASSERT_TRUE(element.set_caps(caps_fields("I420", 176, 144)));
        Encoding engine(176, 144, {});
        for (int n = 0; n < 6; ++n) {
            ASSERT_EQ(element.push(n), GST_FLOW_OK);
            expect_engine_stream(element, engine, padded_i420(info, n), n);
        }
    }
}

// What the parameter sets say of the pictures, as Tables E-1 and E-3 to E-5 count it.
TEST(Formats, ShapesAndColoursAreThoseOfTheCaps) {
    struct Case {
        const char* fields;
        int sar_width, sar_height, primaries, transfer, matrix;
        std::optional<bool> full_range;
    };
    const Case cases[] = {
        {"format=I420,pixel-aspect-ratio=24/22,colorimetry=bt709", 12, 11, 1, 1, 1, false},
        {"format=I420,pixel-aspect-ratio=0/1,colorimetry=bt2020", 0, 0, 9, 15, 9, false},
        {"format=I420,pixel-aspect-ratio=65536/1,colorimetry=bt601", 0, 0, 6, 6, 6, false},
        // Parts that are not known are left to what goes with the matrix.
        {"format=I420,colorimetry=2:4:0:0", 1, 1, 6, 6, 6, false},
        {"format=I420,colorimetry=1:4:0:0", 1, 1, 1, 13, 6, true},
        // RGB is converted; its primaries and transfer stay.
        {"format=RGB,colorimetry=1:1:5:7", 1, 1, 9, 1, 6, true},
        {"format=RGB,colorimetry=1:1:0:0", 1, 1, 1, 13, 6, true},
    };
    for (const Case& a_case : cases) {
        SCOPED_TRACE(a_case.fields);
        GstCaps* const caps = gst_caps_from_string(
            (std::string("video/x-raw,width=64,height=48,framerate=30/1,") + a_case.fields)
                .c_str());
        GstVideoInfo info;
        ASSERT_TRUE(gst_video_info_from_caps(&info, caps));
        gst_caps_unref(caps);
        const zolt::VideoTraits traits = zolt::describe_input(info).traits;
        EXPECT_EQ(traits.sar_width, a_case.sar_width);
        EXPECT_EQ(traits.sar_height, a_case.sar_height);
        EXPECT_EQ(traits.colour.colour_primaries, a_case.primaries);
        EXPECT_EQ(traits.colour.transfer_characteristics, a_case.transfer);
        EXPECT_EQ(traits.colour.matrix_coefficients, a_case.matrix);
        EXPECT_EQ(traits.colour.video_full_range, a_case.full_range);
    }
}

TEST(Formats, UpstreamIsToldThatRowsMayLieApart) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(caps_fields("I420", 64, 48)));
    GstCaps* const caps = gst_pad_get_current_caps(element.harness()->srcpad);
    GstQuery* const query = gst_query_new_allocation(caps, FALSE);
    ASSERT_TRUE(gst_pad_peer_query(element.harness()->srcpad, query));
    EXPECT_TRUE(gst_query_find_allocation_meta(query, GST_VIDEO_META_API_TYPE, nullptr));
    gst_query_unref(query);
    gst_caps_unref(caps);
}

}  // namespace
}  // namespace zolt_test
