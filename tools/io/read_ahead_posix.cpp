#include "io/ReadAheadSource.h"
#include "io/read_ahead.h"

namespace zolt {

std::unique_ptr<FrameSource> read_ahead(std::unique_ptr<FrameSource> source, int pictures) {
    return std::make_unique<ReadAheadSource>(std::move(source), pictures);
}

}  // namespace zolt
