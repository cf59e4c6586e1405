#pragma once

#include <string>
#include <vector>

#include "libav/libav.h"

namespace zolt {

// The kinds of devices that give video. Throws ToolError when their library cannot be loaded.
std::vector<const AVInputFormat*> devices();

// The kind of this name, one of those that a kind has; null when there is none.
const AVInputFormat* find_device(const std::string& name);

}  // namespace zolt
