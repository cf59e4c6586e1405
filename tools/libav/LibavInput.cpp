#include "libav/LibavInput.h"

#include <algorithm>
#include <cctype>
#include <map>
#include <utility>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "io/os.h"
#include "libav/devices.h"

namespace zolt {
namespace {

// What an input's last packet may fall short of the end that the input states.
constexpr std::int64_t kEndTolerance = AV_TIME_BASE / 2;

// "SCHEME://..." with a scheme as RFC 3986 has it.
bool is_url(const std::string& input) {
    const std::size_t colon = input.find("://");
    return colon != std::string::npos && colon > 0 &&
           std::all_of(input.begin(), input.begin() + static_cast<std::ptrdiff_t>(colon),
                       [](unsigned char letter) {
                           return std::isalnum(letter) != 0 || letter == '+' || letter == '-' ||
                                  letter == '.';
                       });
}

struct Device {
    const AVInputFormat* format = nullptr;  // null: the input is none
    std::string name;
};

Device parse_device(const std::string& input) {
    const std::size_t colon = input.find(':');
    if (colon == std::string::npos || os_status(input)) {
        return {};
    }
    return {find_device(input.substr(0, colon)), input.substr(colon + 1)};
}

bool is_side_stream(const AVStream& stream) {
    const AVMediaType type = stream.codecpar->codec_type;
    return type == AVMEDIA_TYPE_AUDIO || type == AVMEDIA_TYPE_SUBTITLE;
}

bool is_picture_attached(const AVStream& stream) {
    return (stream.disposition & AV_DISPOSITION_ATTACHED_PIC) != 0;
}

std::string kind_of(const AVStream& stream) {
    if (is_picture_attached(stream)) {
        return "cover picture";
    }
    const char* const type = av_get_media_type_string(stream.codecpar->codec_type);
    return type == nullptr ? "unknown" : type;
}

}  // namespace

bool LibavInput::names_address(const std::string& input) {
    return is_url(input) || parse_device(input).format != nullptr;
}

LibavInput::LibavInput(const std::string& input, bool with_side_streams) : name_(input) {
    const Device device = parse_device(input);
    if (is_url(input) || device.format != nullptr) {
        const int opened =
            device.format != nullptr ? open(device.name, device.format) : open(input, nullptr);
        if (opened < 0) {
            throw ToolError(name_ + ": cannot be read: " + libav_error(opened) +
                            "; zoltenc --list-formats lists devices and addresses");
        }
    } else {
        // What stands before a colon in a file's name is no protocol.
        check_opened(open("file:" + input, nullptr));
    }
    choose_streams(with_side_streams);
}

LibavInput::LibavInput(ByteReader bytes, bool with_side_streams)
    : name_(bytes.name()), bytes_(std::move(bytes)) {
    constexpr int kBufferBytes = 65536;
    auto* const buffer = static_cast<unsigned char*>(av_malloc(kBufferBytes));
    io_.reset(avio_alloc_context(buffer, kBufferBytes, 0, this, read_bytes, nullptr, nullptr));
    if (!io_) {
        throw std::bad_alloc();
    }
    check_opened(open("", nullptr));
    choose_streams(with_side_streams);
}

LibavInput::~LibavInput() = default;

bool LibavInput::is_live() const {
    return context_->pb == nullptr || (context_->pb->seekable & AVIO_SEEKABLE_NORMAL) == 0;
}

std::int64_t LibavInput::stated_end() const {
    if (context_->duration_estimation_method != AVFMT_DURATION_FROM_STREAM ||
        context_->duration <= 0) {
        return 0;
    }
    return av_rescale_q(context_->duration, AV_TIME_BASE_Q, video_->time_base);
}

std::string LibavInput::left_out() const {
    std::map<std::string, int> kinds;
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        const AVStream& stream = *context_->streams[i];
        if (&stream != video_ && !(side_streams_ && is_side_stream(stream))) {
            ++kinds[kind_of(stream)];
        }
    }
    std::string text;
    for (const auto& [kind, count] : kinds) {
        text += (text.empty() ? "" : ", ") + std::to_string(count) + " " + kind;
    }
    return text;
}

