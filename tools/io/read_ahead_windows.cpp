#include "io/read_ahead.h"

namespace zolt {

// MinGW's C++ library has no threads with the system's own thread model.
std::unique_ptr<FrameSource> read_ahead(std::unique_ptr<FrameSource> source, int) {
    return source;
}

}  // namespace zolt
