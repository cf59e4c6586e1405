#pragma once

#include <memory>

#include "io/PictureFormat.h"
#include "io/VideoTraits.h"
#include "zoltenc/Options.h"
#include "zoltenc/PictureProbe.h"

namespace zolt {

// Whether this program was built with a decoder.
bool has_probe();

// A probe for pictures of this format, with these traits once they are coded. Null without a
// decoder.
std::unique_ptr<PictureProbe> open_probe(const Options& options, const PictureFormat& format,
                                         const VideoTraits& traits);

}  // namespace zolt
