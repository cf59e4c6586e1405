// A call between two webrtcbin elements of one pipeline, over the machine's own network.

#include <gst/sdp/sdp.h>
#include <gst/video/video.h>
#include <gst/webrtc/webrtc.h>
#include <gtest/gtest.h>

#include <atomic>
#include <stdexcept>

#include "Pipeline.h"

namespace {

constexpr Pipeline::Seconds kLimit{20};

GstClockTime time_of(GstPadProbeInfo* info) {
    const bool is_list = (GST_PAD_PROBE_INFO_TYPE(info) & GST_PAD_PROBE_TYPE_BUFFER_LIST) != 0;
    return GST_BUFFER_PTS(is_list ? gst_buffer_list_get(GST_PAD_PROBE_INFO_BUFFER_LIST(info), 0)
                                  : GST_PAD_PROBE_INFO_BUFFER(info));
}

bool is_key(GstPadProbeInfo* info) {
    return !GST_BUFFER_FLAG_IS_SET(GST_PAD_PROBE_INFO_BUFFER(info), GST_BUFFER_FLAG_DELTA_UNIT);
}

/** The answer of a promise that has one, named `name`. The caller frees it. */
GstWebRTCSessionDescription* description_in(GstPromise* promise, const char* name) {
    GstWebRTCSessionDescription* description = nullptr;
    gst_structure_get(gst_promise_get_reply(promise), name, GST_TYPE_WEBRTC_SESSION_DESCRIPTION,
                      &description, nullptr);
    gst_promise_unref(promise);
    return description;
}

/** The encoder's pictures from a sender to a receiver, which decodes them. */
class Call {
public:
    Call();
    ~Call() { pipeline.stop(); }

    /** Waits for so many pictures. Until the first comes the receiver asks for a key frame: packets
     *  that are sent before it has the keys of the call are lost, and it cannot know of them. */
    bool receives(int count);

    /** Waits until many pictures in a row have come without a key frame made or received: none is
     * on its way. */
    bool settles();

    /** Asks the encoder for a key frame, as an application may, and loses all its packets. */
    void lose_a_key_frame();

    Pipeline pipeline;
    std::atomic<int> keys_sent{0};
    std::atomic<int> keys_received{0};
    std::atomic<int> requests{0};
    std::atomic<int> pictures{0};

private:
    void connect_candidates(GstElement* from, GstElement* to);
    void offer();
    void answer();
    void receive(GstPad* pad);

