#pragma once

#include <gst/check/gstharness.h>
#include <gst/video/video.h>

#include <cstdint>
#include <string>
#include <vector>

namespace zolt_test {

// What an element gives for one picture.
struct Output {
    std::vector<std::uint8_t> bytes;
    bool is_key;
    GstClockTime pts, dts, duration;
};

// The NAL units of a buffer of either stream format, header byte first.
using Units = std::vector<std::vector<std::uint8_t>>;
Units units_of(const std::vector<std::uint8_t>& bytes, bool with_start_codes);

// The element zolth264enc in PLAYING state between two pads, and its bus.
class ElementHarness {
public:
    // Properties as in a pipeline description, "bitrate=0 fit=crop"; what the reader takes, empty
    // for anything.
    explicit ElementHarness(const std::string& properties = "",
                            const std::string& reader_caps = "");
    ~ElementHarness();
    ElementHarness(const ElementHarness&) = delete;
    ElementHarness& operator=(const ElementHarness&) = delete;

    GstHarness* harness() const { return harness_; }
    GstElement* element() const { return harness_->element; }

    // "format=I420,width=64,height=48,framerate=30/1" or more, after "video/x-raw,". False where
    // they are refused.
    bool set_caps(const std::string& fields) const;

    // Pushes a picture of the caps, a moving pattern's number `n`, at that time of the frame rate.
    GstFlowReturn push(int n) const;
    GstFlowReturn push(GstBuffer* buffer) const { return gst_harness_push(harness_, buffer); }

    // Everything that has come out since the last call.
    std::vector<Output> take() const;
    // Pushes pictures `first` to `last` and gives what each became, for instance "KPP": one letter
    // a picture, K for a key frame.
    std::string types(int first, int last) const;

    // A field of the caps that the reader has got, as text; empty where there is none.
    std::string output_field(const char* name) const;

    // The first element error since the last call; empty when there is none.
    std::string error() const;

private:
    GstHarness* harness_;
    GstBus* bus_;
};

// An element's first error on a bus.
std::string pop_error(GstBus* bus);

}  // namespace zolt_test
