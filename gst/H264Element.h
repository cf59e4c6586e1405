#pragma once

#include <gst/video/video.h>

#include <functional>
#include <memory>
#include <mutex>
#include <string>

#include "CodingTally.h"
#include "PictureEncoder.h"
#include "session/EncoderLibrary.h"

namespace zolt {

// What an element does beyond its base class: the operations of that name of GstVideoEncoder, which
// tell failures by ToolErrors. Properties may be set and asked for on any thread.
class H264Element {
public:
    // The element that this object is part of.
    explicit H264Element(GstVideoEncoder* element) : element_(element) {}

    // Properties.
    PictureEncoder::Settings settings() const;
    // `change` alters the settings while no other thread can.
    void change_settings(const std::function<void(PictureEncoder::Settings&)>& change);
    std::string plugin_path() const;
    void set_plugin_path(const std::string& path);
    CodingTally tally() const;

    void open();
    void close();
    void start();
    void stop();
    // False: downstream refuses the stream.
    bool set_format(GstVideoCodecState* input);
    // Decides on the source caps; the base class sends them.
    void set_source_caps();
    // Takes the frame in every case.
    GstFlowReturn handle_frame(GstVideoCodecFrame* frame);
    // Writes the picture that has been coded last the way that downstream wants it by then.
    GstFlowReturn pre_push(GstVideoCodecFrame* frame);
    void finish();
    void flush();

private:
    struct FrameRelease {
        void operator()(GstVideoCodecFrame* frame) const { gst_video_codec_frame_unref(frame); }
    };
    using FrameOwner = std::unique_ptr<GstVideoCodecFrame, FrameRelease>;

    struct StateRelease {
        void operator()(GstVideoCodecState* state) const { gst_video_codec_state_unref(state); }
    };
    using StateOwner = std::unique_ptr<GstVideoCodecState, StateRelease>;

    bool is_late(const GstVideoCodecFrame* frame) const;
    GstFlowReturn negotiate();
    GstFlowReturn encode_and_push(FrameOwner frame);
    AccessUnit unit_of(const GstVideoCodecFrame* frame, StreamFormat format) const;
    PictureEncoder::Picture encode(GstVideoCodecFrame* frame);
    void send_tags();
    StreamFormat choose_stream_format() const;

    GstVideoEncoder* const element_;

    mutable std::mutex mutex_;  // of the properties
    PictureEncoder::Settings settings_;
    std::string plugin_path_;
    CodingTally tally_;

    // Of the streaming thread, or of the one that changes the state while that does not run.
    std::unique_ptr<EncoderLibrary> library_;
    std::unique_ptr<PictureEncoder> encoder_;  // null until there are caps
    StateOwner input_;
    std::int64_t coded_before_ = 0;  // with other caps, microseconds
    int announced_kbs_ = 0;          // in the tags
    StreamFormat stream_format_ = StreamFormat::byte_stream;
};

}  // namespace zolt
