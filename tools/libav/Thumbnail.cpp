#include "libav/Thumbnail.h"

#include <algorithm>
#include <new>

#include "io/ToolError.h"

namespace zolt {
namespace {

// Players guess the matrix by the height where a stream does not tell.
constexpr int kFirstHdHeight = 720;
constexpr int kMatrixBt709 = 1;  // matrix_coefficients, ITU-T H.264 Table E-5

int sws_matrix(const ColourDescription& colour, int height) {
    const bool unknown = colour.matrix_coefficients == ColourDescription::kUnspecified;
    return colour.matrix_coefficients == kMatrixBt709 || (unknown && height >= kFirstHdHeight)
               ? SWS_CS_ITU709
               : SWS_CS_ITU601;
}

void check(int result, const char* what) {
    if (result < 0) {
        throw ToolError(std::string("a picture of the report cannot be ") + what + ": " +
                        libav_error(result));
    }
}

std::vector<unsigned char> coded(const AVFrame& picture, int quantiser) {
    const AVCodec* const coder = avcodec_find_encoder(AV_CODEC_ID_MJPEG);
    check(coder == nullptr ? AVERROR_ENCODER_NOT_FOUND : 0, "coded");
    const LibavPtr<AVCodecContext> codec(avcodec_alloc_context3(coder));
    const LibavPtr<AVPacket> packet(av_packet_alloc());
    if (!codec || !packet) {
        throw std::bad_alloc();
    }
    codec->width = picture.width;
    codec->height = picture.height;
    codec->pix_fmt = AV_PIX_FMT_YUV420P;
    codec->color_range = AVCOL_RANGE_JPEG;
    codec->time_base = {1, 1};
    codec->thread_count = 1;
    codec->flags |= AV_CODEC_FLAG_QSCALE | AV_CODEC_FLAG_BITEXACT;
    codec->global_quality = quantiser * FF_QP2LAMBDA;
    check(avcodec_open2(codec.get(), coder, nullptr), "coded");
    const LibavPtr<AVFrame> frame(av_frame_clone(&picture));
    if (!frame) {
        throw std::bad_alloc();
    }
    frame->quality = codec->global_quality;
    check(avcodec_send_frame(codec.get(), frame.get()), "coded");
    check(avcodec_receive_packet(codec.get(), packet.get()), "coded");
    return std::vector<unsigned char>(packet->data, packet->data + packet->size);
}

}  // namespace

Thumbnail::Thumbnail(const AVFrame& picture, const ColourDescription& colour)
    : scaled_(av_frame_alloc()) {
    if (!scaled_) {
        throw std::bad_alloc();
    }
    const int width = std::min(picture.width, kMaxWidth);
    scaled_->format = AV_PIX_FMT_YUV420P;
    scaled_->color_range = AVCOL_RANGE_JPEG;
    scaled_->width = width;
    scaled_->height = std::max(
        1, static_cast<int>(static_cast<std::int64_t>(picture.height) * width / picture.width));
    check(av_frame_get_buffer(scaled_.get(), 0), "scaled");
    const LibavPtr<SwsContext> scaler(sws_getContext(
        picture.width, picture.height, AV_PIX_FMT_YUV420P, scaled_->width, scaled_->height,
        AV_PIX_FMT_YUV420P, SWS_AREA | SWS_ACCURATE_RND, nullptr, nullptr, nullptr));
    check(scaler ? 0 : AVERROR(EINVAL), "scaled");
    const int* const from = sws_getCoefficients(sws_matrix(colour, picture.height));
    const int* const to = sws_getCoefficients(SWS_CS_ITU601);
    constexpr int kNeutral = 1 << 16;
    sws_setColorspaceDetails(scaler.get(), from, colour.video_full_range.value_or(false) ? 1 : 0,
                             to, 1, 0, kNeutral, kNeutral);
    check(sws_scale(scaler.get(), picture.data, picture.linesize, 0, picture.height, scaled_->data,
                    scaled_->linesize),
          "scaled");
}

std::vector<unsigned char> Thumbnail::jpeg(std::size_t most_bytes) const {
    constexpr int kQuantisers[] = {2, 3, 4, 6, 8, 11, 15, 20, 31};
    std::vector<unsigned char> file;
    for (const int quantiser : kQuantisers) {
        file = coded(*scaled_, quantiser);
        if (file.size() <= most_bytes) {
            break;
        }
    }
    return file;
}

}  // namespace zolt
