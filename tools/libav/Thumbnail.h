#pragma once

#include <cstddef>
#include <vector>

#include "io/VideoTraits.h"
#include "libav/libav.h"

namespace zolt {

// A picture as a page shows it: full-range 4:2:0 (JFIF), no wider than it need be.
class Thumbnail {
public:
    static constexpr int kMaxWidth = 960;

    // Of a planar 4:2:0 picture whose samples stand for colours as said. Throws a ToolError when
    // the picture cannot be scaled.
    Thumbnail(const AVFrame& picture, const ColourDescription& colour);

    // A JPEG file, as good as it can be in `most_bytes`, but always of some quality.
    std::vector<unsigned char> jpeg(std::size_t most_bytes) const;

private:
    LibavPtr<AVFrame> scaled_;
};

}  // namespace zolt
