#pragma once

#include <gst/video/video.h>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace zolt_test {

// The value of component c (red, green, blue or Y, U, V) of picture n, at (x, y) of the component's
// own grid: a pattern that moves.
std::uint8_t component(int n, int c, int x, int y);

// Picture n with its time, in a new buffer of the format's usual layout.
GstBuffer* moving_picture(const GstVideoInfo& info, int n);

// The same with rows and planes that lie apart, as told by a GstVideoMeta: `gap` more bytes a row,
// and before each plane.
GstBuffer* scattered_picture(const GstVideoInfo& info, int n, int gap);

// Planar 4:2:0 pictures of the coded size that picture n is to be coded from, computed from
// `component` alone: extended to multiples of 16, or cut to them.
std::vector<std::uint8_t> padded_i420(const GstVideoInfo& info, int n);
std::vector<std::uint8_t> cropped_i420(const GstVideoInfo& info, int n);

}  // namespace zolt_test
