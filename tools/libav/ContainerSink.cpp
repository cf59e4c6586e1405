#include "libav/ContainerSink.h"

#include <algorithm>
#include <cstring>
#include <new>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "io/annex_b.h"

extern "C" {
#include <libavutil/display.h>
#include <libavutil/mem.h>
}

namespace zolt {
namespace {

int stop_received(void* is_opening) {
    return *static_cast<const bool*>(is_opening) && StopSignal::received() != 0 ? 1 : 0;
}

// libavformat does not tell what a transport stream can hold: it wraps anything.
bool transport_stream_holds(AVCodecID codec) {
    constexpr AVCodecID kHeld[] = {
        AV_CODEC_ID_AAC,          AV_CODEC_ID_AAC_LATM,     AV_CODEC_ID_MP2, AV_CODEC_ID_MP3,
        AV_CODEC_ID_AC3,          AV_CODEC_ID_EAC3,         AV_CODEC_ID_DTS, AV_CODEC_ID_OPUS,
        AV_CODEC_ID_DVB_SUBTITLE, AV_CODEC_ID_DVB_TELETEXT,
    };
    return std::find(std::begin(kHeld), std::end(kHeld), codec) != std::end(kHeld);
}

bool holds(const AVOutputFormat& container, AVCodecID codec) {
    const int answer = avformat_query_codec(&container, codec, FF_COMPLIANCE_NORMAL);
    return answer == 1 || (answer == AVERROR_PATCHWELCOME && transport_stream_holds(codec));
}

bool holds_rotation(const AVOutputFormat& container) {
    return std::strcmp(container.name, "mp4") == 0 || std::strcmp(container.name, "mov") == 0;
}

// A clock for MP4 in which the picture clock's ticks are whole and a millisecond is not coarse.
int mp4_timescale(const AVRational& picture_clock) {
    constexpr int kLeast = 10000;
    int timescale = picture_clock.den;
    while (timescale < kLeast) {
        timescale *= 2;
    }
    return timescale;
}

void set_rotation(AVStream& stream, int degrees) {
    if (degrees == 0) {
        return;
    }
    constexpr std::size_t kMatrixBytes = 9 * sizeof(std::int32_t);
    std::uint8_t* const data =
        av_stream_new_side_data(&stream, AV_PKT_DATA_DISPLAYMATRIX, kMatrixBytes);
    if (data == nullptr) {
        throw std::bad_alloc();
    }
    std::int32_t matrix[9];
    av_display_rotation_set(matrix, degrees);
    std::memcpy(data, matrix, kMatrixBytes);
}

void append_nal(std::vector<unsigned char>& bytes, const std::vector<unsigned char>& nal) {
    bytes.insert(bytes.end(), std::begin(kStartCode), std::end(kStartCode));
    bytes.insert(bytes.end(), nal.begin(), nal.end());
}

// Both parameter sets in Annex B form, from which libavformat makes each container's own.
void set_extradata(AVCodecParameters& parameters, const StreamDescription& stream) {
    std::vector<unsigned char> sets;
    append_nal(sets, stream.seq_par_set);
    append_nal(sets, stream.pic_par_set);
    parameters.extradata =
        static_cast<std::uint8_t*>(av_mallocz(sets.size() + AV_INPUT_BUFFER_PADDING_SIZE));
    if (parameters.extradata == nullptr) {
        throw std::bad_alloc();
    }
    std::memcpy(parameters.extradata, sets.data(), sets.size());
    parameters.extradata_size = static_cast<int>(sets.size());
}

void set_colour(AVCodecParameters& parameters, const ColourDescription& colour) {
    parameters.color_primaries = static_cast<AVColorPrimaries>(colour.colour_primaries);
    parameters.color_trc =
        static_cast<AVColorTransferCharacteristic>(colour.transfer_characteristics);
    parameters.color_space = static_cast<AVColorSpace>(colour.matrix_coefficients);
    if (colour.video_full_range) {
        parameters.color_range = *colour.video_full_range ? AVCOL_RANGE_JPEG : AVCOL_RANGE_MPEG;
    }
}

std::int64_t time_of(const AVPacket& packet) {
    return packet.dts != AV_NOPTS_VALUE ? packet.dts : packet.pts;
}

}  // namespace

ContainerSink::ContainerSink(const std::string& output, const Settings& settings,
                             const VideoTraits& traits, SideStreams* side_streams)
    : settings_(settings),
      name_(output),
      side_streams_(side_streams),
      packet_(av_packet_alloc()),
      next_copy_(av_packet_alloc()) {
    AVFormatContext* context = nullptr;
    if (!packet_ || !next_copy_ ||
        avformat_alloc_output_context2(&context, nullptr, settings.muxer.c_str(), nullptr) < 0) {
        throw ToolError(name_ + ": this build's libavformat does not write " + settings.muxer);
    }
    context_.reset(context);
    // Equal files from equal input: no date, no chance, no version.
    context_->flags |= AVFMT_FLAG_BITEXACT;
    open(output);
    choose_copies(traits);
}

ContainerSink::~ContainerSink() = default;

void ContainerSink::open(const std::string& output) {
    if (settings_.is_live) {
        AVIOContext* address = nullptr;
        const AVIOInterruptCB interrupt = {stop_received, &is_opening_};
        is_opening_ = true;
        const int result =
            avio_open2(&address, output.c_str(), AVIO_FLAG_WRITE, &interrupt, nullptr);
        is_opening_ = false;
        address_.reset(address);
        check(result);
        context_->pb = address;
        return;
    }
    file_.emplace(output);
    name_ = file_->name();
    const std::string& place = file_->temporary_name();
    if (place.empty() && settings_.needs_seeking) {
        throw ToolError(name_ + ": cannot take " + settings_.muxer +
                        ", which is not written from front to back; a pipe takes --container ts, "
                        "mkv or flv");
    }
    file_context_.emplace(*file_);
    context_->pb = file_context_->get();
    // Where the index moves to the front, libavformat reads the file again under this name.
    context_->url = av_strdup(("file:" + place).c_str());
    context_->flush_packets = place.empty() ? 1 : 0;
}

// Picks the streams that the container holds; the remark names what it does not.
void ContainerSink::choose_copies(const VideoTraits& traits) {
    std::string lost;
    const auto lose = [&lost](const std::string& what) {
        lost += (lost.empty() ? "" : ", ") + what;
    };
    for (const SideStreams::Stream& side :
         side_streams_ != nullptr ? side_streams_->streams() : std::vector<SideStreams::Stream>()) {
        const AVCodecParameters& parameters = *side.parameters;
        if (holds(*context_->oformat, parameters.codec_id)) {
            side_streams_->keep(side.index);
            copies_.push_back({side, nullptr, INT64_MIN});
        } else {
            const char* const type = av_get_media_type_string(parameters.codec_type);
            lose(std::string(avcodec_get_name(parameters.codec_id)) + " " +
                 (type == nullptr ? "data" : type));
        }
    }
    if (traits.rotation != 0 && !holds_rotation(*context_->oformat)) {
        lose("the rotation by " + std::to_string(traits.rotation) + " degrees");
    }
    if (!lost.empty()) {
        remark_ = "left out, since " + settings_.muxer + " cannot hold it: " + lost;
    }
}

void ContainerSink::begin(const StreamDescription& stream) {
    if (video_ == nullptr) {
        stream_ = stream;
        picture_clock_ = {static_cast<int>(stream.time_base.numerator),
                          static_cast<int>(stream.time_base.denominator)};
        add_video();
        add_copies();
        write_header();
    } else if (stream.seq_par_set != stream_.seq_par_set ||
               stream.pic_par_set != stream_.pic_par_set) {
        throw ToolError(name_ +
                        ": the encoder begins a stream with other parameter sets; only an "
                        "elementary stream (.264) can hold both");
    }
    bytes_ += static_cast<std::int64_t>(2 * sizeof kStartCode + stream.seq_par_set.size() +
                                        stream.pic_par_set.size());
}

void ContainerSink::add_video() {
    video_ = avformat_new_stream(context_.get(), nullptr);
    if (video_ == nullptr) {
        throw std::bad_alloc();
    }
    const VideoTraits& traits = stream_.traits;
    AVCodecParameters& parameters = *video_->codecpar;
    parameters.codec_type = AVMEDIA_TYPE_VIDEO;
    parameters.codec_id = AV_CODEC_ID_H264;
    parameters.format = AV_PIX_FMT_YUV420P;
    parameters.field_order = AV_FIELD_PROGRESSIVE;
    parameters.width = traits.shown_width > 0 ? traits.shown_width : stream_.width;
    parameters.height = traits.shown_height > 0 ? traits.shown_height : stream_.height;
    parameters.sample_aspect_ratio = {traits.sar_width, std::max(traits.sar_height, 1)};
    set_colour(parameters, traits.colour);
    set_extradata(parameters, stream_);
    set_rotation(*video_, traits.rotation);
    video_->sample_aspect_ratio = parameters.sample_aspect_ratio;
    video_->avg_frame_rate = {static_cast<int>(stream_.frame_rate.numerator),
                              static_cast<int>(stream_.frame_rate.denominator)};
    video_->time_base =
        settings_.needs_seeking ? AVRational{1, mp4_timescale(picture_clock_)} : picture_clock_;
}

void ContainerSink::add_copies() {
    for (Copy& copy : copies_) {
        copy.stream = avformat_new_stream(context_.get(), nullptr);
        if (copy.stream == nullptr ||
            avcodec_parameters_copy(copy.stream->codecpar, copy.side.parameters) < 0) {
            throw std::bad_alloc();
        }
        // The number that stands for the codec differs between containers.
        copy.stream->codecpar->codec_tag = 0;
        copy.stream->time_base = copy.side.time_base;
        copy.stream->disposition = copy.side.disposition;
        av_dict_copy(&copy.stream->metadata, copy.side.metadata, 0);
    }
}

void ContainerSink::write_header() {
    AVDictionary* options = nullptr;
    if (settings_.needs_seeking) {
        av_dict_set(&options, "movflags", "+faststart", 0);
        // Durations and the times of edit lists are as exact as those of pictures.
        av_dict_set_int(&options, "movie_timescale", video_->time_base.den, 0);
    }
    const int result = avformat_write_header(context_.get(), &options);
    av_dict_free(&options);
    if (result < 0 && !copies_.empty()) {
        check_file();
        throw ToolError(name_ + ": cannot be written: " + libav_error(result) +
                        "; --no-copy leaves out audio and subtitles");
    }
    check(result);
}

void ContainerSink::write(const CodedPicture& picture) {
    const std::size_t size = sizeof kStartCode + picture.size;
    check(av_new_packet(packet_.get(), static_cast<int>(size)));
    std::memcpy(packet_->data, kStartCode, sizeof kStartCode);
    std::memcpy(packet_->data + sizeof kStartCode, picture.nal, picture.size);
    bytes_ += static_cast<std::int64_t>(size);

    const AVRational frame = {static_cast<int>(stream_.frame_rate.denominator),
                              static_cast<int>(stream_.frame_rate.numerator)};
    const std::int64_t duration =
        picture.time.duration > 0 ? picture.time.duration : av_rescale_q(1, frame, picture_clock_);
    end_ = picture.time.start + duration;
    packet_->stream_index = video_->index;
    packet_->flags = picture.is_key ? AV_PKT_FLAG_KEY : 0;
    packet_->pts = av_rescale_q(picture.time.start, picture_clock_, video_->time_base);
    packet_->dts = packet_->pts;
    packet_->duration = av_rescale_q(end_, picture_clock_, video_->time_base) - packet_->pts;
    check(av_interleaved_write_frame(context_.get(), packet_.get()));
    copy_packets(false);
}

// Copies what comes before the end of the last picture, and then, when no picture follows, the rest
// too, unless the pictures end before the input does.
void ContainerSink::copy_packets(bool is_last) {
    const bool ends_early = settings_.ends_early || StopSignal::received() != 0;
    while (side_streams_ != nullptr &&
           (next_copy_->data != nullptr || side_streams_->pop(next_copy_.get()))) {
        Copy& copy = *std::find_if(copies_.begin(), copies_.end(), [this](const Copy& candidate) {
            return candidate.side.index == next_copy_->stream_index;
        });
        const std::int64_t offset =
            av_rescale_q(stream_.time_offset, picture_clock_, copy.side.time_base);
        const std::int64_t time = time_of(*next_copy_);
        const bool has_time = time != AV_NOPTS_VALUE;
        const bool is_late = has_time && av_compare_ts(time - offset, copy.side.time_base, end_,
                                                       picture_clock_) >= 0;
        if (is_late && !is_last) {
            return;
        }
        if (has_time && !(is_late && ends_early)) {
            write_copy(copy, offset);
        }
        av_packet_unref(next_copy_.get());
    }
}

void ContainerSink::write_copy(Copy& copy, std::int64_t offset) {
    AVPacket& packet = *next_copy_;
    for (std::int64_t* const time : {&packet.pts, &packet.dts}) {
        *time -= *time == AV_NOPTS_VALUE ? 0 : offset;
    }
    const bool holds_negative = (context_->oformat->flags & AVFMT_TS_NEGATIVE) != 0;
    if (time_of(packet) < 0 && (offset != 0 || !holds_negative)) {
        return;
    }
    av_packet_rescale_ts(&packet, copy.side.time_base, copy.stream->time_base);
    // Damaged input may step back in time, which no container takes.
    if (!follows(copy, packet)) {
        return;
    }
    copy.last_time = time_of(packet);
    packet.stream_index = copy.stream->index;
    packet.pos = -1;
    check(av_interleaved_write_frame(context_.get(), &packet));
}

// Whether libavformat takes the packet behind the stream's last one: only subtitles may share a
// time where the container has a strict order.
bool ContainerSink::follows(const Copy& copy, const AVPacket& packet) const {
    const std::int64_t time = time_of(packet);
    const bool is_strict = (context_->oformat->flags & AVFMT_TS_NONSTRICT) == 0 &&
                           copy.side.parameters->codec_type != AVMEDIA_TYPE_SUBTITLE;
    const bool is_shown_before_decoding = packet.pts != AV_NOPTS_VALUE && packet.pts < time;
    return !is_shown_before_decoding && time >= copy.last_time &&
           !(is_strict && time == copy.last_time);
}

void ContainerSink::commit() {
    copy_packets(true);
    check(av_write_trailer(context_.get()));
    if (file_) {
        avio_flush(context_->pb);
        check(context_->pb->error);
        file_->commit();
    } else {
        check(avio_close(address_.release()));
    }
}

// Throws where the file or libavformat has failed.
void ContainerSink::check(int result) {
    check_file();
    if (result < 0) {
        throw ToolError(name_ + ": cannot be written: " + libav_error(result));
    }
}

void ContainerSink::check_file() {
    if (file_context_) {
        file_context_->check();
    }
}

}  // namespace zolt
