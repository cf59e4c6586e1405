#pragma once

#include <memory>

#include "zoltenc/Options.h"
#include "zoltenc/PictureSink.h"

namespace zolt {

// Whether the output is a container, which says what players have to know of the pictures.
bool writes_container(const Options& options);

// Where the options say that the coded pictures go. Throws a ToolError when it cannot be written.
std::unique_ptr<PictureSink> open_sink(const Options& options);

}  // namespace zolt
