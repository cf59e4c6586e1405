#pragma once

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libswscale/swscale.h>
}

#include <memory>
#include <string>

namespace zolt {

// Owners of the libraries' objects.
struct LibavDelete {
    void operator()(AVFormatContext* input) const { avformat_close_input(&input); }
    void operator()(AVCodecContext* codec) const { avcodec_free_context(&codec); }
    void operator()(AVCodecParameters* parameters) const { avcodec_parameters_free(&parameters); }
    void operator()(AVDictionary* dictionary) const { av_dict_free(&dictionary); }
    void operator()(AVFrame* frame) const { av_frame_free(&frame); }
    void operator()(AVIOContext* io) const {
        av_freep(&io->buffer);
        avio_context_free(&io);
    }
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
    void operator()(SwsContext* scaler) const { sws_freeContext(scaler); }
};
template <class Object>
using LibavPtr = std::unique_ptr<Object, LibavDelete>;

// The text of a negative result of the libraries, such as "Invalid data found when processing
// input".
std::string libav_error(int result);

// Brings the libraries up. What they have to say of their own goes to standard error with
// `verbose`, and nowhere without it.
void libav_prepare(bool verbose);

}  // namespace zolt
