#include "ElementHarness.h"

#include <gtest/gtest.h>

#include <memory>

#include "pictures.h"

namespace zolt_test {
namespace {

// Before the first test; listing the tests needs nothing of it.
class GStreamerEnvironment : public ::testing::Environment {
public:
    void SetUp() override {
        g_setenv("GST_PLUGIN_PATH_1_0", ZOLT_ELEMENT_FOLDER, TRUE);
        g_setenv("GST_PLUGIN_SYSTEM_PATH_1_0", "", TRUE);
        g_setenv("GST_REGISTRY_1_0", ZOLT_REGISTRY, TRUE);
        g_setenv("GST_REGISTRY_FORK", "no", TRUE);
        gst_init(nullptr, nullptr);
    }
};
const auto* const gstreamer =
    ::testing::AddGlobalTestEnvironment(std::make_unique<GStreamerEnvironment>().release());

std::string field_text(const GstCaps* caps, const char* name) {
    const GValue* const value = gst_structure_get_value(gst_caps_get_structure(caps, 0), name);
    if (value == nullptr) {
        return "";
    }
    gchar* const text = gst_value_serialize(value);
    const std::string result = text;
    g_free(text);
    return result;
}

}  // namespace

Units units_of(const std::vector<std::uint8_t>& bytes, bool with_start_codes) {
    constexpr std::size_t kPrefix = 4;
    const auto value_at = [&bytes](std::size_t i) {
        return bytes[i] << 24 | bytes[i + 1] << 16 | bytes[i + 2] << 8 | bytes[i + 3];
    };
    Units units;
    std::size_t position = 0;
    while (position + kPrefix <= bytes.size()) {
        const std::size_t start = position + kPrefix;
        std::size_t end = start;
        if (with_start_codes) {
            EXPECT_EQ(value_at(position), 1) << "no start code at " << position;
            while (end < bytes.size() && (end + kPrefix > bytes.size() || value_at(end) != 1)) {
                ++end;
            }
        } else {
            end += static_cast<std::size_t>(value_at(position));
        }
        if (end > bytes.size() || end == start) {
            break;
        }
        units.emplace_back(bytes.begin() + static_cast<std::ptrdiff_t>(start),
                           bytes.begin() + static_cast<std::ptrdiff_t>(end));
        position = end;
    }
    EXPECT_EQ(position, bytes.size()) << "bytes that are no NAL unit";
    return units;
}

ElementHarness::ElementHarness(const std::string& properties, const std::string& reader_caps) {
    // Of one element, no bin is made around it.
    GstElement* const parsed = gst_parse_launch(("zolth264enc " + properties).c_str(), nullptr);
    gst_object_ref_sink(parsed);
    harness_ = gst_harness_new_with_element(parsed, "sink", "src");
    gst_object_unref(parsed);
    if (!reader_caps.empty()) {
        gst_harness_set_sink_caps_str(harness_, reader_caps.c_str());
    }
    bus_ = gst_bus_new();
    gst_element_set_bus(element(), bus_);
}

ElementHarness::~ElementHarness() {
    gst_element_set_bus(element(), nullptr);
    gst_object_unref(bus_);
    gst_harness_teardown(harness_);
}

bool ElementHarness::set_caps(const std::string& fields) const {
    GstCaps* const caps = gst_caps_from_string(("video/x-raw," + fields).c_str());
    EXPECT_NE(caps, nullptr) << fields;
    gst_harness_set_src_caps(harness_, gst_caps_ref(caps));
    GstCaps* got = gst_pad_get_current_caps(GST_PAD_PEER(harness_->srcpad));
    const bool accepted = got != nullptr && gst_caps_is_equal(got, caps) != FALSE;
    gst_clear_caps(&got);
    gst_caps_unref(caps);
    return accepted;
}

GstFlowReturn ElementHarness::push(int n) const {
    GstCaps* const caps = gst_pad_get_current_caps(harness_->srcpad);
    GstVideoInfo info;
    EXPECT_TRUE(gst_video_info_from_caps(&info, caps));
    gst_caps_unref(caps);
    return push(moving_picture(info, n));
}

std::vector<Output> ElementHarness::take() const {
    std::vector<Output> outputs;
    while (GstBuffer* const buffer = gst_harness_try_pull(harness_)) {
        GstMapInfo map;
        gst_buffer_map(buffer, &map, GST_MAP_READ);
        outputs.push_back({{map.data, map.data + map.size},
                           !GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DELTA_UNIT),
                           GST_BUFFER_PTS(buffer),
                           GST_BUFFER_DTS(buffer),
                           GST_BUFFER_DURATION(buffer)});
        gst_buffer_unmap(buffer, &map);
        gst_buffer_unref(buffer);
    }
    return outputs;
}

std::string ElementHarness::types(int first, int last) const {
    std::string text;
    for (int n = first; n <= last; ++n) {
        EXPECT_EQ(push(n), GST_FLOW_OK);
        for (const Output& output : take()) {
            text += output.is_key ? 'K' : 'P';
        }
    }
    return text;
}

std::string ElementHarness::output_field(const char* name) const {
    GstCaps* const caps = gst_pad_get_current_caps(harness_->sinkpad);
    if (caps == nullptr) {
        return "";
    }
    const std::string text = field_text(caps, name);
    gst_caps_unref(caps);
    return text;
}

std::string ElementHarness::error() const {
    return pop_error(bus_);
}

std::string pop_error(GstBus* bus) {
    std::string text;
    while (GstMessage* const message = gst_bus_pop_filtered(bus, GST_MESSAGE_ERROR)) {
        GError* error = nullptr;
        gst_message_parse_error(message, &error, nullptr);
        if (text.empty()) {
            text = error->message;
        }
        g_error_free(error);
        gst_message_unref(message);
    }
    return text;
}

}  // namespace zolt_test
