#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "io/FrameRate.h"

namespace zolt {

// The stream header of a Y4M file.
struct Y4mHeader {
    static constexpr std::string_view kMagic = "YUV4MPEG2";

    int width = 0;
    int height = 0;
    std::optional<FrameRate> frame_rate;  // nothing where the header gives none or 0:0
    bool interlaced = false;

    // Reads a header line (without its line end) of 8-bit 4:2:0 pictures. Parameters that do not
    // matter to an encoder (pixel aspect, comments) are passed over. Throws a ToolError that begins
    // with `file_name` when the line is no such header.
    static Y4mHeader parse(std::string_view line, const std::string& file_name);
};

}  // namespace zolt
