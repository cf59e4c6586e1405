#pragma once

#include <optional>

#include "io/PictureFormat.h"
#include "libav/libav.h"

namespace zolt {

// The format of samples (PictureFormat) that hold the rows of such frames as they are; nothing when
// there is none. Alpha and padding are the same, of no account.
std::optional<int> fourcc_of(int pixel_format);

// libav's name for such samples; AV_PIX_FMT_NONE where it has none.
AVPixelFormat pixel_format_of(int fourcc_code);

// Whether frames hold red, green and blue, be it in planes or by way of a palette.
bool holds_rgb(int pixel_format);

// Whether frames that declare no range have the full one.
bool is_full_range(int pixel_format);

// A frame with a picture of its own, which is not set.
LibavPtr<AVFrame> new_frame(const PictureFormat& format);

// Copies the rows of a frame, which has the pixel format and at least the size of `format`, into a
// sample of it.
void copy_picture(const AVFrame& frame, const PictureFormat& format, unsigned char* sample);

// The other way round. Chroma of half pairs, which a sample leaves out, is the one beside it.
void copy_picture(const unsigned char* sample, const PictureFormat& format, AVFrame& frame);

}  // namespace zolt
