#include <gtest/gtest.h>

#include "ElementHarness.h"

namespace zolt_test {
namespace {

constexpr const char* kCaps = "format=I420,width=320,height=240,framerate=30/1";

struct Stats {
    guint64 pictures, key_frames, bits;
    gdouble bit_rate;
};

Stats stats_of(const ElementHarness& element) {
    GstStructure* structure = nullptr;
    g_object_get(element.element(), "stats", &structure, nullptr);
    Stats stats{};
    EXPECT_TRUE(gst_structure_get(structure, "pictures", G_TYPE_UINT64, &stats.pictures,
                                  "key-frames", G_TYPE_UINT64, &stats.key_frames, "bits",
                                  G_TYPE_UINT64, &stats.bits, "bitrate", G_TYPE_DOUBLE,
                                  &stats.bit_rate, nullptr));
    gst_structure_free(structure);
    return stats;
}

guint get_uint(const ElementHarness& element, const char* name) {
    guint value = 0;
    g_object_get(element.element(), name, &value, nullptr);
    return value;
}

std::size_t bytes_of(const std::vector<Output>& outputs) {
    std::size_t bytes = 0;
    for (const Output& output : outputs) {
        bytes += output.bytes.size();
    }
    return bytes;
}

// The tag of the last tag event that has it, as text.
std::string last_tag(const ElementHarness& element, const char* name) {
    std::string text;
    while (GstEvent* const event = gst_harness_try_pull_event(element.harness())) {
        GstTagList* tags = nullptr;
        if (GST_EVENT_TYPE(event) == GST_EVENT_TAG) {
            gst_event_parse_tag(event, &tags);
        }
        const GValue* const value =
            tags == nullptr ? nullptr : gst_tag_list_get_value_index(tags, name, 0);
        if (value != nullptr) {
            gchar* const contents = g_strdup_value_contents(value);
            text = contents;
            g_free(contents);
        }
        gst_event_unref(event);
    }
    return text;
}

TEST(Properties, BitRateChangesWithoutAKeyFrame) {
    const ElementHarness element("bitrate=100 key-int-max=1000");
    ASSERT_TRUE(element.set_caps(kCaps));
    const auto bytes_of_pictures = [&element](int first, int last) {
        for (int n = first; n <= last; ++n) {
            EXPECT_EQ(element.push(n), GST_FLOW_OK);
        }
        const std::vector<Output> outputs = element.take();
        EXPECT_EQ(outputs.size(), static_cast<std::size_t>(last - first + 1));
        for (std::size_t i = first == 0 ? 1 : 0; i < outputs.size(); ++i) {
            EXPECT_FALSE(outputs[i].is_key) << first + static_cast<int>(i);
        }
        return bytes_of(outputs);
    };
    bytes_of_pictures(0, 29);
    const std::size_t low = bytes_of_pictures(30, 59);
    g_object_set(element.element(), "bitrate", 3000, nullptr);
    bytes_of_pictures(60, 89);
    const std::size_t high = bytes_of_pictures(90, 119);
    EXPECT_GT(high, 2 * low);
}

// The level that a larger bit rate needs is told when the decoder next looks.
TEST(Properties, ALargerBitRateRaisesTheLevelWithTheNextKeyFrame) {
    const ElementHarness element("bitrate=500 key-int-max=6", "video/x-h264,stream-format=avc");
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.output_field("level"), "1.3");
    const std::string sets = element.output_field("codec_data");
    EXPECT_EQ(element.types(0, 2), "KPP");
    g_object_set(element.element(), "bitrate", 3000, nullptr);
    EXPECT_EQ(element.types(3, 5), "PPP");
    EXPECT_EQ(element.output_field("codec_data"), sets);
    EXPECT_EQ(element.types(6, 6), "K");
    EXPECT_EQ(element.output_field("level"), "2.1");
    EXPECT_NE(element.output_field("codec_data"), sets);
    // A decoder made for it is not told to be smaller again.
    g_object_set(element.element(), "bitrate", 500, nullptr);
    EXPECT_EQ(element.types(7, 12), "PPPPPK");
    EXPECT_EQ(element.output_field("level"), "2.1");
}

// What the engine would end the process for never reaches it.
TEST(Properties, OutOfRangeIsRefused) {
    const ElementHarness element;
    for (const auto& [name, bad, good] :
         {std::tuple{"bitrate", 4001u, 4000u}, {"key-int-max", 0u, 1u}, {"threads", 1000u, 2u}}) {
        SCOPED_TRACE(name);
        g_object_set(element.element(), name, good, nullptr);
        EXPECT_EQ(get_uint(element, name), good);
        const GLogLevelFlags fatal = g_log_set_always_fatal(G_LOG_LEVEL_ERROR);
        g_object_set(element.element(), name, bad, nullptr);
        g_log_set_always_fatal(fatal);
        EXPECT_EQ(get_uint(element, name), good);
    }
}

TEST(Properties, AnyFrameRateIsCoded) {
    for (const char* const rate :
         {"2147483647/1", "1/2147483647", "1/1", "0/1", "30000/1001", "1000/1"}) {
        SCOPED_TRACE(rate);
        const ElementHarness element("bitrate=4000");
        ASSERT_TRUE(
            element.set_caps(std::string("format=I420,width=32,height=16,framerate=") + rate));
        EXPECT_EQ(element.types(0, 4), "KPPPP");
        EXPECT_EQ(element.error(), "");
    }
}

TEST(Properties, BitRateInForceOutlivesANewBeginning) {
    const auto bytes_at = [](const char* start, guint later) {
        const ElementHarness element(std::string("key-int-max=1000 bitrate=") + start);
        EXPECT_TRUE(element.set_caps(kCaps));
        element.types(0, 2);
        g_object_set(element.element(), "bitrate", later, nullptr);
        element.types(3, 5);
        gst_harness_push_upstream_event(
            element.harness(),
            gst_video_event_new_upstream_force_key_unit(GST_CLOCK_TIME_NONE, TRUE, 0));
        for (int n = 6; n < 60; ++n) {
            EXPECT_EQ(element.push(n), GST_FLOW_OK);
        }
        return bytes_of(element.take());
    };
    EXPECT_GT(bytes_at("100", 3000), 2 * bytes_at("3000", 100));
}

TEST(Properties, StatsCountWhatCameOut) {
    const ElementHarness element("bitrate=400 key-int-max=20");
    EXPECT_EQ(stats_of(element).pictures, 0u);
    EXPECT_EQ(stats_of(element).bit_rate, 0.0);
    ASSERT_TRUE(element.set_caps(kCaps));
    guint64 bits = 0;
    for (int n = 0; n < 45; ++n) {
        ASSERT_EQ(element.push(n), GST_FLOW_OK);
        for (const Output& output : element.take()) {
            bits += units_of(output.bytes, true).back().size() * 8;
        }
    }
    const Stats stats = stats_of(element);
    EXPECT_EQ(stats.pictures, 45u);
    EXPECT_EQ(stats.key_frames, 3u);
    EXPECT_EQ(stats.bits, bits);
    EXPECT_NEAR(stats.bit_rate, static_cast<double>(bits) / 1.5 / 1000, 0.1);
}

// Neither other caps nor a jump to another place of the source take away from the time coded.
TEST(Properties, StatsGoOnUntilTheElementIsStopped) {
    const ElementHarness element("bitrate=400");
    ASSERT_TRUE(element.set_caps(kCaps));
    element.types(0, 29);
    ASSERT_TRUE(element.set_caps("format=I420,width=64,height=48,framerate=30/1"));
    element.types(30, 44);
    gst_harness_push_event(element.harness(), gst_event_new_flush_start());
    gst_harness_push_event(element.harness(), gst_event_new_flush_stop(TRUE));
    GstSegment segment;
    gst_segment_init(&segment, GST_FORMAT_TIME);
    gst_harness_push_event(element.harness(), gst_event_new_segment(&segment));
    element.types(30000, 30014);
    const Stats stats = stats_of(element);
    EXPECT_EQ(stats.pictures, 60u);
    EXPECT_NEAR(stats.bit_rate, static_cast<double>(stats.bits) / 2.0 / 1000, 0.1);

    gst_element_set_state(element.element(), GST_STATE_READY);
    EXPECT_EQ(stats_of(element).pictures, 60u);
    gst_element_set_state(element.element(), GST_STATE_PLAYING);
    EXPECT_EQ(stats_of(element).pictures, 0u);
}

TEST(Properties, TagsNameTheEncoderAndItsBitRate) {
    const ElementHarness element("bitrate=700");
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.types(0, 1), "KP");
    gst_harness_push_event(element.harness(), gst_event_new_eos());
    EXPECT_EQ(last_tag(element, GST_TAG_ENCODER), "\"ZOLT H.264 Video Encoder\"");

