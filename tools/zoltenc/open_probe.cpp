#include "zoltenc/open_probe.h"

#include "zoltenc/LibavProbe.h"

namespace zolt {

bool has_probe() {
    return true;
}

std::unique_ptr<PictureProbe> open_probe(const Options& options, const PictureFormat& format,
                                         const VideoTraits& traits) {
    libav_prepare(options.verbose);
    return std::make_unique<LibavProbe>(format, traits, !options.report.empty());
}

}  // namespace zolt
