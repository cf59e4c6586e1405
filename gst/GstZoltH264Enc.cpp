#include "GstZoltH264Enc.h"

#include <exception>
#include <string>

#include "H264Element.h"
#include "debug_category.h"
#include "input_caps.h"

G_DEFINE_TYPE(GstZoltH264Enc, gst_zolt_h264_enc, GST_TYPE_VIDEO_ENCODER)
GST_ELEMENT_REGISTER_DEFINE(zolth264enc, "zolth264enc", GST_RANK_SECONDARY,
                            gst_zolt_h264_enc_get_type())

namespace {

using zolt::EncoderSession;
using zolt::H264Element;
using zolt::PictureEncoder;
using Fit = PictureEncoder::Fit;

enum Property { kBitRate = 1, kKeyIntMax, kThreads, kFit, kPluginPath, kStats };

GstStaticPadTemplate sink_template =
    GST_STATIC_PAD_TEMPLATE("sink", GST_PAD_SINK, GST_PAD_ALWAYS,
                            GST_STATIC_CAPS("video/x-raw, format=(string)" ZOLT_GST_FORMATS
                                            ", width=(int)[16, 16880], height=(int)[16, 16880]"
                                            ", framerate=(fraction)[0/1, 2147483647/1]"));

GstStaticPadTemplate src_template =
    GST_STATIC_PAD_TEMPLATE("src", GST_PAD_SRC, GST_PAD_ALWAYS,
                            GST_STATIC_CAPS("video/x-h264, stream-format=(string){avc, byte-stream}"
                                            ", alignment=(string)au, profile=(string)main"
                                            ", width=(int)[16, 16880], height=(int)[16, 16880]"
                                            ", framerate=(fraction)[0/1, 2147483647/1]"));

H264Element& impl_of(gpointer object) {
    return *static_cast<GstZoltH264Enc*>(object)->impl;
}

// What kind of element error a failure becomes.
struct ErrorKind {
    GQuark domain;
    gint code;
};

// Does something of an element; what fails becomes an element error with its text, and `failure` is
// returned.
template <class Result, class Action>
Result guarded(GstVideoEncoder* encoder, Result failure, const ErrorKind& kind, Action action) {
    try {
        return action(impl_of(encoder));
    } catch (const std::exception& error) {
        gst_element_message_full(GST_ELEMENT(encoder), GST_MESSAGE_ERROR, kind.domain, kind.code,
                                 g_strdup(error.what()), nullptr, __FILE__, GST_FUNCTION, __LINE__);
        return failure;
    }
}

GType fit_type() {
    static const GEnumValue values[] = {
        {static_cast<gint>(Fit::pad), "Extend pictures to multiples of 16 and crop them in players",
         "pad"},
        {static_cast<gint>(Fit::crop), "Code the middle of pictures, rounded down", "crop"},
        {0, nullptr, nullptr}};
    static const GType type = g_enum_register_static("GstZoltH264EncFit", values);
    return type;
}

void set_property(GObject* object, guint id, const GValue* value, GParamSpec* spec) {
    H264Element& impl = impl_of(object);
    const auto set_number = [&impl, value](int PictureEncoder::Settings::*setting) {
        impl.change_settings([&](PictureEncoder::Settings& settings) {
            settings.*setting = static_cast<int>(g_value_get_uint(value));
        });
    };
    switch (id) {
        case kBitRate:
            set_number(&PictureEncoder::Settings::bit_rate_kbs);
            break;
        case kKeyIntMax:
            set_number(&PictureEncoder::Settings::key_frame_interval);
            break;
        case kThreads:
            set_number(&PictureEncoder::Settings::threads);
            break;
        case kFit:
            impl.change_settings([value](PictureEncoder::Settings& settings) {
                settings.fit = static_cast<Fit>(g_value_get_enum(value));
            });
            break;
        case kPluginPath: {
            const gchar* const path = g_value_get_string(value);
            impl.set_plugin_path(path == nullptr ? "" : path);
            break;
        }
        default:
            G_OBJECT_WARN_INVALID_PROPERTY_ID(object, id, spec);
    }
}

GstStructure* stats_of(const H264Element& impl) {
    const zolt::CodingTally tally = impl.tally();
    return gst_structure_new("zolth264enc-stats", "pictures", G_TYPE_UINT64, tally.pictures,
                             "key-frames", G_TYPE_UINT64, tally.key_frames, "bits", G_TYPE_UINT64,
                             tally.bits, "bitrate", G_TYPE_DOUBLE, tally.kilobits_per_second(),
                             nullptr);
}

void get_property(GObject* object, guint id, GValue* value, GParamSpec* spec) {
    const H264Element& impl = impl_of(object);
    const PictureEncoder::Settings settings = impl.settings();
    switch (id) {
        case kBitRate:
            g_value_set_uint(value, static_cast<guint>(settings.bit_rate_kbs));
            break;
        case kKeyIntMax:
            g_value_set_uint(value, static_cast<guint>(settings.key_frame_interval));
            break;
        case kThreads:
            g_value_set_uint(value, static_cast<guint>(settings.threads));
            break;
        case kFit:
            g_value_set_enum(value, static_cast<gint>(settings.fit));
            break;
        case kPluginPath: {
            const std::string path = impl.plugin_path();
            g_value_set_string(value, path.empty() ? nullptr : path.c_str());
            break;
        }
        case kStats:
            g_value_take_boxed(value, stats_of(impl));
            break;
        default:
            G_OBJECT_WARN_INVALID_PROPERTY_ID(object, id, spec);
    }
}

void finalize(GObject* object) {
    delete reinterpret_cast<GstZoltH264Enc*>(object)->impl;
    G_OBJECT_CLASS(gst_zolt_h264_enc_parent_class)->finalize(object);
}

// An operation that succeeds unless it throws.
template <void (H264Element::*operation)(), gint error_code = GST_LIBRARY_ERROR_ENCODE>
gboolean call(GstVideoEncoder* encoder) {
    return guarded(encoder, gboolean{FALSE}, {GST_LIBRARY_ERROR, error_code},
                   [](H264Element& impl) {
                       (impl.*operation)();
                       return gboolean{TRUE};
                   });
}

gboolean set_format(GstVideoEncoder* encoder, GstVideoCodecState* state) {
    return guarded(encoder, gboolean{FALSE}, {GST_STREAM_ERROR, GST_STREAM_ERROR_FORMAT},
                   [state](H264Element& impl) { return gboolean{impl.set_format(state)}; });
}

gboolean negotiate(GstVideoEncoder* encoder) {
    return call<&H264Element::set_source_caps>(encoder) != FALSE &&
           GST_VIDEO_ENCODER_CLASS(gst_zolt_h264_enc_parent_class)->negotiate(encoder) != FALSE;
}

GstFlowReturn handle_frame(GstVideoEncoder* encoder, GstVideoCodecFrame* frame) {
    return guarded(encoder, GST_FLOW_ERROR, {GST_LIBRARY_ERROR, GST_LIBRARY_ERROR_ENCODE},
                   [frame](H264Element& impl) { return impl.handle_frame(frame); });
}

GstFlowReturn pre_push(GstVideoEncoder* encoder, GstVideoCodecFrame* frame) {
    return guarded(encoder, GST_FLOW_ERROR, {GST_LIBRARY_ERROR, GST_LIBRARY_ERROR_ENCODE},
                   [frame](H264Element& impl) { return impl.pre_push(frame); });
}

GstFlowReturn finish(GstVideoEncoder* encoder) {
    return call<&H264Element::finish>(encoder) != FALSE ? GST_FLOW_OK : GST_FLOW_ERROR;
}

gboolean propose_allocation(GstVideoEncoder* encoder, GstQuery* query) {
    // Rows and planes may lie wherever upstream has them.
    gst_query_add_allocation_meta(query, GST_VIDEO_META_API_TYPE, nullptr);
    return GST_VIDEO_ENCODER_CLASS(gst_zolt_h264_enc_parent_class)
        ->propose_allocation(encoder, query);
}

void install_properties(GObjectClass* object_class) {
    constexpr auto kFlags = static_cast<GParamFlags>(G_PARAM_READWRITE | G_PARAM_STATIC_STRINGS);
    constexpr auto kPlaying = static_cast<GParamFlags>(kFlags | GST_PARAM_MUTABLE_PLAYING);
    constexpr auto kReady = static_cast<GParamFlags>(kFlags | GST_PARAM_MUTABLE_READY);
    constexpr guint kMaxThreads = 256;
    const PictureEncoder::Settings defaults;
    g_object_class_install_property(
        object_class, kBitRate,
        g_param_spec_uint("bitrate", "Bit rate",
                          "Target bit rate in kbit/s (0: no rate control, every picture at QP 28)",
                          0, EncoderSession::kMaxBitRateKbs,
                          static_cast<guint>(defaults.bit_rate_kbs), kPlaying));
    g_object_class_install_property(
        object_class, kKeyIntMax,
        g_param_spec_uint("key-int-max", "Key-frame interval",
                          "Largest distance between two key frames in frames", 1, G_MAXINT,
                          static_cast<guint>(defaults.key_frame_interval), kPlaying));
    g_object_class_install_property(
        object_class, kThreads,
        g_param_spec_uint("threads", "Threads", "Threads to code a picture on (0: as many as help)",
                          0, kMaxThreads, static_cast<guint>(defaults.threads), kReady));
    g_object_class_install_property(
        object_class, kFit,
        g_param_spec_enum("fit", "Fit", "How pictures are coded whose sides are no multiples of 16",
                          fit_type(), static_cast<gint>(defaults.fit), kReady));
    g_object_class_install_property(
        object_class, kPluginPath,
        g_param_spec_string("plugin-path", "Encoder library",
                            "File of the encoder library, taken on the way from NULL to READY "
                            "(unset: beside the element, in the directory above, or where the "
                            "system's libraries are)",
                            nullptr, kFlags));
    g_object_class_install_property(
        object_class, kStats,
        g_param_spec_boxed("stats", "Statistics",
                           "What has been coded since the element was started: pictures, "
                           "key-frames, bits, bitrate (kbit/s achieved)",
                           GST_TYPE_STRUCTURE,
                           static_cast<GParamFlags>(G_PARAM_READABLE | G_PARAM_STATIC_STRINGS)));
}

}  // namespace

