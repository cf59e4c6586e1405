#pragma once

#include <memory>

#include "io/PictureFormat.h"
#include "io/VideoTraits.h"
#include "zoltenc/PictureProbe.h"

namespace zolt {

// Whether this program was built with a decoder.
bool has_probe();

// A probe for pictures of this format; `keep_pictures`: for a report. Null without a decoder.
std::unique_ptr<PictureProbe> open_probe(const PictureFormat& format, const VideoTraits& traits,
                                         bool keep_pictures);

}  // namespace zolt
