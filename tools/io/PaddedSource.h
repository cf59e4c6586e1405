#pragma once

#include <vector>

#include "io/FilteredSource.h"
#include "io/PicturePacker.h"

namespace zolt {

// Pictures whose sides are not multiples of 16, extended to the right and to the bottom by their
// edge samples. The traits tell what is to be shown: the other source's size.
class PaddedSource : public FilteredSource {
public:
    // Throws a ToolError when the extended pictures are too large.
    explicit PaddedSource(std::unique_ptr<FrameSource> source);

    PictureFormat format() const override { return padded_; }
    VideoTraits traits() const override;
    bool read(std::vector<unsigned char>& sample) override;

private:
    PictureFormat original_;
    PictureFormat padded_;
    PicturePacker packer_;
    std::vector<unsigned char> picture_;  // as the other source gives it
};

}  // namespace zolt
