#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace zolt_bench {

// Planar 4:2:0 pictures of any size (even sides), held in memory. Every size shows the same moving
// 352x288 window, repeated side by side or cut off, so that what differs between sizes is the size
// alone. The window is the middle of a real clip where ZOLT_TEST_CLIPS names the folder of the test
// clips, else a generated texture.
class Film {
public:
    Film(int width, int height);

    // Picture n of an endless run through the window's pictures, forwards and backwards in turn.
    const std::uint8_t* picture(int n) const;
    std::size_t picture_size() const { return picture_size_; }

private:
    std::size_t picture_size_;
    std::vector<std::vector<std::uint8_t>> pictures_;
};

}  // namespace zolt_bench
