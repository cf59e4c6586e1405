#include "io/PicturePacker.h"

#include <algorithm>

namespace zolt {
namespace {

constexpr std::size_t kYuy2PairBytes = 4;

}  // namespace

bool PicturePacker::is_packed(const std::vector<Rows>& planes) const {
    const unsigned char* expected = planes.front().first;
    for (std::size_t n = 0; n < planes_.size(); ++n) {
        const Rows& plane = planes[n];
        if (plane.first != expected || plane.count != planes_[n].rows ||
            plane.bytes != planes_[n].row_bytes ||
            plane.stride != static_cast<std::ptrdiff_t>(plane.bytes)) {
            return false;
        }
        expected += plane.count * plane.bytes;
    }
    return true;
}

void PicturePacker::pack(const std::vector<Rows>& planes, unsigned char* sample) const {
    for (std::size_t n = 0; n < planes_.size(); ++n) {
        const PictureFormat::Plane& to = planes_[n];
        const unsigned char* row = planes[n].first;
        for (std::size_t y = 0; y < to.rows; ++y, sample += to.row_bytes) {
            if (y < planes[n].count) {
                pack_row(row, planes[n].bytes, sample, to.row_bytes);
                row += planes[n].stride;
            } else {
                std::copy_n(sample - to.row_bytes, to.row_bytes, sample);
            }
        }
    }
}

// Copies a row and repeats its last pixel.
void PicturePacker::pack_row(const unsigned char* from, std::size_t from_bytes, unsigned char* to,
                             std::size_t to_bytes) const {
    const std::size_t copied = std::min(from_bytes, to_bytes);
    std::copy_n(from, copied, to);
    if (copied == to_bytes) {
        return;
    }
    if (sample_.fourcc_code == PictureFormat::kYuy2) {
        extend_pairs(to, copied, to_bytes);
        return;
    }
    const std::size_t pixel_bytes =
        sample_.fourcc_code == PictureFormat::kIyuv ? 1 : to_bytes / sample_.width;
    for (std::size_t filled = copied; filled < to_bytes; ++filled) {
        to[filled] = to[filled - pixel_bytes];
    }
}

// The same with Y0 U Y1 V: of the last pair of a row of odd width, media samples have Y0 and U, and
// files have a Y1, too, that is no pixel.
void PicturePacker::extend_pairs(unsigned char* row, std::size_t filled, std::size_t bytes) const {
    if (filled % kYuy2PairBytes != 0) {
        row[filled] = row[filled - 2];
        row[filled + 1] = row[filled - 3];
        filled += 2;
    } else if (picture_.width % 2 != 0) {
        row[filled - 2] = row[filled - 4];
    }
    const unsigned char last[kYuy2PairBytes] = {row[filled - 2], row[filled - 3], row[filled - 2],
                                                row[filled - 1]};
    for (; filled < bytes; filled += kYuy2PairBytes) {
        std::copy_n(last, kYuy2PairBytes, row + filled);
    }
}

}  // namespace zolt
