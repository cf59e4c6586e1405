#include "io/Y4mHeader.h"

#include <algorithm>

#include "io/PictureFormat.h"
#include "io/ToolError.h"
#include "io/numbers.h"

namespace zolt {
namespace {

// The chroma sitings of 4:2:0 differ by a fraction of a sample, which no syntax element of the
// coded stream tells.
constexpr std::string_view kColourSpaces[] = {"420", "420jpeg", "420mpeg2", "420paldv"};

// Text of the input as part of a one-line message.
std::string quoted(std::string_view text) {
    constexpr std::size_t kMaxLength = 40;
    std::string result = "'";
    for (const char letter : text.substr(0, kMaxLength)) {
        result += letter >= ' ' && letter <= '~' ? letter : '?';
    }
    return result + (text.size() > kMaxLength ? "...'" : "'");
}

int parse_side(std::string_view value, const char* what, const std::string& file_name) {
    const auto number = parse_number(value);
    if (!number || *number == 0) {
        throw ToolError(file_name + ": Y4M header: " + what + " " + quoted(value) +
                        " is not a positive whole number");
    }
    return *number;
}

std::optional<FrameRate> parse_frame_rate(std::string_view value, const std::string& file_name) {
    if (value == "0:0") {
        return std::nullopt;
    }
    const auto rate = FrameRate::parse(value);
    if (!rate) {
        throw ToolError(file_name + ": Y4M header: frame rate " + quoted(value) +
                        " is not a ratio of positive numbers such as 30000:1001");
    }
    return rate;
}

void check_colour_space(std::string_view value, const std::string& file_name) {
    if (std::find(std::begin(kColourSpaces), std::end(kColourSpaces), value) ==
        std::end(kColourSpaces)) {
        throw ToolError(
            file_name + ": Y4M colour space " + quoted(value) +
            " is not 8-bit 4:2:0 (420jpeg, 420mpeg2, 420paldv, 420); convert it with: " +
            "ffmpeg -i INPUT -pix_fmt yuv420p OUTPUT.y4m");
    }
}

}  // namespace

Y4mHeader Y4mHeader::parse(std::string_view line, const std::string& file_name) {
    if (line.substr(0, kMagic.size()) != kMagic ||
        (line.size() > kMagic.size() && line[kMagic.size()] != ' ')) {
        throw ToolError(file_name + ": does not begin with a Y4M header (YUV4MPEG2 W... H...)");
    }
    line.remove_prefix(kMagic.size());

    Y4mHeader header;
    while (!line.empty()) {
        const std::size_t length = std::min(line.find(' '), line.size());
        const std::string_view parameter = line.substr(0, length);
        line.remove_prefix(std::min(length + 1, line.size()));
        if (parameter.empty()) {
            continue;
        }
        const std::string_view value = parameter.substr(1);
        switch (parameter[0]) {
            case 'W':
                header.width = parse_side(value, "width", file_name);
                break;
            case 'H':
                header.height = parse_side(value, "height", file_name);
                break;
            case 'F':
                header.frame_rate = parse_frame_rate(value, file_name);
                break;
            case 'I':
                header.interlaced = value == "t" || value == "b" || value == "m";
                break;
            case 'C':
                check_colour_space(value, file_name);
                break;
            default:
                break;
        }
    }
    if (header.width == 0 || header.height == 0) {
        throw ToolError(file_name + ": Y4M header: " + (header.width == 0 ? "width" : "height") +
                        " is missing (W... and H... are needed)");
    }
    const std::string error = PictureFormat::size_error(header.width, header.height);
    if (!error.empty()) {
        throw ToolError(file_name + ": " + error);
    }
    return header;
}

}  // namespace zolt
