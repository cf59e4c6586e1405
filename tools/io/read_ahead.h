#pragma once

#include <memory>

#include "io/FrameSource.h"

namespace zolt {

// The source read ahead by at most `pictures` (from 1), or as it is where the tools have no
// threads.
std::unique_ptr<FrameSource> read_ahead(std::unique_ptr<FrameSource> source, int pictures);

}  // namespace zolt
