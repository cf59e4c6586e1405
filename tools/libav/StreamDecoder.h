#pragma once

#include <string>
#include <vector>

#include "io/MacroblockMap.h"
#include "libav/libav.h"

namespace zolt {

// Decodes an H.264 stream of pictures that are never reordered, NAL unit by NAL unit.
class StreamDecoder {
public:
    // `with_maps`: the decoder tells of every macroblock, which takes a little longer.
    explicit StreamDecoder(bool with_maps);
    StreamDecoder(const StreamDecoder&) = delete;
    StreamDecoder& operator=(const StreamDecoder&) = delete;

    // The bare parameter sets of the pictures that follow.
    void begin(const std::vector<unsigned char>& seq_par_set,
               const std::vector<unsigned char>& pic_par_set);

    // Decodes one picture from its only slice, a bare NAL unit. The picture is the decoder's and
    // good until the next call. Throws a ToolError when there is none.
    const AVFrame& decode(const unsigned char* nal, std::size_t size);

    // Of the picture that was decoded last.
    MacroblockMap map() const;

private:
    static void take_log(void* sender, int level, const char* format, va_list arguments);

    std::vector<MacroblockMap::Type> macroblock_types(int columns, int rows) const;
    void append(const unsigned char* nal, std::size_t size);

    LibavPtr<AVCodecContext> codec_;
    LibavPtr<AVPacket> packet_;
    LibavPtr<AVFrame> frame_;
    std::vector<unsigned char> bytes_;  // of the packet under construction
    std::string log_;                   // what the decoder said of the last picture
    std::int64_t pictures_ = 0;
};

}  // namespace zolt
