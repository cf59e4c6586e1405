#include "zoltenc/open_probe.h"

namespace zolt {

bool has_probe() {
    return false;
}

std::unique_ptr<PictureProbe> open_probe(const Options&, const PictureFormat&, const VideoTraits&) {
    return nullptr;
}

}  // namespace zolt
