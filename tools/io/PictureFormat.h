#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "io/ByteReader.h"
#include "media/fourcc.h"

namespace zolt {

// Colour format and size of an uncompressed picture, and its two layouts. In a file, a row or
// column of a chroma plane that only half a luma pair belongs to is stored as a whole one (3x3
// planar 4:2:0: chroma planes of 2x2); in a media sample it is left out (chroma planes of 1x1). The
// layouts of pictures of even size are equal.
struct PictureFormat {
    static constexpr int kIyuv = fourcc("IYUV");
    static constexpr int kYuy2 = fourcc("YUY2");
    static constexpr int kAyuv = fourcc("AYUV");
    // The smallest picture that the encoder takes; and the largest frame of any level, in
    // macroblocks of 16x16 (ITU-T H.264 Table A-1), with the longest side that clause A.3.1 gives
    // it.
    static constexpr int kMinSide = 16;
    static constexpr int kMaxSide = 16880;
    static constexpr int kMaxMacroblocks = 139264;

    int fourcc_code = kIyuv;
    int width = 0;
    int height = 0;

    // The code of "IYUV", "YUY2", "AYUV", "BGRA", "RGBA", "ARGB", "BGR" or "RGB" (the last two with
    // or without the blank that ends their codes), letters of either case; nothing for any other
    // text.
    static std::optional<int> parse_fourcc(std::string_view text);

    // The format's code as text, without a blank at its end.
    std::string fourcc_text() const;

    // What is wrong with a picture size, with what would be right; empty when it can be coded.
    static std::string size_error(int width, int height);

    // Whether pictures of a format have luma and chroma; the others have red, green and blue.
    static bool is_yuv(int fourcc_code) {
        return fourcc_code == kIyuv || fourcc_code == kYuy2 || fourcc_code == kAyuv;
    }

    // A side rounded up to whole macroblocks.
    static int rounded_up(int side);

    // This format with both sides rounded up.
    PictureFormat padded() const { return {fourcc_code, rounded_up(width), rounded_up(height)}; }

    // Bytes of a picture in a media sample and in a file.
    std::size_t sample_bytes() const;
    std::size_t file_bytes() const;

    // A plane or a packed picture, as a media sample and a file hold it.
    struct Plane {
        std::size_t rows;
        std::size_t row_bytes;
        std::size_t file_rows;
        std::size_t file_row_bytes;
    };
    std::vector<Plane> planes() const;

    // Reads one picture as files hold it into `sample` (sample_bytes() long). Returns the bytes
    // taken from the input: file_bytes(), or fewer where it ends.
    std::size_t read(ByteReader& input, unsigned char* sample) const;
};

}  // namespace zolt
