#pragma once

#include <cstddef>
#include <vector>

#include "io/PictureFormat.h"

namespace zolt {

// Brings pictures from wherever their rows are to a media sample's layout, extended to the right
// and to the bottom by their edge samples where the sample is larger.
class PicturePacker {
public:
    // A plane or a packed picture; rows and their bytes may be those of a media sample or of a
    // file, PictureFormat::Plane.
    struct Rows {
        const unsigned char* first;
        std::ptrdiff_t stride;  // bytes from one row to the next
        std::size_t count;
        std::size_t bytes;  // of a row, without what lies between rows
    };

    // Both of one format; `sample` is as large as `picture` or larger.
    PicturePacker(const PictureFormat& picture, const PictureFormat& sample)
        : picture_(picture), sample_(sample), planes_(sample.planes()) {}

    // Whether the planes stand in memory as in the sample: nothing is to be done then.
    bool is_packed(const std::vector<Rows>& planes) const;

    // Writes the sample.
    void pack(const std::vector<Rows>& planes, unsigned char* sample) const;

private:
    void pack_row(const unsigned char* from, std::size_t from_bytes, unsigned char* to,
                  std::size_t to_bytes) const;
    void extend_pairs(unsigned char* row, std::size_t filled, std::size_t bytes) const;

    PictureFormat picture_;
    PictureFormat sample_;
    std::vector<PictureFormat::Plane> planes_;  // of the sample
};

}  // namespace zolt
