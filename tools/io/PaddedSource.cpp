#include "io/PaddedSource.h"

#include <algorithm>
#include <utility>

#include "io/ToolError.h"

namespace zolt {
namespace {

constexpr int kYuy2PairBytes = 4;

}  // namespace

PaddedSource::PaddedSource(std::unique_ptr<FrameSource> source)
    : FilteredSource(std::move(source)),
      original_(this->source().format()),
      padded_{original_.fourcc_code, PictureFormat::rounded_up(original_.width),
              PictureFormat::rounded_up(original_.height)},
      picture_(original_.sample_bytes()) {
    const std::string error = PictureFormat::size_error(padded_.width, padded_.height);
    if (!error.empty()) {
        throw ToolError(name() + ": padded to multiples of 16, its " + error +
                        "; take --fit crop instead");
    }
}

VideoTraits PaddedSource::traits() const {
    VideoTraits traits = source().traits();
    traits.shown_width = original_.width;
    traits.shown_height = original_.height;
    return traits;
}

bool PaddedSource::read(std::vector<unsigned char>& sample) {
    if (!source().read(picture_)) {
        return false;
    }
    const std::vector<PictureFormat::Plane> from = original_.planes();
    const std::vector<PictureFormat::Plane> to = padded_.planes();
    const unsigned char* row = picture_.data();
    unsigned char* padded_row = sample.data();
    for (std::size_t plane = 0; plane < from.size(); ++plane) {
        for (std::size_t y = 0; y < to[plane].rows; ++y, padded_row += to[plane].row_bytes) {
            if (y < from[plane].rows) {
                extend_row(row, from[plane].row_bytes, padded_row, to[plane].row_bytes);
                row += from[plane].row_bytes;
            } else {
                std::copy_n(padded_row - to[plane].row_bytes, to[plane].row_bytes, padded_row);
            }
        }
    }
    return true;
}

// Copies a row and repeats its last pixel.
void PaddedSource::extend_row(const unsigned char* from, std::size_t from_bytes, unsigned char* to,
                              std::size_t to_bytes) const {
    std::copy_n(from, from_bytes, to);
    if (padded_.fourcc_code == PictureFormat::kYuy2) {
        // Y0 U Y1 V: what a row of odd width has of its last pair is Y0 and U.
        std::size_t filled = from_bytes;
        if (filled % kYuy2PairBytes != 0) {
            to[filled] = to[filled - 2];
            to[filled + 1] = to[filled - 3];
            filled += 2;
        }
        const unsigned char last[kYuy2PairBytes] = {to[filled - 2], to[filled - 3], to[filled - 2],
                                                    to[filled - 1]};
        for (; filled < to_bytes; filled += kYuy2PairBytes) {
            std::copy_n(last, kYuy2PairBytes, to + filled);
        }
        return;
    }
    const std::size_t pixel_bytes =
        padded_.fourcc_code == PictureFormat::kIyuv ? 1 : to_bytes / padded_.width;
    for (std::size_t filled = from_bytes; filled < to_bytes; ++filled) {
        to[filled] = to[filled - pixel_bytes];
    }
}

}  // namespace zolt
