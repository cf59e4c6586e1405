#include "zoltenc/coded_traits.h"

namespace zolt {
namespace {

bool is_yuv(int fourcc_code) {
    return fourcc_code == PictureFormat::kIyuv || fourcc_code == PictureFormat::kYuy2 ||
           fourcc_code == PictureFormat::kAyuv;
}

}  // namespace

VideoTraits coded_traits(const FrameSource& source) {
    // Full range with the weights of BT.601, of the primaries and the transfer that screens have.
    constexpr int kBt709Primaries = 1, kSrgbTransfer = 13, kBt601Matrix = 6;
    VideoTraits traits = source.traits();
    if (!is_yuv(source.format().fourcc_code)) {
        traits.colour = {kBt709Primaries, kSrgbTransfer, kBt601Matrix, true};
    }
    return traits;
}

}  // namespace zolt
