#include "io/PictureFormat.h"

#include <algorithm>
#include <cctype>

namespace zolt {
namespace {

// Formats with whole pixels only.
struct PackedFormat {
    int fourcc_code;
    std::size_t pixel_bytes;
};
constexpr PackedFormat kPackedFormats[] = {
    {fourcc("AYUV"), 4}, {fourcc("BGRA"), 4}, {fourcc("RGBA"), 4},
    {fourcc("ARGB"), 4}, {fourcc("BGR "), 3}, {fourcc("RGB "), 3},
};

constexpr int kMacroblockSide = 16;

}  // namespace

std::optional<int> PictureFormat::parse_fourcc(std::string_view text) {
    if (text.size() < 3 || text.size() > 4) {
        return std::nullopt;
    }
    char padded[5] = "    ";
    std::transform(text.begin(), text.end(), padded,
                   [](unsigned char letter) { return static_cast<char>(std::toupper(letter)); });
    const int code = fourcc(padded);
    const bool known =
        code == kIyuv || code == kYuy2 ||
        std::any_of(std::begin(kPackedFormats), std::end(kPackedFormats),
                    [code](const PackedFormat& format) { return format.fourcc_code == code; });
    return known ? std::optional<int>(code) : std::nullopt;
}

std::string PictureFormat::fourcc_text() const {
    std::string text;
    for (const int shift : {24, 16, 8, 0}) {
        text += static_cast<char>(fourcc_code >> shift & 0xFF);
    }
    return text.substr(0, text.find(' '));
}

std::string PictureFormat::size_error(int width, int height) {
    const std::string size = "picture size " + std::to_string(width) + "x" + std::to_string(height);
    if (width < kMinSide || height < kMinSide) {
        return size + " is too small: the smallest is 16x16";
    }
    if (width > kMaxSide || height > kMaxSide ||
        (width / kMacroblockSide) * (height / kMacroblockSide) > kMaxMacroblocks) {
        return size + " is too large: the largest has " + std::to_string(kMaxSide) +
               " samples a side and " + std::to_string(kMaxMacroblocks) + " macroblocks of 16x16";
    }
    return "";
}

int PictureFormat::rounded_up(int side) {
    return (side + kMacroblockSide - 1) / kMacroblockSide * kMacroblockSide;
}

std::size_t PictureFormat::sample_bytes() const {
    std::size_t bytes = 0;
    for (const Plane& plane : planes()) {
        bytes += plane.rows * plane.row_bytes;
    }
    return bytes;
}

std::size_t PictureFormat::file_bytes() const {
    std::size_t bytes = 0;
    for (const Plane& plane : planes()) {
        bytes += plane.file_rows * plane.file_row_bytes;
    }
    return bytes;
}

std::size_t PictureFormat::read(ByteReader& input, unsigned char* sample) const {
    if (sample_bytes() == file_bytes()) {
        return input.read(sample, file_bytes());
    }
    std::size_t taken = 0;
    std::vector<unsigned char> row;
    for (const Plane& plane : planes()) {
        row.resize(plane.file_row_bytes);
        for (std::size_t y = 0; y < plane.file_rows; ++y) {
            const std::size_t got = input.read(row.data(), row.size());
            taken += got;
            if (got < row.size()) {
                return taken;
            }
            if (y < plane.rows) {
                sample = std::copy_n(row.begin(), plane.row_bytes, sample);
            }
        }
    }
    return taken;
}

std::vector<PictureFormat::Plane> PictureFormat::planes() const {
    const auto w = static_cast<std::size_t>(width);
    const auto h = static_cast<std::size_t>(height);
    if (fourcc_code == kIyuv) {
        const Plane luma{h, w, h, w};
        const Plane chroma{h / 2, w / 2, (h + 1) / 2, (w + 1) / 2};
        return {luma, chroma, chroma};
    }
    if (fourcc_code == kYuy2) {
        return {{h, w * 2, h, (w + 1) / 2 * 4}};
    }
    for (const PackedFormat& format : kPackedFormats) {
        if (format.fourcc_code == fourcc_code) {
            return {{h, w * format.pixel_bytes, h, w * format.pixel_bytes}};
        }
    }
    return {};
}

}  // namespace zolt
