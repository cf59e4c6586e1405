#pragma once

#include <optional>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "io/VideoTraits.h"

namespace zolt {

// The pictures that an element is going to be given.
struct InputDescription {
    PictureFormat picture;
    // The rate, or the highest one where it varies; nothing where neither is known.
    std::optional<FrameRate> frame_rate;
    // Colours as they stand in the coded stream, and the shape of a sample; what is shown of the
    // coded pictures is not in here.
    VideoTraits traits;
};

}  // namespace zolt