    GstElement* const sender_;
    GstElement* const receiver_;
    std::atomic<bool> is_connected_{false};
    std::atomic<bool> lose_{false};
    GstClockTime lost_ = GST_CLOCK_TIME_NONE;  // of the sending thread
};

Call::Call()
    // The key-frame interval is longer than any call: a later key frame was asked for.
    : pipeline(
          "videotestsrc is-live=true pattern=ball ! "
          "video/x-raw,format=I420,width=320,height=240,framerate=30/1 ! " +
          encoder("key-int-max=10000 bitrate=500") +
          " ! rtph264pay name=pay config-interval=-1 ! application/x-rtp,media=video,"
          "encoding-name=H264,payload=96,rtcp-fb-nack-pli=true ! "
          "webrtcbin name=sender bundle-policy=max-bundle "
          "webrtcbin name=receiver bundle-policy=max-bundle"),
      sender_(pipeline.element("sender")),
      receiver_(pipeline.element("receiver")) {
    connect_candidates(sender_, receiver_);
    connect_candidates(receiver_, sender_);
    g_signal_connect_swapped(sender_, "on-negotiation-needed",
                             G_CALLBACK(+[](Call* call) { call->offer(); }), this);
    g_signal_connect_swapped(receiver_, "pad-added",
                             G_CALLBACK(+[](Call* call, GstPad* pad) { call->receive(pad); }),
                             this);

    pipeline.watch("enc", "src", GST_PAD_PROBE_TYPE_BUFFER, [this](GstPadProbeInfo* info) {
        if (is_key(info)) {
            ++keys_sent;
            if (lose_.exchange(false)) {
                lost_ = time_of(info);
            }
        }
        return GST_PAD_PROBE_OK;
    });
    pipeline.watch("enc", "src", GST_PAD_PROBE_TYPE_EVENT_UPSTREAM, [this](GstPadProbeInfo* info) {
        if (gst_video_event_is_force_key_unit(GST_PAD_PROBE_INFO_EVENT(info))) {
            ++requests;
        }
        return GST_PAD_PROBE_OK;
    });
    pipeline.watch(
        "pay", "src",
        static_cast<GstPadProbeType>(GST_PAD_PROBE_TYPE_BUFFER | GST_PAD_PROBE_TYPE_BUFFER_LIST),
        [this](GstPadProbeInfo* info) {
            // Packets have their picture's time, those of its parameter sets too.
            return time_of(info) == lost_ ? GST_PAD_PROBE_DROP : GST_PAD_PROBE_OK;
        });
}

void Call::connect_candidates(GstElement* from, GstElement* to) {
    // No address but this one: the test needs no network, and nothing leaves the machine.
    GObject* agent = nullptr;
    gboolean added = FALSE;
    g_object_get(from, "ice-agent", &agent, nullptr);
    g_signal_emit_by_name(agent, "add-local-ip-address", "127.0.0.1", &added);
    g_object_unref(agent);
    if (!added) {
        throw std::runtime_error("webrtcbin does not take the local address 127.0.0.1");
    }
    g_signal_connect(from, "on-ice-candidate",
                     G_CALLBACK(+[](GstElement*, guint line, gchar* candidate, GstElement* other) {
                         g_signal_emit_by_name(other, "add-ice-candidate", line, candidate);
                     }),
                     to);
}

void Call::offer() {
    g_signal_emit_by_name(
        sender_, "create-offer", nullptr,
        gst_promise_new_with_change_func(
            [](GstPromise* promise, gpointer data) {
                auto* call = static_cast<Call*>(data);
                GstWebRTCSessionDescription* offered = description_in(promise, "offer");
                g_signal_emit_by_name(call->sender_, "set-local-description", offered, nullptr);
                g_signal_emit_by_name(call->receiver_, "set-remote-description", offered, nullptr);
                gst_webrtc_session_description_free(offered);
                call->answer();
            },
            this, nullptr));
}

void Call::answer() {
    g_signal_emit_by_name(
        receiver_, "create-answer", nullptr,
        gst_promise_new_with_change_func(
            [](GstPromise* promise, gpointer data) {
                auto* call = static_cast<Call*>(data);
                GstWebRTCSessionDescription* answered = description_in(promise, "answer");
                g_signal_emit_by_name(call->receiver_, "set-local-description", answered, nullptr);
                g_signal_emit_by_name(call->sender_, "set-remote-description", answered, nullptr);
                gst_webrtc_session_description_free(answered);
            },
            this, nullptr));
}

void Call::receive(GstPad* pad) {
    if (GST_PAD_DIRECTION(pad) != GST_PAD_SRC) {
        return;
    }
    GstElement* player = gst_parse_bin_from_description(
        "queue ! rtph264depay name=depay request-keyframe=true wait-for-keyframe=true ! "
        "avdec_h264 ! fakesink name=screen sync=false signal-handoffs=true",
        TRUE, nullptr);
    gst_bin_add(pipeline.bin(), player);
    pipeline.watch("depay", "src", GST_PAD_PROBE_TYPE_BUFFER, [this](GstPadProbeInfo* info) {
        keys_received += is_key(info) ? 1 : 0;
        return GST_PAD_PROBE_OK;
    });
    g_signal_connect_swapped(pipeline.element("screen"), "handoff",
                             G_CALLBACK(+[](Call* call) { ++call->pictures; }), this);
    gst_element_sync_state_with_parent(player);
    GstPad* sink = gst_element_get_static_pad(player, "sink");
    gst_pad_link(pad, sink);
    gst_object_unref(sink);
    is_connected_ = true;
}

bool Call::receives(int count) {
    for (int tries = 0; tries < kLimit.count() && pictures == 0; ++tries) {
        if (!pipeline.wait(Pipeline::Seconds(1), [&] { return pictures > 0; }) && is_connected_) {
            GstPad* sink = gst_element_get_static_pad(pipeline.element("depay"), "sink");
            gst_pad_push_event(
                sink, gst_video_event_new_upstream_force_key_unit(GST_CLOCK_TIME_NONE, TRUE, 0));
            gst_object_unref(sink);
        }
    }
    return pipeline.wait(kLimit, [&] { return pictures >= count; });
}

bool Call::settles() {
    constexpr int kInARow = 30;
    constexpr int kTries = 5;
    for (int n = 0; n < kTries; ++n) {
        const int keys = keys_sent + keys_received;
        if (!receives(pictures + kInARow)) {
            return false;
        }
        if (keys_sent + keys_received == keys) {
            return true;
        }
    }
    return false;
}

void Call::lose_a_key_frame() {
    lose_ = true;
    gst_element_send_event(pipeline.element("enc"), gst_video_event_new_upstream_force_key_unit(
                                                        GST_CLOCK_TIME_NONE, TRUE, 1));
}

TEST(WebRtc, ALostKeyFrameIsAskedForAndComes) {
    std::string missing;
    if (!has_elements({"webrtcbin", "nicesrc", "dtlsenc", "srtpenc", "rtph264pay", "avdec_h264"},
                      &missing)) {
        GTEST_SKIP() << "not run: GStreamer has no element " << missing;
    }
    Call call;
    call.pipeline.play();
    ASSERT_TRUE(call.settles()) << call.pictures << " pictures came, of " << call.keys_sent
                                << " key frames " << call.keys_received << ", after "
                                << call.requests << " requests";

    const int sent = call.keys_sent;
    const int received = call.keys_received;
    call.lose_a_key_frame();
    const int requests = call.requests;
    ASSERT_TRUE(call.pipeline.wait(kLimit, [&] { return call.keys_received > received; }))
        << "no key frame came after " << call.keys_sent - sent << " sent and "
        << call.requests - requests << " requests";
    // One was asked for by the application and lost, one by the receiver.
    EXPECT_GE(call.keys_sent, sent + 2);
    EXPECT_GT(call.requests, requests);

    const int pictures = call.pictures;
    EXPECT_TRUE(call.receives(pictures + 30))
        << call.pictures - pictures << " pictures came after the key frame";
}

}  // namespace
