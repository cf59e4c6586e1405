#pragma once

#include <vector>

#include "io/FilteredSource.h"
#include "libav/libav.h"

namespace zolt {

// Pictures scaled so that their sides are the nearest multiples of 16. The sample aspect ratio
// changes with them: what is shown keeps its shape.
class ScaledSource : public FilteredSource {
public:
    // Throws a ToolError for a format that cannot be scaled.
    explicit ScaledSource(std::unique_ptr<FrameSource> source);

    PictureFormat format() const override { return result_; }
    VideoTraits traits() const override;
    bool read(std::vector<unsigned char>& sample) override;

private:
    PictureFormat original_;
    PictureFormat result_;
    std::vector<unsigned char> picture_;  // as the other source gives it
    LibavPtr<SwsContext> scaler_;
    LibavPtr<AVFrame> frame_;  // the same for libswscale
    LibavPtr<AVFrame> scaled_;
};

}  // namespace zolt
