// What changes while pictures go through a running pipeline.

#include <gst/video/video.h>
#include <gtest/gtest.h>

#include <ostream>
#include <string>
#include <vector>

#include "Pipeline.h"

namespace {

constexpr int kPerCaps = 20;  // pictures
constexpr Pipeline::Seconds kLimit{30};

struct Size {
    int width;
    int height;
    bool operator==(const Size& other) const {
        return width == other.width && height == other.height;
    }
};

std::ostream& operator<<(std::ostream& out, const Size& size) {
    return out << size.width << "x" << size.height;
}

Size size_in(GstPad* pad) {
    GstCaps* caps = gst_pad_get_current_caps(pad);
    Size size{};
    gst_structure_get(gst_caps_get_structure(caps, 0), "width", G_TYPE_INT, &size.width, "height",
                      G_TYPE_INT, &size.height, nullptr);
    gst_caps_unref(caps);
    return size;
}

void set_caps(GstElement* filter, const std::string& text) {
    GstCaps* caps = gst_caps_from_string(text.c_str());
    g_object_set(filter, "caps", caps, nullptr);
    gst_caps_unref(caps);
}

class Renegotiation : public testing::TestWithParam<const char*> {};

TEST_P(Renegotiation, EveryPictureComesWithTheCapsInForce) {
    std::string missing;
    if (!has_elements({"videotestsrc", "avdec_h264"}, &missing)) {
        GTEST_SKIP() << "not run: GStreamer has no element " << missing;
    }
    struct Caps {
        const char* text;
        Size size;
        bool same_as_before = false;
    };
    const std::vector<Caps> all = {
        {"video/x-raw,format=I420,width=320,height=240,framerate=30/1", {320, 240}},
        {"video/x-raw,format=I420,width=176,height=144,framerate=30/1", {176, 144}},
        {"video/x-raw,format=I420,width=176,height=144,framerate=30/1", {176, 144}, true},
        {"video/x-raw,format=BGRA,width=176,height=144,framerate=30/1", {176, 144}},
        {"video/x-raw,format=BGRA,width=314,height=230,framerate=25/1", {314, 230}},
        {"video/x-raw,format=YUY2,width=320,height=240,framerate=50/1", {320, 240}},
    };
    const int pictures = kPerCaps * static_cast<int>(all.size());
    Pipeline pipeline("videotestsrc pattern=ball num-buffers=" + std::to_string(pictures) +
                      " ! capsfilter name=filter ! " + encoder("key-int-max=10000 bitrate=500") +
                      " ! video/x-h264,stream-format=" + GetParam() +
                      " ! avdec_h264 ! fakesink name=screen");
    GstElement* filter = pipeline.element("filter");
    set_caps(filter, all[0].text);
    int given = 0;
    pipeline.watch("filter", "src", GST_PAD_PROBE_TYPE_BUFFER, [&](GstPadProbeInfo*) {
        if (++given % kPerCaps == 0 && given < pictures) {
            set_caps(filter, all[given / kPerCaps].text);
        }
        return GST_PAD_PROBE_OK;
    });
    std::vector<int> keys;
    std::vector<Size> coded;
    GstPad* output = gst_element_get_static_pad(pipeline.element("enc"), "src");
    pipeline.watch("enc", "src", GST_PAD_PROBE_TYPE_BUFFER, [&](GstPadProbeInfo* info) {
        if (!GST_BUFFER_FLAG_IS_SET(GST_PAD_PROBE_INFO_BUFFER(info), GST_BUFFER_FLAG_DELTA_UNIT)) {
            keys.push_back(static_cast<int>(coded.size()));
        }
        coded.push_back(size_in(output));
        return GST_PAD_PROBE_OK;
    });
    std::vector<Size> decoded;
    GstPad* screen = gst_element_get_static_pad(pipeline.element("screen"), "sink");
    pipeline.watch("screen", "sink", GST_PAD_PROBE_TYPE_BUFFER, [&](GstPadProbeInfo*) {
        decoded.push_back(size_in(screen));
        return GST_PAD_PROBE_OK;
    });

    pipeline.play();
    EXPECT_TRUE(pipeline.wait(kLimit));
    pipeline.stop();
    gst_object_unref(output);
    gst_object_unref(screen);

    std::vector<int> expected_keys;
    std::vector<Size> expected;
    for (const Caps& caps : all) {
        if (!caps.same_as_before) {
            expected_keys.push_back(static_cast<int>(expected.size()));
        }
        expected.insert(expected.end(), kPerCaps, caps.size);
    }
    EXPECT_EQ(keys, expected_keys);
    EXPECT_EQ(coded, expected);
    EXPECT_EQ(decoded, expected);
}

INSTANTIATE_TEST_SUITE_P(StreamFormats, Renegotiation, testing::Values("avc", "byte-stream"),
                         [](const testing::TestParamInfo<const char*>& tested) {
                             return tested.param[0] == 'a' ? "Avc" : "ByteStream";
                         });

}  // namespace
