#pragma once

#include "io/PictureQuality.h"
#include "libav/libav.h"

namespace zolt {

// Compares decoded pictures with their sources.
class QualityMeter {
public:
    // Of two planar 4:2:0 pictures of 8-bit samples and one size, at least 16x16. SSIM is the mean
    // over windows of 8x8 luma samples in steps of 4, without weights.
    static PictureQuality compare(const AVFrame& source, const AVFrame& decoded);
};

}  // namespace zolt
