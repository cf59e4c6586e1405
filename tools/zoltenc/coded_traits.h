#pragma once

#include "io/FrameSource.h"

namespace zolt {

// What players have to know of the source's pictures once the encoder has them: where it converts
// from RGB, the colours are what its conversion makes of them, and elsewhere what the source
// declares, completed where that says too little for players.
VideoTraits coded_traits(const FrameSource& source);

}  // namespace zolt