bool LibavInput::read(AVPacket* packet) {
    while (true) {
        const int result = av_read_frame(context_.get(), packet);
        check();
        if (result == AVERROR(EAGAIN)) {
            continue;
        }
        if (result < 0) {
            note_end(result);
            return false;
        }
        if ((packet->flags & AV_PKT_FLAG_CORRUPT) != 0 && has_no_more_bytes()) {
            cut_ = "its end is missing";
        } else {
            note_time(*packet);
            if (packet->stream_index == video_->index) {
                return true;
            }
            if (side_streams_) {
                side_streams_->push(*packet);
            }
        }
        av_packet_unref(packet);
    }
}

void LibavInput::interrupt() {
    interrupted_ = true;
    if (bytes_) {
        bytes_->interrupt();
    }
}

int LibavInput::open(const std::string& url, const AVInputFormat* format) {
    AVFormatContext* context = avformat_alloc_context();
    if (context == nullptr) {
        throw std::bad_alloc();
    }
    context->interrupt_callback = {is_interrupted, this};
    context->pb = io_.get();
    int result = avformat_open_input(&context, url.c_str(), format, nullptr);
    context_.reset(context);
    if (result >= 0) {
        result = avformat_find_stream_info(context, nullptr);
    }
    check();
    return result;
}

void LibavInput::check_opened(int result) const {
    if (result < 0) {
        throw ToolError(name_ + ": is not Y4M, nor can it be read as another video (" +
                        libav_error(result) +
                        "); raw pictures need -s WIDTHxHEIGHT (and -f FOURCC)");
    }
}

void LibavInput::choose_streams(bool with_side_streams) {
    std::vector<SideStreams::Stream> side_streams;
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        AVStream* const stream = context_->streams[i];
        const AVMediaType type = stream->codecpar->codec_type;
        if (video_ == nullptr && type == AVMEDIA_TYPE_VIDEO && !is_picture_attached(*stream)) {
            video_ = stream;
        } else if (with_side_streams && is_side_stream(*stream)) {
            side_streams.push_back({stream->index, stream->codecpar, stream->time_base,
                                    stream->disposition, stream->metadata});
        }
    }
    if (video_ == nullptr) {
        const std::string others = left_out();
        throw ToolError(name_ + ": holds no video" + (others.empty() ? "" : ", only " + others) +
                        "; a file with a video stream is needed");
    }
    if (!side_streams.empty()) {
        side_streams_.emplace(std::move(side_streams));
    }
}

// Throws what a reader of bytes has thrown below the library, and on a stop signal.
void LibavInput::check() {
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
    if (is_interrupted(this) != 0) {
        throw TruncatedInput(name_ + ": reading it was stopped");
    }
}

bool LibavInput::has_no_more_bytes() const {
    return context_->pb != nullptr && avio_feof(context_->pb) != 0;
}

// Notes how far the packets reach, in AV_TIME_BASE.
void LibavInput::note_time(const AVPacket& packet) {
    const std::int64_t start = packet.pts != AV_NOPTS_VALUE ? packet.pts : packet.dts;
    if (start != AV_NOPTS_VALUE) {
        const AVRational base = context_->streams[packet.stream_index]->time_base;
        const std::int64_t end = av_sat_add64(start, packet.duration);
        end_ = std::max(end_, av_rescale_q(end, base, AV_TIME_BASE_Q));
    }
}

// The libraries take most cuts for the end: it is a cut where the packets reach less far than the
// file says.
void LibavInput::note_end(int result) {
    if (!cut_.empty()) {
        return;
    }
    if (result != AVERROR_EOF) {
        cut_ = libav_error(result);
    } else if (has_no_more_bytes() && stated_end() > 0 &&
               end_ < context_->duration - kEndTolerance) {
        cut_ = "by its header it is longer";
    }
}

int LibavInput::read_bytes(void* self, std::uint8_t* buffer, int size) {
    auto& input = *static_cast<LibavInput*>(self);
    try {
        const std::size_t got =
            input.bytes_->read_available(buffer, static_cast<std::size_t>(size));
        return got == 0 ? AVERROR_EOF : static_cast<int>(got);
    } catch (...) {
        input.failure_ = std::current_exception();
        return AVERROR(EIO);
    }
}

int LibavInput::is_interrupted(void* self) {
    return static_cast<LibavInput*>(self)->interrupted_ || StopSignal::received() != 0 ? 1 : 0;
}

}  // namespace zolt
