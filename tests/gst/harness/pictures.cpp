#include "pictures.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>

#include "../../color/ReferenceConverter.h"
#include "media/fourcc.h"

namespace zolt_test {
namespace {

constexpr int kIyuv = zolt::fourcc("IYUV");

void set_times(GstBuffer* buffer, const GstVideoInfo& info, int n) {
    const int fps_n = std::max(GST_VIDEO_INFO_FPS_N(&info), 1);
    const guint64 ticks = static_cast<guint64>(n) * GST_SECOND;
    GST_BUFFER_PTS(buffer) = gst_util_uint64_scale_int(ticks, GST_VIDEO_INFO_FPS_D(&info), fps_n);
    GST_BUFFER_DURATION(buffer) =
        gst_util_uint64_scale_int(GST_SECOND, GST_VIDEO_INFO_FPS_D(&info), fps_n);
}

// Writes the components where GStreamer's description of the format says that they are.
void draw(GstBuffer* buffer, const GstVideoInfo& info, int n) {
    GstVideoFrame frame;
    ASSERT_TRUE(gst_video_frame_map(&frame, &info, buffer, GST_MAP_WRITE));
    for (guint c = 0; c < GST_VIDEO_FRAME_N_COMPONENTS(&frame); ++c) {
        auto* const data = static_cast<std::uint8_t*>(GST_VIDEO_FRAME_COMP_DATA(&frame, c));
        for (int y = 0; y < GST_VIDEO_FRAME_COMP_HEIGHT(&frame, c); ++y) {
            for (int x = 0; x < GST_VIDEO_FRAME_COMP_WIDTH(&frame, c); ++x) {
                data[y * GST_VIDEO_FRAME_COMP_STRIDE(&frame, c) +
                     x * GST_VIDEO_FRAME_COMP_PSTRIDE(&frame, c)] =
                    component(n, static_cast<int>(c), x, y);
            }
        }
    }
    gst_video_frame_unmap(&frame);
}

GstBuffer* filled_buffer(gsize size) {
    GstBuffer* const buffer = gst_buffer_new_allocate(nullptr, size, nullptr);
    gst_buffer_memset(buffer, 0, 0xA5, size);
    return buffer;
}

// A picture of width x height in the encoder's layout, whose own samples are those of a picture of
// from_width x from_height; beyond these the last ones are repeated.
Picture sample_of(const GstVideoInfo& info, int n, int width, int height, int* fourcc_code) {
    const int last_x = GST_VIDEO_INFO_WIDTH(&info) - 1;
    const int last_y = GST_VIDEO_INFO_HEIGHT(&info) - 1;
    const auto at = [n](int c, int x, int y, int right, int bottom) {
        return component(n, c, std::min(x, right), std::min(y, bottom));
    };
    Picture sample;
    if (GST_VIDEO_INFO_FORMAT(&info) == GST_VIDEO_FORMAT_I420) {
        *fourcc_code = kIyuv;
        for (int c = 0; c < 3; ++c) {
            const int shift = c > 0 ? 1 : 0;
            for (int y = 0; y < height >> shift; ++y) {
                for (int x = 0; x < width >> shift; ++x) {
                    sample.push_back(at(c, x, y, last_x >> shift, last_y >> shift));
                }
            }
        }
        return sample;
    }
    const bool is_rgb = GST_VIDEO_INFO_IS_RGB(&info);
    const bool is_yuy2 = GST_VIDEO_INFO_FORMAT(&info) == GST_VIDEO_FORMAT_YUY2;
    *fourcc_code = is_rgb    ? zolt::fourcc("RGBA")
                   : is_yuy2 ? zolt::fourcc("YUY2")
                             : zolt::fourcc("AYUV");
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            if (is_yuy2) {
                sample.push_back(at(0, x, y, last_x, last_y));
                sample.push_back(at(1 + x % 2, x / 2, y, last_x / 2, last_y));
                continue;
            }
            if (!is_rgb) {
                sample.push_back(0);
            }
            for (int c = 0; c < 3; ++c) {
                sample.push_back(at(c, x, y, last_x, last_y));
            }
            if (is_rgb) {
                sample.push_back(0);
            }
        }
    }
    return sample;
}

}  // namespace

std::uint8_t component(int n, int c, int x, int y) {
    const int slope = (3 + c) * x + (2 + 3 * c) * y + 5 * n;
    const int texture = ((x + 2 * n) * (y + 7) * (c + 11)) >> 3 & 31;
    const int wave = slope & 511;
    return static_cast<std::uint8_t>((wave < 256 ? wave : 511 - wave) * 7 / 8 + texture);
}

GstBuffer* moving_picture(const GstVideoInfo& info, int n) {
    GstBuffer* const buffer = filled_buffer(GST_VIDEO_INFO_SIZE(&info));
    draw(buffer, info, n);
    set_times(buffer, info, n);
    return buffer;
}

GstBuffer* scattered_picture(const GstVideoInfo& info, int n, int gap) {
    gsize offset[GST_VIDEO_MAX_PLANES] = {};
    gint stride[GST_VIDEO_MAX_PLANES] = {};
    gsize size = 0;
    for (guint plane = 0; plane < GST_VIDEO_INFO_N_PLANES(&info); ++plane) {
        gint components[GST_VIDEO_MAX_COMPONENTS];
        gst_video_format_info_component(info.finfo, plane, components);
        offset[plane] = size + static_cast<gsize>(gap);
        stride[plane] = GST_VIDEO_INFO_PLANE_STRIDE(&info, plane) + gap;
        size = offset[plane] + static_cast<gsize>(stride[plane]) *
                                   static_cast<gsize>(GST_VIDEO_FORMAT_INFO_SCALE_HEIGHT(
                                       info.finfo, components[0], GST_VIDEO_INFO_HEIGHT(&info)));
    }
    GstBuffer* const buffer = filled_buffer(size);
    gst_buffer_add_video_meta_full(buffer, GST_VIDEO_FRAME_FLAG_NONE, GST_VIDEO_INFO_FORMAT(&info),
                                   static_cast<guint>(GST_VIDEO_INFO_WIDTH(&info)),
                                   static_cast<guint>(GST_VIDEO_INFO_HEIGHT(&info)),
                                   GST_VIDEO_INFO_N_PLANES(&info), offset, stride);
    draw(buffer, info, n);
    set_times(buffer, info, n);
    return buffer;
}

std::vector<std::uint8_t> padded_i420(const GstVideoInfo& info, int n) {
    const int width = (GST_VIDEO_INFO_WIDTH(&info) + 15) / 16 * 16;
    const int height = (GST_VIDEO_INFO_HEIGHT(&info) + 15) / 16 * 16;
    int fourcc_code = 0;
    const Picture sample = sample_of(info, n, width, height, &fourcc_code);
    return reference_convert(sample, {width, height}, fourcc_code, {width, height}, kIyuv);
}

std::vector<std::uint8_t> cropped_i420(const GstVideoInfo& info, int n) {
    const int width = GST_VIDEO_INFO_WIDTH(&info);
    const int height = GST_VIDEO_INFO_HEIGHT(&info);
    int fourcc_code = 0;
    const Picture sample = sample_of(info, n, width, height, &fourcc_code);
    return reference_convert(sample, {width, height}, fourcc_code,
                             {width / 16 * 16, height / 16 * 16}, kIyuv);
}

}  // namespace zolt_test
