#pragma once

#include <memory>

#include "io/FrameSource.h"
#include "zoltenc/Options.h"

namespace zolt {

// The pictures that the options name, fitted to the encoder as they say and read ahead: the
// built-in ones, or those of a file, a device, a URL or standard input, which is Y4M when it begins
// like that, raw when the options say how, and otherwise what FFmpeg's libraries take it for.
// Throws a ToolError when it is none of these.
std::unique_ptr<FrameSource> open_source(const Options& options);

}  // namespace zolt
