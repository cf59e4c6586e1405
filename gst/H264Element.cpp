#include "H264Element.h"

#include <gst/pbutils/pbutils.h>

#include <algorithm>
#include <optional>
#include <utility>

#include "debug_category.h"
#include "input_caps.h"
#include "io/ToolError.h"
#include "library_files.h"

GST_DEBUG_CATEGORY(zolt_h264_enc_debug);

namespace zolt {
namespace {

constexpr const char* kStreamFormatNames[] = {"byte-stream", "avc"};

const char* name_of(StreamFormat format) {
    return kStreamFormatNames[static_cast<int>(format)];
}

struct CapsRelease {
    void operator()(GstCaps* caps) const { gst_caps_unref(caps); }
};
using CapsOwner = std::unique_ptr<GstCaps, CapsRelease>;

// A frame's memory, mapped for reading.
class MappedFrame {
public:
    MappedFrame(GstVideoCodecFrame* frame, const GstVideoInfo& info) {
        if (gst_video_frame_map(&frame_, &info, frame->input_buffer, GST_MAP_READ) == FALSE) {
            throw ToolError("a buffer cannot be read as a picture of its caps");
        }
    }
    ~MappedFrame() { gst_video_frame_unmap(&frame_); }
    MappedFrame(const MappedFrame&) = delete;
    MappedFrame& operator=(const MappedFrame&) = delete;

    const GstVideoFrame& frame() const { return frame_; }

private:
    GstVideoFrame frame_{};
};

// The colours of the coded samples, which for RGB pictures are not those of the input.
void set_colorimetry(GstVideoColorimetry& colorimetry, const ColourDescription& colour) {
    colorimetry.matrix =
        gst_video_color_matrix_from_iso(static_cast<guint>(colour.matrix_coefficients));
    if (colour.video_full_range) {
        colorimetry.range =
            *colour.video_full_range ? GST_VIDEO_COLOR_RANGE_0_255 : GST_VIDEO_COLOR_RANGE_16_235;
    }
}

}  // namespace

PictureEncoder::Settings H264Element::settings() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return settings_;
}

void H264Element::change_settings(const std::function<void(PictureEncoder::Settings&)>& change) {
    const std::lock_guard<std::mutex> lock(mutex_);
    change(settings_);
}

std::string H264Element::plugin_path() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return plugin_path_;
}

void H264Element::set_plugin_path(const std::string& path) {
    const std::lock_guard<std::mutex> lock(mutex_);
    plugin_path_ = path;
}

CodingTally H264Element::tally() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return tally_;
}

void H264Element::open() {
    library_ = open_encoder_library(plugin_path());
    GST_INFO_OBJECT(element_, "encoder library %s", library_->file_name().c_str());
}

void H264Element::close() {
    library_.reset();
}

void H264Element::start() {
    const std::lock_guard<std::mutex> lock(mutex_);
    tally_ = {};
    coded_before_ = 0;
}

void H264Element::stop() {
    encoder_.reset();
    input_.reset();
}

bool H264Element::set_format(GstVideoCodecState* input) {
    const PictureEncoder::Settings wanted = settings();
    encoder_ = std::make_unique<PictureEncoder>(*library_, element_services(),
                                                describe_input(input->info), wanted);
    coded_before_ = tally().microseconds;
    input_.reset(gst_video_codec_state_ref(input));
    announced_kbs_ = wanted.bit_rate_kbs;
    stream_format_ = choose_stream_format();
    gst_video_encoder_set_latency(element_, 0, 0);
    set_source_caps();
    if (gst_video_encoder_negotiate(element_) == FALSE) {
        return false;
    }
    send_tags();
    return true;
}

