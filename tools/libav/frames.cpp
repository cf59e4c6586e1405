#include "libav/frames.h"

#include <algorithm>
#include <new>

extern "C" {
#include <libavutil/pixdesc.h>
}

namespace zolt {
namespace {

// For each format of samples, the one that pixel_format_of gives comes first.
struct DirectFormat {
    AVPixelFormat pixel_format;
    int fourcc_code;
};
constexpr DirectFormat kDirectFormats[] = {
    {AV_PIX_FMT_YUV420P, PictureFormat::kIyuv},  {AV_PIX_FMT_YUVJ420P, PictureFormat::kIyuv},
    {AV_PIX_FMT_YUVA420P, PictureFormat::kIyuv}, {AV_PIX_FMT_YUYV422, PictureFormat::kYuy2},
    {AV_PIX_FMT_BGRA, fourcc("BGRA")},           {AV_PIX_FMT_BGR0, fourcc("BGRA")},
    {AV_PIX_FMT_RGBA, fourcc("RGBA")},           {AV_PIX_FMT_RGB0, fourcc("RGBA")},
    {AV_PIX_FMT_ARGB, fourcc("ARGB")},           {AV_PIX_FMT_0RGB, fourcc("ARGB")},
    {AV_PIX_FMT_BGR24, fourcc("BGR ")},          {AV_PIX_FMT_RGB24, fourcc("RGB ")},
};

// Flags of libavutil's description of a format.
bool has_flags(int pixel_format, std::uint64_t flags) {
    const AVPixFmtDescriptor* const description =
        av_pix_fmt_desc_get(static_cast<AVPixelFormat>(pixel_format));
    return description != nullptr && (description->flags & flags) != 0;
}

}  // namespace

std::optional<int> fourcc_of(int pixel_format) {
    for (const DirectFormat& format : kDirectFormats) {
        if (format.pixel_format == pixel_format) {
            return format.fourcc_code;
        }
    }
    return std::nullopt;
}

AVPixelFormat pixel_format_of(int fourcc_code) {
    for (const DirectFormat& format : kDirectFormats) {
        if (format.fourcc_code == fourcc_code) {
            return format.pixel_format;
        }
    }
    return AV_PIX_FMT_NONE;
}

bool holds_rgb(int pixel_format) {
    return has_flags(pixel_format, AV_PIX_FMT_FLAG_RGB | AV_PIX_FMT_FLAG_PAL) ||
           pixel_format == AV_PIX_FMT_MONOBLACK || pixel_format == AV_PIX_FMT_MONOWHITE;
}

bool is_full_range(int pixel_format) {
    switch (pixel_format) {
        case AV_PIX_FMT_YUVJ411P:
        case AV_PIX_FMT_YUVJ420P:
        case AV_PIX_FMT_YUVJ422P:
        case AV_PIX_FMT_YUVJ440P:
        case AV_PIX_FMT_YUVJ444P:
            return true;
        default: {
            // Grey is, with or without alpha.
            const AVPixFmtDescriptor* const description =
                av_pix_fmt_desc_get(static_cast<AVPixelFormat>(pixel_format));
            return description != nullptr && description->nb_components <= 2;
        }
    }
}

LibavPtr<AVFrame> new_frame(const PictureFormat& format) {
    LibavPtr<AVFrame> frame(av_frame_alloc());
    if (!frame) {
        throw std::bad_alloc();
    }
    frame->width = format.width;
    frame->height = format.height;
    frame->format = pixel_format_of(format.fourcc_code);
    if (av_frame_get_buffer(frame.get(), 0) < 0) {
        throw std::bad_alloc();
    }
    return frame;
}

void copy_picture(const AVFrame& frame, const PictureFormat& format, unsigned char* sample) {
    int plane = 0;
    for (const PictureFormat::Plane& to : format.planes()) {
        const unsigned char* row = frame.data[plane];
        for (std::size_t y = 0; y < to.rows; ++y) {
            sample = std::copy_n(row, to.row_bytes, sample);
            row += frame.linesize[plane];
        }
        ++plane;
    }
}

void copy_picture(const unsigned char* sample, const PictureFormat& format, AVFrame& frame) {
    const bool is_planar = format.fourcc_code == PictureFormat::kIyuv;
    int plane = 0;
    for (const PictureFormat::Plane& from : format.planes()) {
        unsigned char* row = frame.data[plane];
        for (std::size_t y = 0; y < from.rows; ++y, row += frame.linesize[plane]) {
            std::copy_n(sample, from.row_bytes, row);
            sample += from.row_bytes;
            if (is_planar && from.row_bytes < from.file_row_bytes) {
                row[from.row_bytes] = row[from.row_bytes - 1];
            } else if (from.row_bytes < from.file_row_bytes) {
                // Y0 U of a pair; Y1 V as in the pair before.
                std::copy_n(row + from.row_bytes - 4, 2, row + from.row_bytes);
            }
        }
        if (from.rows < from.file_rows) {
            std::copy_n(row - frame.linesize[plane], from.file_row_bytes, row);
        }
        ++plane;
    }
}

}  // namespace zolt
