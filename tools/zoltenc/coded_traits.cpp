#include "zoltenc/coded_traits.h"

#include "session/player_headers.h"

namespace zolt {

VideoTraits coded_traits(const FrameSource& source) {
    VideoTraits traits = source.traits();
    traits.colour = coded_colour(source.format().fourcc_code, traits.colour);
    return traits;
}

}  // namespace zolt
