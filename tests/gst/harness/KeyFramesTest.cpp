#include <gtest/gtest.h>

#include <memory>
#include <optional>

#include "ElementHarness.h"
#include "common/BitReader.h"
#include "common/Decoder.h"
#include "common/Encoding.h"
#include "pictures.h"

namespace zolt_test {
namespace {

constexpr const char* kCaps = "format=I420,width=64,height=48,framerate=30/1";

void ask_from_downstream(const ElementHarness& element,
                         GstClockTime running_time = GST_CLOCK_TIME_NONE) {
    gst_harness_push_upstream_event(
        element.harness(), gst_video_event_new_upstream_force_key_unit(running_time, TRUE, 0));
}

void ask_from_upstream(const ElementHarness& element, GstClockTime time = GST_CLOCK_TIME_NONE) {
    gst_harness_push_event(element.harness(), gst_video_event_new_downstream_force_key_unit(
                                                  time, time, time, TRUE, 0));
}

TEST(KeyFrames, ComeAtTheInterval) {
    const ElementHarness element("key-int-max=4");
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 9), "KPPPKPPPKP");
    g_object_set(element.element(), "key-int-max", 3, nullptr);
    // The type follows the number of the picture since the stream began.
    EXPECT_EQ(element.types(10, 15), "PPKPPK");
}

TEST(KeyFrames, ComeWhenEitherSideAsks) {
    for (const bool from_downstream : {true, false}) {
        SCOPED_TRACE(from_downstream ? "downstream" : "upstream");
        const auto ask = from_downstream ? ask_from_downstream : ask_from_upstream;
        const ElementHarness element;
        ask(element, GST_CLOCK_TIME_NONE);
        ASSERT_TRUE(element.set_caps(kCaps));
        EXPECT_EQ(element.types(0, 3), "KPPP");
        ask(element, GST_CLOCK_TIME_NONE);
        EXPECT_EQ(element.types(4, 6), "KPP");
        // Several at once are one.
        ask(element, GST_CLOCK_TIME_NONE);
        ask(element, GST_CLOCK_TIME_NONE);
        ask(element, GST_CLOCK_TIME_NONE);
        EXPECT_EQ(element.types(7, 10), "KPPP");
        // One that is to come later is kept until then.
        ask(element, 13 * GST_SECOND / 30);
        EXPECT_EQ(element.types(11, 15), "PPKPP");
    }
}

TEST(KeyFrames, OneIsMadeForBothSides) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 1), "KP");
    ask_from_downstream(element);
    ask_from_upstream(element);
    EXPECT_EQ(element.types(2, 5), "KPPP");
}

TEST(KeyFrames, ThoseAskedForHaveParameterSetsAndAnEventInFront) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 2), "KPP");
    while (GstEvent* const event = gst_harness_try_pull_event(element.harness())) {
        gst_event_unref(event);
    }
    ask_from_downstream(element);
    ASSERT_EQ(element.push(3), GST_FLOW_OK);
    const std::vector<Output> outputs = element.take();
    ASSERT_EQ(outputs.size(), 1u);
    const Units units = units_of(outputs[0].bytes, true);
    ASSERT_EQ(units.size(), 3u);
    EXPECT_EQ(units[0][0], 0x47);
    EXPECT_EQ(units[1][0], 0x48);
    EXPECT_EQ(units[2][0] & 31, 5);
    bool announced = false;
    while (GstEvent* const event = gst_harness_try_pull_event(element.harness())) {
        announced = announced || gst_video_event_is_force_key_unit(event) != FALSE;
        gst_event_unref(event);
    }
    EXPECT_TRUE(announced);
}

// Clause 7.4.3: two IDR pictures in a row differ in idr_pic_id, though each begins a stream. The
// slices stay what they are otherwise: a decoder gives what the engine has reconstructed.
TEST(KeyFrames, SeveralInARowAreDifferentPictures) {
    GstVideoInfo info;
    gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, 64, 48);
    const ElementHarness element("bitrate=0");
    ASSERT_TRUE(element.set_caps(kCaps));
    Decoder decoder(64, 48);
    std::unique_ptr<Encoding> engine;
    std::optional<unsigned> last_id;
    for (int n = 0; n < 12; ++n) {
        const bool is_asked_for = n % 6 < 4;
        if (is_asked_for) {
            ask_from_downstream(element);
            engine = std::make_unique<Encoding>(64, 48, Settings{});
        }
        ASSERT_EQ(element.push(n), GST_FLOW_OK);
        const std::vector<Output> outputs = element.take();
        ASSERT_EQ(outputs.size(), 1u);
        ASSERT_EQ(outputs[0].is_key, is_asked_for);
        Units units = units_of(outputs[0].bytes, true);
        std::vector<std::uint8_t> nal = units.back();
        units.pop_back();
        for (const auto& set : units) {
            decoder.send_parameter_set(set.data(), static_cast<int>(set.size()));
        }
        BitReader reader = BitReader::of_nal(nal.data(), nal.size());
        const unsigned id = SliceHeader(nal[0], reader).idr_pic_id;
        EXPECT_FALSE(is_asked_for && last_id == id) << "picture " << n;
        last_id = is_asked_for ? std::optional(id) : std::nullopt;
        engine->encode(padded_i420(info, n).data());
        decoder.send_picture(nal.data(), static_cast<int>(nal.size()), engine->reconstruction());
    }
    EXPECT_EQ(decoder.finish(), "");
}

TEST(KeyFrames, TheSameCapsAgainMakeNone) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 2), "KPP");
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(3, 5), "PPP");
}

TEST(KeyFrames, AFlushMakesOne) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 3), "KPPP");
    gst_harness_push_event(element.harness(), gst_event_new_flush_start());
    gst_harness_push_event(element.harness(), gst_event_new_flush_stop(TRUE));
    GstSegment segment;
    gst_segment_init(&segment, GST_FORMAT_TIME);
    gst_harness_push_event(element.harness(), gst_event_new_segment(&segment));
    EXPECT_EQ(element.types(0, 2), "KPP");
}

}  // namespace
}  // namespace zolt_test
