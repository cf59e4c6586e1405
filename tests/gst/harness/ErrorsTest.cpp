#include <gtest/gtest.h>

#include "ElementHarness.h"

namespace zolt_test {
namespace {

using ::testing::internal::RE;

constexpr const char* kCaps = "format=I420,width=64,height=48,framerate=30/1";

void expect_text(const std::string& text, const std::string& pattern) {
    EXPECT_TRUE(RE::FullMatch(text, RE(".*" + pattern + ".*"))) << text << "\nis not " << pattern;
}

// Makes the stub library misbehave in one way.
class Misbehaviour {
public:
    explicit Misbehaviour(const char* how) { g_setenv("ZOLT_STUB", how, TRUE); }
    ~Misbehaviour() { g_unsetenv("ZOLT_STUB"); }
    Misbehaviour(const Misbehaviour&) = delete;
    Misbehaviour& operator=(const Misbehaviour&) = delete;
};

std::string stub_path() {
    return std::string("plugin-path=") + ZOLT_STUB_ENCODER;
}

// The error of the way from NULL to READY; empty where that succeeds.
std::string error_of_opening(const std::string& plugin_path) {
    GstElement* const element = gst_element_factory_make("zolth264enc", nullptr);
    gst_object_ref_sink(element);
    GstBus* const bus = gst_bus_new();
    gst_element_set_bus(element, bus);
    g_object_set(element, "plugin-path", plugin_path.c_str(), nullptr);
    const bool opened = gst_element_set_state(element, GST_STATE_READY) != GST_STATE_CHANGE_FAILURE;
    gst_element_set_state(element, GST_STATE_NULL);
    const std::string error = pop_error(bus);
    EXPECT_EQ(opened, error.empty()) << error;
    gst_element_set_bus(element, nullptr);
    gst_object_unref(bus);
    gst_object_unref(element);
    return error;
}

TEST(Errors, OfTheLibraryComeWithReady) {
    EXPECT_EQ(error_of_opening(""), "");
    EXPECT_EQ(error_of_opening(ZOLT_PLUGIN_FILE), "");
    expect_text(error_of_opening("/nowhere/libencoder.so"),
                "/nowhere/libencoder.so: cannot be loaded as the encoder library (.*No such file.*"
                "); name the right one with the property plugin-path");
    expect_text(error_of_opening(ZOLT_NO_ENCODER),
                "is no encoder library: it does not export GetEncoderType");
    const Misbehaviour wrong("type");
    expect_text(error_of_opening(ZOLT_STUB_ENCODER),
                "is an encoder of type Video JPEG, not Video AVC");
}

TEST(Errors, OfTheSessionHaveItsText) {
    const Misbehaviour refuses("refuse");
    const ElementHarness element(stub_path());
    element.set_caps(kCaps);
    EXPECT_EQ(element.error(), "the encoder refuses the input: reason 42");
    EXPECT_NE(element.push(0), GST_FLOW_OK);
}

TEST(Errors, NoEncoderObject) {
    const Misbehaviour gives_null("null");
    const ElementHarness element(stub_path());
    element.set_caps(kCaps);
    expect_text(element.error(), "gives no encoder object");
}

TEST(Errors, OfOneElementStayIts) {
    const Misbehaviour refuses("refuse");
    const ElementHarness good;
    const ElementHarness bad(stub_path());
    ASSERT_TRUE(good.set_caps(kCaps));
    bad.set_caps(kCaps);
    EXPECT_EQ(bad.error(), "the encoder refuses the input: reason 42");
    EXPECT_EQ(good.types(0, 2), "KPP");
    EXPECT_EQ(good.error(), "");
    // An error that has been told is not told again.
    g_setenv("ZOLT_STUB", "null", TRUE);
    const ElementHarness other(stub_path());
    other.set_caps(kCaps);
    expect_text(other.error(), "gives no encoder object");
}

TEST(Errors, OfTheCapsSayWhatWouldBeRight) {
    struct Case {
        const char* fields;
        const char* error;
    };
    const Case cases[] = {
        {"format=I420,width=16880,height=16880,framerate=30/1",
         "picture size 16880x16880 is too large: the largest has"},
        {"format=I420,width=16869,height=2120,framerate=30/1",
         "padded to multiples of 16, the picture size 16880x2128 is too large.*fit=crop takes"},
        {"format=I420,width=64,height=48,framerate=30/1,interlace-mode=interleaved",
         "interlaced pictures cannot be coded; put deinterlace in front"},
    };
    for (const Case& a_case : cases) {
        SCOPED_TRACE(a_case.fields);
        const ElementHarness element;
        ASSERT_TRUE(element.set_caps(kCaps));
        EXPECT_EQ(element.types(0, 1), "KP");
        element.set_caps(a_case.fields);
        expect_text(element.error(), a_case.error);
        // Better ones are taken all the same. Those before are still in force.
        EXPECT_TRUE(element.set_caps(kCaps));
        EXPECT_EQ(element.types(2, 3), "PP");
    }
}

TEST(Errors, SizesBelowAMacroblockAreNotNegotiated) {
    const ElementHarness element;
    GstCaps* const caps =
        gst_caps_from_string("video/x-raw,format=I420,width=15,height=16,framerate=30/1");
    EXPECT_FALSE(gst_pad_peer_query_accept_caps(element.harness()->srcpad, caps));
    gst_caps_unref(caps);
}

TEST(Errors, ABufferThatHoldsNoPictureOfItsCaps) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    EXPECT_EQ(element.push(gst_buffer_new_allocate(nullptr, 100, nullptr)), GST_FLOW_ERROR);
    expect_text(element.error(), "a buffer cannot be read as a picture of its caps");
}

}  // namespace
}  // namespace zolt_test
