#pragma once

#include "libav/libav.h"

namespace zolt {

struct ScalerPicture {
    int width;
    int height;
    AVPixelFormat format;
};

// A scaler and format converter whose result depends on the pictures alone, not on the processor.
// YUV keeps its range and its matrix, which `matrix` names for conversions from or to RGB. Throws a
// ToolError for formats that cannot be converted.
LibavPtr<SwsContext> make_scaler(const ScalerPicture& from, const ScalerPicture& to,
                                 AVColorSpace matrix);

}  // namespace zolt
