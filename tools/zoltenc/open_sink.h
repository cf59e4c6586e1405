#pragma once

#include <memory>

#include "io/PictureSink.h"
#include "zoltenc/Options.h"

namespace zolt {

// Where the options say that the coded pictures go. Throws a ToolError when it cannot be written.
std::unique_ptr<PictureSink> open_sink(const Options& options);

}  // namespace zolt