void H264Element::set_source_caps() {
    if (encoder_ == nullptr) {
        return;
    }
    const StreamFormat chosen = choose_stream_format();
    if (chosen != stream_format_) {
        // Its reader starts anew, and so does the stream.
        encoder_->restart();
        stream_format_ = chosen;
    }
    GstCaps* const caps =
        gst_caps_new_simple("video/x-h264", "stream-format", G_TYPE_STRING, name_of(stream_format_),
                            "alignment", G_TYPE_STRING, "au", nullptr);
    // What follows the NAL unit's header byte.
    const ParameterSetUnits& sets = encoder_->sets();
    gst_codec_utils_h264_caps_set_level_and_profile(
        caps, sets.seq_par_set.data() + 1, static_cast<guint>(sets.seq_par_set.size() - 1));

    const StateOwner output(gst_video_encoder_set_output_state(element_, caps, input_.get()));
    GST_VIDEO_INFO_WIDTH(&output->info) = encoder_->shown_width();
    GST_VIDEO_INFO_HEIGHT(&output->info) = encoder_->shown_height();
    set_colorimetry(GST_VIDEO_INFO_COLORIMETRY(&output->info), encoder_->coded_colour());
    if (stream_format_ == StreamFormat::avc) {
        const std::vector<unsigned char> record = decoder_configuration(sets);
        output->codec_data = gst_buffer_new_memdup(record.data(), record.size());
    }
}

GstFlowReturn H264Element::handle_frame(GstVideoCodecFrame* owned) {
    FrameOwner frame(owned);
    if (encoder_ == nullptr) {
        return GST_FLOW_NOT_NEGOTIATED;
    }
    // What the reader wants now is to be known before the picture is coded for it.
    if (gst_pad_check_reconfigure(GST_VIDEO_ENCODER_SRC_PAD(element_)) != FALSE) {
        const GstFlowReturn negotiated = negotiate();
        if (negotiated != GST_FLOW_OK) {
            return negotiated;
        }
    }
    if (is_late(frame.get())) {
        // Without an output buffer the frame is dropped, and said to be.
        return gst_video_encoder_finish_frame(element_, frame.release());
    }
    const GstFlowReturn pushed = encode_and_push(std::move(frame));
    if (pushed == GST_FLOW_OK) {
        encoder_->mark_taken();
    }
    return pushed;
}

GstFlowReturn H264Element::negotiate() {
    if (gst_video_encoder_negotiate(element_) != FALSE) {
        return GST_FLOW_OK;
    }
    GstPad* const source = GST_VIDEO_ENCODER_SRC_PAD(element_);
    gst_pad_mark_reconfigure(source);
    return GST_PAD_IS_FLUSHING(source) ? GST_FLOW_FLUSHING : GST_FLOW_NOT_NEGOTIATED;
}

GstFlowReturn H264Element::encode_and_push(FrameOwner frame) {
    const PictureEncoder::Picture picture = encode(frame.get());
    if (picture.is_key) {
        GST_VIDEO_CODEC_FRAME_SET_SYNC_POINT(frame.get());
    }
    frame->dts = frame->pts;
    if (picture.has_new_sets) {
        const GstFlowReturn negotiated = negotiate();
        if (negotiated != GST_FLOW_OK) {
            return negotiated;
        }
    }
    // Until it is pushed, the reader may come to want the other format: there is room for both.
    const std::size_t room = std::max(unit_of(frame.get(), StreamFormat::byte_stream).bytes(),
                                      unit_of(frame.get(), StreamFormat::avc).bytes());
    const GstFlowReturn allocated =
        gst_video_encoder_allocate_output_frame(element_, frame.get(), room);
    return allocated != GST_FLOW_OK ? allocated
                                    : gst_video_encoder_finish_frame(element_, frame.release());
}

GstFlowReturn H264Element::pre_push(GstVideoCodecFrame* frame) {
    const AccessUnit unit = unit_of(frame, stream_format_);
    GstMapInfo map;
    if (gst_buffer_map(frame->output_buffer, &map, GST_MAP_WRITE) == FALSE) {
        throw ToolError("an output buffer cannot be written");
    }
    unit.write(map.data);
    gst_buffer_unmap(frame->output_buffer, &map);
    gst_buffer_set_size(frame->output_buffer, static_cast<gssize>(unit.bytes()));
    return GST_FLOW_OK;
}

