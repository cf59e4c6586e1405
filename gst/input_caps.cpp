#include "input_caps.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <string>

#include "io/ToolError.h"
#include "session/player_headers.h"

namespace zolt {
namespace {

struct Format {
    GstVideoFormat gst_format;
    int fourcc_code;
};

constexpr Format kFormats[] = {
    {GST_VIDEO_FORMAT_I420, fourcc("IYUV")}, {GST_VIDEO_FORMAT_YUY2, fourcc("YUY2")},
    {GST_VIDEO_FORMAT_AYUV, fourcc("AYUV")}, {GST_VIDEO_FORMAT_BGRA, fourcc("BGRA")},
    {GST_VIDEO_FORMAT_RGBA, fourcc("RGBA")}, {GST_VIDEO_FORMAT_ARGB, fourcc("ARGB")},
    {GST_VIDEO_FORMAT_BGRx, fourcc("BGRA")}, {GST_VIDEO_FORMAT_RGBx, fourcc("RGBA")},
    {GST_VIDEO_FORMAT_xRGB, fourcc("ARGB")}, {GST_VIDEO_FORMAT_BGR, fourcc("BGR ")},
    {GST_VIDEO_FORMAT_RGB, fourcc("RGB ")},
};

int fourcc_of(GstVideoFormat gst_format) {
    const auto* const found = std::find_if(
        std::begin(kFormats), std::end(kFormats),
        [gst_format](const Format& format) { return format.gst_format == gst_format; });
    if (found == std::end(kFormats)) {
        throw ToolError(std::string(gst_video_format_to_string(gst_format)) +
                        " pictures cannot be coded; put videoconvert in front");
    }
    return found->fourcc_code;
}

// The shape of a sample as clause E.2.1 takes it: 16 bits each; 0 to 0 for one that does not fit.
void set_shape(VideoTraits& traits, int width, int height) {
    constexpr int kMost = 0xFFFF;
    const int divisor = gst_util_greatest_common_divisor(width, height);
    if (width > 0 && height > 0 && width / divisor <= kMost && height / divisor <= kMost) {
        traits.sar_width = width / divisor;
        traits.sar_height = height / divisor;
    }
}

ColourDescription colour_of(const GstVideoColorimetry& colorimetry, int fourcc_code) {
    // GStreamer's code for what is not known is not reserved by Tables E-3 to E-5.
    const auto known = [](guint iso, bool is_known) {
        return is_known ? static_cast<int>(iso) : ColourDescription::kUnspecified;
    };
    ColourDescription given;
    given.colour_primaries = known(gst_video_color_primaries_to_iso(colorimetry.primaries),
                                   colorimetry.primaries != GST_VIDEO_COLOR_PRIMARIES_UNKNOWN);
    given.transfer_characteristics = known(gst_video_transfer_function_to_iso(colorimetry.transfer),
                                           colorimetry.transfer != GST_VIDEO_TRANSFER_UNKNOWN);
    given.matrix_coefficients = known(gst_video_color_matrix_to_iso(colorimetry.matrix),
                                      colorimetry.matrix != GST_VIDEO_COLOR_MATRIX_UNKNOWN);
    if (colorimetry.range != GST_VIDEO_COLOR_RANGE_UNKNOWN) {
        given.video_full_range = colorimetry.range == GST_VIDEO_COLOR_RANGE_0_255;
    }
    ColourDescription coded = coded_colour(fourcc_code, given);
    if (!PictureFormat::is_yuv(fourcc_code)) {
        // The conversion decides on matrix and range alone.
        if (given.colour_primaries != ColourDescription::kUnspecified) {
            coded.colour_primaries = given.colour_primaries;
        }
        if (given.transfer_characteristics != ColourDescription::kUnspecified) {
            coded.transfer_characteristics = given.transfer_characteristics;
        }
    }
    return coded;
}

}  // namespace

InputDescription describe_input(const GstVideoInfo& info) {
    InputDescription input;
    input.picture = {fourcc_of(GST_VIDEO_INFO_FORMAT(&info)), GST_VIDEO_INFO_WIDTH(&info),
                     GST_VIDEO_INFO_HEIGHT(&info)};
    const std::string error = PictureFormat::size_error(input.picture.width, input.picture.height);
    if (!error.empty()) {
        throw ToolError(error);
    }
    if (GST_VIDEO_INFO_IS_INTERLACED(&info)) {
        throw ToolError("interlaced pictures cannot be coded; put deinterlace in front");
    }
    if (GST_VIDEO_INFO_FPS_N(&info) > 0 && GST_VIDEO_INFO_FPS_D(&info) > 0) {
        input.frame_rate = FrameRate{GST_VIDEO_INFO_FPS_N(&info), GST_VIDEO_INFO_FPS_D(&info)};
    }
    set_shape(input.traits, GST_VIDEO_INFO_PAR_N(&info), GST_VIDEO_INFO_PAR_D(&info));
    input.traits.colour = colour_of(GST_VIDEO_INFO_COLORIMETRY(&info), input.picture.fourcc_code);
    return input;
}

std::vector<PicturePacker::Rows> rows_of(const GstVideoFrame& frame, const PictureFormat& format) {
    std::vector<PicturePacker::Rows> rows;
    for (const PictureFormat::Plane& plane : format.planes()) {
        const auto n = rows.size();
        rows.push_back({static_cast<const unsigned char*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, n)),
                        GST_VIDEO_FRAME_PLANE_STRIDE(&frame, n), plane.file_rows,
                        plane.file_row_bytes});
    }
    return rows;
}

}  // namespace zolt