    const ElementHarness second("bitrate=700");
    ASSERT_TRUE(second.set_caps(kCaps));
    EXPECT_EQ(second.types(0, 1), "KP");
    EXPECT_EQ(last_tag(second, GST_TAG_NOMINAL_BITRATE), "700000");

    const ElementHarness third;
    ASSERT_TRUE(third.set_caps(kCaps));
    EXPECT_EQ(third.types(0, 0), "K");
    EXPECT_NE(last_tag(third, GST_TAG_VIDEO_CODEC).find("H.264"), std::string::npos);

    g_object_set(second.element(), "bitrate", 900, nullptr);
    EXPECT_EQ(second.types(2, 3), "PP");
    EXPECT_EQ(last_tag(second, GST_TAG_NOMINAL_BITRATE), "900000");
}

TEST(Properties, NoLatency) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    GstQuery* const query = gst_query_new_latency();
    ASSERT_TRUE(gst_pad_peer_query(element.harness()->sinkpad, query));
    gboolean live = FALSE;
    GstClockTime least = 1;
    GstClockTime most = 1;
    gst_query_parse_latency(query, &live, &least, &most);
    EXPECT_EQ(least, 0u);
    gst_query_unref(query);
}

// Pictures that are late are left out when QoS is asked for, key frames that somebody waits for
// excepted.
TEST(Properties, LatePicturesAreLeftOutOnDemand) {
    for (const bool with_qos : {false, true}) {
        SCOPED_TRACE(with_qos);
        const ElementHarness element(with_qos ? "qos=true" : "qos=false");
        ASSERT_TRUE(element.set_caps(kCaps));
        EXPECT_EQ(element.types(0, 1), "KP");
        gst_harness_push_upstream_event(
            element.harness(), gst_event_new_qos(GST_QOS_TYPE_UNDERFLOW, 2.0, GST_SECOND, 0));
        EXPECT_EQ(element.types(2, 4), with_qos ? "" : "PPP");
        gst_harness_push_upstream_event(
            element.harness(),
            gst_video_event_new_upstream_force_key_unit(GST_CLOCK_TIME_NONE, TRUE, 0));
        EXPECT_EQ(element.types(5, 5), "K");
    }
}

}  // namespace
}  // namespace zolt_test