AccessUnit H264Element::unit_of(const GstVideoCodecFrame* frame, StreamFormat format) const {
    const bool is_key = GST_VIDEO_CODEC_FRAME_IS_SYNC_POINT(frame);
    return {format, is_key ? &encoder_->sets() : nullptr, encoder_->nal()};
}

void H264Element::finish() {
    if (encoder_ != nullptr) {
        encoder_->end();
    }
}

void H264Element::flush() {
    if (encoder_ != nullptr) {
        encoder_->interrupt();
        encoder_->restart();
    }
}

// With QoS asked for, pictures that come too late to be shown are not coded; those that are to be
// key frames are.
bool H264Element::is_late(const GstVideoCodecFrame* frame) const {
    return gst_video_encoder_is_qos_enabled(element_) != FALSE &&
           !GST_VIDEO_CODEC_FRAME_IS_FORCE_KEYFRAME(frame) &&
           gst_video_encoder_get_max_encode_time(element_, const_cast<GstVideoCodecFrame*>(frame)) <
               0;
}

PictureEncoder::Picture H264Element::encode(GstVideoCodecFrame* frame) {
    const PictureEncoder::Settings wanted = settings();
    encoder_->set_bit_rate(wanted.bit_rate_kbs);
    encoder_->set_key_frame_interval(wanted.key_frame_interval);
    if (wanted.bit_rate_kbs != announced_kbs_) {
        announced_kbs_ = wanted.bit_rate_kbs;
        send_tags();
    }
    if (GST_VIDEO_CODEC_FRAME_IS_FORCE_KEYFRAME(frame)) {
        GST_DEBUG_OBJECT(element_, "frame %u is to be a key frame", frame->system_frame_number);
        encoder_->restart();
    }
    std::optional<std::uint64_t> time;
    if (GST_CLOCK_TIME_IS_VALID(frame->pts)) {
        time = frame->pts;
    }
    const MappedFrame mapped(frame, input_->info);
    const PictureEncoder::Picture picture =
        encoder_->encode(rows_of(mapped.frame(), encoder_->picture_format()), time);

    const std::lock_guard<std::mutex> lock(mutex_);
    ++tally_.pictures;
    tally_.key_frames += picture.is_key ? 1 : 0;
    tally_.bits += encoder_->nal().size() * 8;
    tally_.microseconds = coded_before_ + picture.end;
    return picture;
}

void H264Element::send_tags() {
    GstTagList* const tags = gst_tag_list_new(GST_TAG_ENCODER, library_->encoder_name(), nullptr);
    if (announced_kbs_ > 0) {
        constexpr guint kBitsPerKilobit = 1000;
        gst_tag_list_add(tags, GST_TAG_MERGE_REPLACE, GST_TAG_NOMINAL_BITRATE,
                         static_cast<guint>(announced_kbs_) * kBitsPerKilobit, nullptr);
    }
    const CapsOwner caps(gst_pad_get_current_caps(GST_VIDEO_ENCODER_SRC_PAD(element_)));
    if (caps != nullptr) {
        gst_pb_utils_add_codec_description_to_tag_list(tags, GST_TAG_VIDEO_CODEC, caps.get());
    }
    gst_video_encoder_merge_tags(element_, tags, GST_TAG_MERGE_REPLACE);
    gst_tag_list_unref(tags);
}

// Start codes wherever they are taken: parameter sets are then in front of every IDR picture.
StreamFormat H264Element::choose_stream_format() const {
    const CapsOwner allowed(gst_pad_get_allowed_caps(GST_VIDEO_ENCODER_SRC_PAD(element_)));
    const CapsOwner start_codes(gst_caps_new_simple("video/x-h264", "stream-format", G_TYPE_STRING,
                                                    name_of(StreamFormat::byte_stream), nullptr));
    return allowed == nullptr || gst_caps_is_empty(allowed.get()) != FALSE ||
                   gst_caps_can_intersect(allowed.get(), start_codes.get()) != FALSE
               ? StreamFormat::byte_stream
               : StreamFormat::avc;
}

}  // namespace zolt
