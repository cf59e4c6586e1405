#pragma once

#include <memory>

#include "io/FrameSource.h"
#include "io/PictureSink.h"
#include "zoltenc/Options.h"

namespace zolt {

// Whether the output is a container, which says what players have to know of the pictures.
bool writes_container(const Options& options);

// Where the options say that the coded pictures go. `source`, whose audio and subtitles a container
// takes over, outlives the sink. Throws a ToolError when the output cannot be written.
std::unique_ptr<PictureSink> open_sink(const Options& options, FrameSource& source);

}  // namespace zolt