static void gst_zolt_h264_enc_class_init(GstZoltH264EncClass* klass) {
    GST_DEBUG_CATEGORY_INIT(zolt_h264_enc_debug, "zolth264enc", 0, "ZOLT H.264 encoder");

    GObjectClass* const object_class = G_OBJECT_CLASS(klass);
    object_class->set_property = set_property;
    object_class->get_property = get_property;
    object_class->finalize = finalize;
    install_properties(object_class);

    GstElementClass* const element_class = GST_ELEMENT_CLASS(klass);
    gst_element_class_add_static_pad_template(element_class, &sink_template);
    gst_element_class_add_static_pad_template(element_class, &src_template);
    gst_element_class_set_static_metadata(
        element_class, "ZOLT H.264 encoder", "Codec/Encoder/Video",
        "Encodes H.264 streams with the ZOLT encoder library", "ZOLT developers");
    gst_type_mark_as_plugin_api(fit_type(), static_cast<GstPluginAPIFlags>(0));

    GstVideoEncoderClass* const encoder_class = GST_VIDEO_ENCODER_CLASS(klass);
    encoder_class->open = call<&H264Element::open, GST_LIBRARY_ERROR_INIT>;
    encoder_class->close = call<&H264Element::close>;
    encoder_class->start = call<&H264Element::start>;
    encoder_class->stop = call<&H264Element::stop>;
    encoder_class->set_format = set_format;
    encoder_class->negotiate = negotiate;
    encoder_class->handle_frame = handle_frame;
    encoder_class->pre_push = pre_push;
    encoder_class->finish = finish;
    encoder_class->flush = call<&H264Element::flush>;
    encoder_class->propose_allocation = propose_allocation;
}

static void gst_zolt_h264_enc_init(GstZoltH264Enc* element) {
    element->impl = new H264Element(GST_VIDEO_ENCODER(element));
}
