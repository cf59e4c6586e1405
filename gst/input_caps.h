#pragma once

#include <gst/video/video.h>

#include <vector>

#include "InputDescription.h"
#include "io/PicturePacker.h"

namespace zolt {

// The formats of the sink caps, as GStreamer spells them. Each has in memory what the encoder's
// format of the same name has, and those with an x what its format with an A has.
#define ZOLT_GST_FORMATS "{ I420, YUY2, AYUV, BGRA, RGBA, ARGB, BGRx, RGBx, xRGB, BGR, RGB }"

// What sink caps say of the pictures. Throws a ToolError when they cannot be coded.
InputDescription describe_input(const GstVideoInfo& info);

// Where the planes of a mapped frame are, whose format is the one given.
std::vector<PicturePacker::Rows> rows_of(const GstVideoFrame& frame, const PictureFormat& format);

}  // namespace zolt
