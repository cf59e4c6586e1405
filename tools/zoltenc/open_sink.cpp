#include "zoltenc/open_sink.h"

#include "zoltenc/AnnexBSink.h"

namespace zolt {

std::unique_ptr<PictureSink> open_sink(const Options& options) {
    return std::make_unique<AnnexBSink>(options.output);
}

}  // namespace zolt
