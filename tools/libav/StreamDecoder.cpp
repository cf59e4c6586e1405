#include "libav/StreamDecoder.h"

extern "C" {
#include <libavutil/motion_vector.h>
#include <libavutil/video_enc_params.h>
}

#include <cstdarg>
#include <cstdio>
#include <new>

#include "io/ToolError.h"

namespace zolt {
namespace {

constexpr unsigned char kStartCode[] = {0, 0, 0, 1};
constexpr int kMacroblockSide = 16;

// What the decoder logs before the macroblock types of a picture; three characters for each of
// them follow, row by row.
constexpr const char* kTypesBegin = "New frame, type: ";
constexpr std::size_t kTypeLetters = 3;

MacroblockMap::Type macroblock_type(char type, char partition) {
    using Type = MacroblockMap::Type;
    switch (type) {
        case 'P':
            return Type::pcm;
        case 'I':
            return Type::intra_16x16;
        case 'i':
            return Type::intra_4x4;
        case 'S':
            return Type::skipped;
        default:
            return partition == ' ' ? Type::inter_16x16 : Type::inter_parts;
    }
}

std::vector<MacroblockMap::Motion> motion_vectors(const AVFrame& frame) {
    std::vector<MacroblockMap::Motion> result;
    const AVFrameSideData* const data =
        av_frame_get_side_data(&frame, AV_FRAME_DATA_MOTION_VECTORS);
    if (data != nullptr) {
        const auto* const vectors = reinterpret_cast<const AVMotionVector*>(data->data);
        const std::size_t count = data->size / sizeof *vectors;
        for (std::size_t i = 0; i < count; ++i) {
            result.push_back({vectors[i].dst_x, vectors[i].dst_y,
                              vectors[i].motion_x * 4 / vectors[i].motion_scale,
                              vectors[i].motion_y * 4 / vectors[i].motion_scale});
        }
    }
    return result;
}

// Of `count` macroblocks; nothing where the decoder told of any other number.
std::vector<int> quantisers(const AVFrame& frame, std::size_t count) {
    const AVFrameSideData* const data =
        av_frame_get_side_data(&frame, AV_FRAME_DATA_VIDEO_ENC_PARAMS);
    if (data == nullptr) {
        return {};
    }
    auto* const parameters = reinterpret_cast<AVVideoEncParams*>(data->data);
    std::vector<int> result;
    for (unsigned i = 0; i < parameters->nb_blocks; ++i) {
        result.push_back(parameters->qp + av_video_enc_params_block(parameters, i)->delta_qp);
    }
    return result.size() == count ? result : std::vector<int>{};
}

}  // namespace

StreamDecoder::StreamDecoder(bool with_maps)
    : packet_(av_packet_alloc()), frame_(av_frame_alloc()) {
    const AVCodec* const decoder = avcodec_find_decoder(AV_CODEC_ID_H264);
    if (decoder == nullptr) {
        throw ToolError("libavcodec has no H.264 decoder, which --psnr and --report need");
    }
    codec_.reset(avcodec_alloc_context3(decoder));
    if (!codec_ || !packet_ || !frame_) {
        throw std::bad_alloc();
    }
    codec_->thread_count = 1;
    codec_->flags |= AV_CODEC_FLAG_LOW_DELAY;
    // What is wrong with the stream is to be seen, not mended.
    codec_->err_recognition |= AV_EF_EXPLODE;
    if (with_maps) {
        codec_->export_side_data |=
            AV_CODEC_EXPORT_DATA_MVS | AV_CODEC_EXPORT_DATA_VIDEO_ENC_PARAMS;
        // Macroblock types are told in the log alone.
        codec_->debug |= FF_DEBUG_MB_TYPE;
        codec_->opaque = this;
        av_log_set_callback(take_log);
    }
    const int result = avcodec_open2(codec_.get(), decoder, nullptr);
    if (result < 0) {
        throw ToolError("libavcodec's H.264 decoder does not start: " + libav_error(result));
    }
}

void StreamDecoder::begin(const std::vector<unsigned char>& seq_par_set,
                          const std::vector<unsigned char>& pic_par_set) {
    append(seq_par_set.data(), seq_par_set.size());
    append(pic_par_set.data(), pic_par_set.size());
}

const AVFrame& StreamDecoder::decode(const unsigned char* nal, std::size_t size) {
    append(nal, size);
    const std::size_t used = bytes_.size();
    bytes_.resize(used + AV_INPUT_BUFFER_PADDING_SIZE);
    packet_->data = bytes_.data();
    packet_->size = static_cast<int>(used);
    packet_->pts = pictures_;
    log_.clear();
    int result = avcodec_send_packet(codec_.get(), packet_.get());
    if (result >= 0) {
        result = avcodec_receive_frame(codec_.get(), frame_.get());
    }
    bytes_.clear();
    if (result < 0) {
        throw ToolError("picture " + std::to_string(pictures_) +
                        ": libavcodec cannot decode what the encoder made: " + libav_error(result));
    }
    if (frame_->pts != pictures_) {
        throw ToolError("picture " + std::to_string(pictures_) +
                        ": libavcodec holds it back, though pictures are not reordered");
    }
    ++pictures_;
    return *frame_;
}

MacroblockMap StreamDecoder::map() const {
    MacroblockMap map;
    map.columns = (frame_->width + kMacroblockSide - 1) / kMacroblockSide;
    map.rows = (frame_->height + kMacroblockSide - 1) / kMacroblockSide;
    map.types = macroblock_types(map.columns, map.rows);
    map.qp = quantisers(*frame_, static_cast<std::size_t>(map.columns) * map.rows);
    map.motion = motion_vectors(*frame_);
    return map;
}

// Called for all that libav logs, on any thread.
void StreamDecoder::take_log(void* sender, int level, const char* format, va_list arguments) {
    const bool is_codec =
        sender != nullptr && *static_cast<const AVClass**>(sender) == avcodec_get_class();
    auto* const codec = is_codec ? static_cast<AVCodecContext*>(sender) : nullptr;
    if (codec == nullptr || (codec->debug & FF_DEBUG_MB_TYPE) == 0 || level < AV_LOG_DEBUG) {
        av_log_default_callback(sender, level, format, arguments);
        return;
    }
    char text[256];
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(text, sizeof text, format, arguments);
    std::string& log = static_cast<StreamDecoder*>(codec->opaque)->log_;
    if (length >= 0 && static_cast<std::size_t>(length) < sizeof text) {
        log += text;
    } else if (length > 0) {
        std::string whole(static_cast<std::size_t>(length) + 1, '\0');
        std::vsnprintf(whole.data(), whole.size(), format, again);
        log.append(whole, 0, static_cast<std::size_t>(length));
    }
    va_end(again);
}

// Empty when the log is not as expected.
std::vector<MacroblockMap::Type> StreamDecoder::macroblock_types(int columns, int rows) const {
    std::size_t at = log_.find(kTypesBegin);
    at = at == std::string::npos ? at : log_.find('\n', at);
    std::vector<MacroblockMap::Type> types;
    const std::size_t row_length = static_cast<std::size_t>(columns) * kTypeLetters;
    for (int row = 0; row < rows; ++row) {
        // Stands at the line end before the row.
        if (at == std::string::npos || log_.find('\n', at + 1) != at + 1 + row_length) {
            return {};
        }
        for (std::size_t i = at + 1; i <= at + row_length; i += kTypeLetters) {
            types.push_back(macroblock_type(log_[i], log_[i + 1]));
        }
        at += 1 + row_length;
    }
    return types;
}

void StreamDecoder::append(const unsigned char* nal, std::size_t size) {
    bytes_.insert(bytes_.end(), std::begin(kStartCode), std::end(kStartCode));
    bytes_.insert(bytes_.end(), nal, nal + size);
}

}  // namespace zolt
