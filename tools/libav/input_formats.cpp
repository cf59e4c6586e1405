#include "libav/input_formats.h"

#include <set>

#include "libav/devices.h"

namespace zolt {
namespace {

using Names = std::set<std::string>;

Names file_formats() {
    Names names;
    void* position = nullptr;
    while (const AVInputFormat* const format = av_demuxer_iterate(&position)) {
        names.insert(format->name);
    }
    return names;
}

Names video_codecs() {
    Names names;
    void* position = nullptr;
    while (const AVCodec* const codec = av_codec_iterate(&position)) {
        if (av_codec_is_decoder(codec) != 0 && codec->type == AVMEDIA_TYPE_VIDEO) {
            names.insert(avcodec_get_name(codec->id));
        }
    }
    return names;
}

Names device_kinds() {
    Names names;
    for (const AVInputFormat* const device : devices()) {
        names.insert(device->name);
    }
    return names;
}

Names protocols() {
    Names names;
    void* position = nullptr;
    while (const char* const name = avio_enum_protocols(&position, 0)) {
        names.insert(name);
    }
    return names;
}

// A heading and names in lines of at most 78 characters.
std::string paragraph(const std::string& heading, const Names& names) {
    constexpr std::size_t kMaxLine = 78;
    std::string text = heading + ":\n";
    std::string line = " ";
    for (const std::string& name : names) {
        if (line.size() + 1 + name.size() > kMaxLine) {
            text += line + "\n";
            line = " ";
        }
        line += " " + name;
    }
    return text + line + "\n";
}

}  // namespace

std::string input_formats() {
    return paragraph("Files", file_formats()) + paragraph("Video codecs", video_codecs()) +
           paragraph("Devices, as KIND:NAME", device_kinds()) +
           paragraph("Addresses, as PROTOCOL://...", protocols());
}

}  // namespace zolt
