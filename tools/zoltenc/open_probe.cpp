#include "zoltenc/open_probe.h"

#ifdef ZOLT_LIBAV
#include "zoltenc/LibavProbe.h"
#endif

namespace zolt {

#ifdef ZOLT_LIBAV
bool has_probe() {
    return true;
}

std::unique_ptr<PictureProbe> open_probe(const PictureFormat& format, const VideoTraits& traits,
                                         bool keep_pictures) {
    return std::make_unique<LibavProbe>(format, traits, keep_pictures);
}
#else
bool has_probe() {
    return false;
}

std::unique_ptr<PictureProbe> open_probe(const PictureFormat&, const VideoTraits&, bool) {
    return nullptr;
}
#endif

}  // namespace zolt
