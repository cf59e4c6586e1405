#include "zoltenc/coded_traits.h"

namespace zolt {
namespace {

// Values of ITU-T H.264 Tables E-3 (primaries), E-4 (transfer) and E-5 (matrix).
constexpr int kBt709 = 1;
constexpr int kBt470Bg = 5;
constexpr int kSmpte170m = 6;
constexpr int kSrgbTransfer = 13;

bool is_yuv(int fourcc_code) {
    return fourcc_code == PictureFormat::kIyuv || fourcc_code == PictureFormat::kYuy2 ||
           fourcc_code == PictureFormat::kAyuv;
}

// Players pass over a description of which a part is missing, its matrix included (browsers do).
// What an input that states its matrix leaves open is therefore what goes with that matrix, or in
// full range, as of JPEG pictures, what screens have.
void complete(ColourDescription& colour) {
    constexpr int kUnspecified = ColourDescription::kUnspecified;
    const int matrix = colour.matrix_coefficients;
    if (matrix != kBt709 && matrix != kBt470Bg && matrix != kSmpte170m) {
        return;
    }
    const bool is_of_screens = colour.video_full_range.value_or(false);
    if (colour.colour_primaries == kUnspecified) {
        colour.colour_primaries = is_of_screens ? kBt709 : matrix;
    }
    if (colour.transfer_characteristics == kUnspecified) {
        const int usual = matrix == kBt709 ? kBt709 : kSmpte170m;
        colour.transfer_characteristics = is_of_screens ? kSrgbTransfer : usual;
    }
}

}  // namespace

VideoTraits coded_traits(const FrameSource& source) {
    VideoTraits traits = source.traits();
    if (is_yuv(source.format().fourcc_code)) {
        complete(traits.colour);
    } else {
        // Full range with the weights of BT.601, of the primaries and the transfer that screens
        // have.
        traits.colour = {kBt709, kSrgbTransfer, kSmpte170m, true};
    }
    return traits;
}

}  // namespace zolt
