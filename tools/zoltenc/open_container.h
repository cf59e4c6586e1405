#pragma once

#include <memory>

#include "io/FrameSource.h"
#include "io/PictureSink.h"
#include "zoltenc/Options.h"

namespace zolt {

// Whether this build writes containers.
bool has_containers();

// A sink of the container that the options name. As open_sink.
std::unique_ptr<PictureSink> open_container(const Options& options, FrameSource& source);

}  // namespace zolt
