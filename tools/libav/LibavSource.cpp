#include "libav/LibavSource.h"

#include <algorithm>
#include <cmath>
#include <initializer_list>
#include <new>
#include <utility>

extern "C" {
#include <libavutil/display.h>
}

#include "io/ToolError.h"
#include "libav/frames.h"

namespace zolt {
namespace {

constexpr int kMaxFrameRate = 1000;

std::optional<FrameRate> sensible_frame_rate(AVFormatContext* context, AVStream* stream) {
    std::optional<FrameRate> rate;
    for (const AVRational guess : {av_guess_frame_rate(context, stream, nullptr),
                                   stream->avg_frame_rate, stream->r_frame_rate}) {
        if (guess.num <= 0 || guess.den <= 0) {
            continue;
        }
        int numerator = 0;
        int denominator = 0;
        av_reduce(&numerator, &denominator, guess.num, guess.den, INT32_MAX);
        if (av_q2d(guess) <= kMaxFrameRate) {
            return FrameRate{numerator, denominator};
        }
        rate = FrameRate{kMaxFrameRate, 1};
    }
    return rate;
}

// Degrees clockwise by which a player turns the pictures, to the nearest quarter.
int rotation_of(const AVStream& stream, const AVFrame& frame) {
    const std::uint8_t* matrix =
        av_stream_get_side_data(&stream, AV_PKT_DATA_DISPLAYMATRIX, nullptr);
    if (matrix == nullptr) {
        const AVFrameSideData* const data =
            av_frame_get_side_data(&frame, AV_FRAME_DATA_DISPLAYMATRIX);
        matrix = data == nullptr ? nullptr : data->data;
    }
    if (matrix == nullptr) {
        return 0;
    }
    const double anticlockwise =
        av_display_rotation_get(reinterpret_cast<const std::int32_t*>(matrix));
    if (std::isnan(anticlockwise)) {
        return 0;
    }
    const auto quarters = static_cast<int>(std::lround(-anticlockwise / 90));
    return (quarters % 4 + 4) % 4 * 90;
}

// The first value that says something; 0 and 3 are reserved.
int first_specified(std::initializer_list<int> values) {
    constexpr int kReserved = 3;
    for (const int value : values) {
        if (value > 0 && value != ColourDescription::kUnspecified && value != kReserved) {
            return value;
        }
    }
    return ColourDescription::kUnspecified;
}

ColourDescription colour_of(const AVCodecParameters& stream, const AVFrame& frame) {
    ColourDescription colour;
    colour.colour_primaries = first_specified({frame.color_primaries, stream.color_primaries});
    colour.transfer_characteristics = first_specified({frame.color_trc, stream.color_trc});
    colour.matrix_coefficients = first_specified({frame.colorspace, stream.color_space});
    for (const AVColorRange range : {frame.color_range, stream.color_range}) {
        if (range != AVCOL_RANGE_UNSPECIFIED && !colour.video_full_range) {
            colour.video_full_range = range == AVCOL_RANGE_JPEG;
        }
    }
    if (!colour.video_full_range && is_full_range(frame.format)) {
        colour.video_full_range = true;
    }
    return colour;
}

std::string count_text(std::int64_t count, const char* what) {
    return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

void append(std::string& text, const std::string& more) {
    text += (text.empty() ? "" : "; ") + more;
}

}  // namespace

LibavSource::LibavSource(const std::string& input, bool with_side_streams)
    : input_(input, with_side_streams) {
    begin();
}

LibavSource::LibavSource(ByteReader bytes, bool with_side_streams)
    : input_(std::move(bytes), with_side_streams) {
    begin();
}

std::optional<TimeBase> LibavSource::time_base() const {
    const AVRational base = input_.video()->time_base;
    return TimeBase{base.num, base.den};
}

std::string LibavSource::remark() const {
    std::string text;
    const std::string left_out = input_.left_out();
    if (!left_out.empty()) {
        append(text, "left out beside the first video stream: " + left_out);
    }
    if (is_interlaced_) {
        append(text, "the pictures are interlaced; they are coded as progressive ones");
    }
    return text;
}

std::string LibavSource::closing_remark() const {
    std::string text;
    if (undecodable_ > 0) {
        append(text, count_text(undecodable_, "picture") + " could not be decoded");
    }
    if (!other_size_.empty()) {
        append(text, other_size_);
    }
    // Where none is stated, as in elementary streams, nobody expects any.
    if (clock_->repairs() > 0 && clock_->repairs() < frames_read_) {
        append(text, count_text(clock_->repairs(), "time stamp") +
                         " replaced, for missing or not growing");
    }
    return text;
}

std::optional<std::int64_t> LibavSource::frames_left() const {
    const AVStream& stream = *input_.video();
    std::int64_t frames = stream.nb_frames;
    if (frames <= 0 && frame_rate_) {
        const double seconds = stream.duration > 0
                                   ? static_cast<double>(stream.duration) * av_q2d(stream.time_base)
                                   : static_cast<double>(input_.context()->duration) / AV_TIME_BASE;
        // A file may state any duration.
        constexpr double kMost = 1e15;
        frames = std::llround(std::min(kMost, seconds * frame_rate_->per_second()));
    }
    return frames > frames_read_ ? std::optional(frames - frames_read_) : std::nullopt;
}

bool LibavSource::read(std::vector<unsigned char>& sample) {
    if (frames_read_ == 0 && input_.side_streams() != nullptr) {
        input_.side_streams()->settle();
    }
    if (!has_frame_ && !decode()) {
        if (!input_.cut().empty()) {
            throw TruncatedInput(input_.name() + ": is cut off or damaged after " +
                                 count_text(frames_read_, "picture") + ": " + input_.cut());
        }
        return false;
    }
    has_frame_ = false;
    if (!converter_->has_size(*frame_) && other_size_.empty()) {
        const PictureFormat first = format();
        other_size_ = "from picture " + std::to_string(frames_read_) + " on some are " +
                      std::to_string(frame_->width) + "x" + std::to_string(frame_->height) +
                      "; they are scaled to the first one's " + std::to_string(first.width) + "x" +
                      std::to_string(first.height);
    }
    converter_->convert(*frame_, sample.data());
    const std::int64_t stated = frame_->best_effort_timestamp;
    time_ = clock_->next(stated == AV_NOPTS_VALUE ? std::nullopt : std::optional(stated),
                         frame_->pkt_duration);
    // Ticks are coarse in some files: the last picture ends where the file says it does.
    const std::int64_t end = time_.start + time_.duration;
    const std::int64_t stated_end = input_.stated_end();
    if (stated_end > time_.start && (stated_end == end - 1 || stated_end == end + 1)) {
        time_.duration = stated_end - time_.start;
    }
    ++frames_read_;
    return true;
}

void LibavSource::begin() {
    packet_.reset(av_packet_alloc());
    frame_.reset(av_frame_alloc());
    if (!packet_ || !frame_) {
        throw std::bad_alloc();
    }
    AVStream* const stream = input_.video();
    const std::string error =
        PictureFormat::size_error(stream->codecpar->width, stream->codecpar->height);
    if (stream->codecpar->width > 0 && !error.empty()) {
        throw ToolError(input_.name() + ": " + error);
    }
    open_decoder();
    if (!decode()) {
        const std::string what =
            input_.name() + ": " +
            (undecodable_ > 0 ? "none of its pictures can be decoded; is it damaged?"
                              : "holds no picture");
        if (input_.cut().empty()) {
            throw ToolError(what);
        }
        // The index of a file may stand at its end.
        throw TruncatedInput(
            what + " (" + input_.cut() + ")" +
            (input_.is_live() ? "; if it is a file, name it instead of piping it" : ""));
    }
    has_frame_ = true;
    look_at_first_frame();
}

void LibavSource::open_decoder() {
    const AVCodecParameters& parameters = *input_.video()->codecpar;
    const AVCodec* const codec = avcodec_find_decoder(parameters.codec_id);
    if (codec == nullptr) {
        throw ToolError(input_.name() + ": there is no decoder for its video, which is coded as " +
                        avcodec_get_name(parameters.codec_id) +
                        "; zoltenc --list-formats lists "
                        "what is read");
    }
    decoder_.reset(avcodec_alloc_context3(codec));
    if (!decoder_ || avcodec_parameters_to_context(decoder_.get(), &parameters) < 0) {
        throw std::bad_alloc();
    }
    // As many threads as there are processors. Those that work on one picture each hold pictures
    // back, which must not happen to live ones.
    decoder_->thread_count = 0;
    decoder_->thread_type = input_.is_live() ? FF_THREAD_SLICE : FF_THREAD_FRAME | FF_THREAD_SLICE;
    decoder_->pkt_timebase = input_.video()->time_base;
    decoder_->max_pixels = std::int64_t{2} * PictureFormat::kMaxMacroblocks * 256;
    const int opened = avcodec_open2(decoder_.get(), codec, nullptr);
    if (opened < 0) {
        throw ToolError(input_.name() + ": its video, coded as " + codec->name +
                        ", cannot be decoded: " + libav_error(opened));
    }
}

// Decodes the next picture into `frame_`; false at the end.
bool LibavSource::decode() {
    while (true) {
        const int result = avcodec_receive_frame(decoder_.get(), frame_.get());
        if (result == 0) {
            return true;
        }
        if (result == AVERROR_EOF) {
            return false;
        }
        if (result != AVERROR(EAGAIN)) {
            ++undecodable_;
        } else if (!feed()) {
            return false;
        }
    }
}

// Hands the decoder the next packet, or tells it that there is none; false when it knew that.
bool LibavSource::feed() {
    if (is_input_over_) {
        return false;
    }
    is_input_over_ = !input_.read(packet_.get());
    const int result =
        avcodec_send_packet(decoder_.get(), is_input_over_ ? nullptr : packet_.get());
    av_packet_unref(packet_.get());
    if (result < 0 && result != AVERROR_EOF) {
        ++undecodable_;
    }
    return true;
}

void LibavSource::look_at_first_frame() {
    AVFormatContext* const context = input_.context();
    AVStream* const stream = input_.video();
    converter_.emplace(*frame_, input_.name());
    frame_rate_ = sensible_frame_rate(context, stream);
    // Pictures that last a tick are the shortest that a clock can tell.
    const FrameRate rate = frame_rate_.value_or(FrameRate{});
    clock_.emplace(std::max<std::int64_t>(
        1, av_rescale_q(1, {static_cast<int>(rate.denominator), static_cast<int>(rate.numerator)},
                        stream->time_base)));
    if (!converter_->is_rgb()) {
        traits_.colour = colour_of(*stream->codecpar, *frame_);
    }
    const AVRational aspect = av_guess_sample_aspect_ratio(context, stream, frame_.get());
    if (aspect.num > 0 && aspect.den > 0) {
        traits_.sar_width = aspect.num;
        traits_.sar_height = aspect.den;
    }
    traits_.rotation = rotation_of(*stream, *frame_);
    is_interlaced_ = frame_->interlaced_frame != 0;
}

}  // namespace zolt
