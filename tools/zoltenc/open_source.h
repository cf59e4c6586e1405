#pragma once

#include <memory>

#include "io/FrameSource.h"
#include "zoltenc/Options.h"

namespace zolt {

// The pictures that the options name: the built-in ones, or a file or standard input, which is Y4M
// when it begins like that and otherwise raw. Throws a ToolError when it is neither.
std::unique_ptr<FrameSource> open_source(const Options& options);

}  // namespace zolt
