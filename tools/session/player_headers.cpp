#include "session/player_headers.h"

#include "avc/SeqParSetRewriter.h"
#include "io/PictureFormat.h"
#include "session/EncoderSession.h"

namespace zolt {
namespace {

// Values of ITU-T H.264 Tables E-3 (primaries), E-4 (transfer) and E-5 (matrix).
constexpr int kBt709 = 1;
constexpr int kBt470Bg = 5;
constexpr int kSmpte170m = 6;
constexpr int kSrgbTransfer = 13;

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

SeqParSetRewriter::Properties properties_of(const StreamDescription& stream) {
    SeqParSetRewriter::Properties properties;
    properties.shown_width = stream.traits.shown_width;
    properties.shown_height = stream.traits.shown_height;
    // Pictures of one QP take what they take; the library's highest target stands for that.
    properties.bit_rate_kbs =
        stream.bit_rate_kbs > 0 ? stream.bit_rate_kbs : EncoderSession::kMaxBitRateKbs;

    const ColourDescription& colour = stream.traits.colour;
    VuiParameters& vui = properties.vui;
    vui.sar_width = static_cast<std::uint32_t>(stream.traits.sar_width);
    vui.sar_height = static_cast<std::uint32_t>(stream.traits.sar_height);
    vui.video_full_range_flag = colour.video_full_range;
    vui.colour_primaries = static_cast<std::uint32_t>(colour.colour_primaries);
    vui.transfer_characteristics = static_cast<std::uint32_t>(colour.transfer_characteristics);
    vui.matrix_coefficients = static_cast<std::uint32_t>(colour.matrix_coefficients);
    vui.num_units_in_tick = static_cast<std::uint32_t>(stream.frame_rate.denominator);
    vui.time_scale = static_cast<std::uint32_t>(2 * stream.frame_rate.numerator);
    vui.fixed_frame_rate_flag = stream.is_constant_rate;
    return properties;
}

}  // namespace

ColourDescription coded_colour(int fourcc_code, const ColourDescription& known) {
    if (!PictureFormat::is_yuv(fourcc_code)) {
        // Full range with the weights of BT.601, of the primaries and the transfer that screens
        // have.
        return {kBt709, kSrgbTransfer, kSmpte170m, true};
    }
    ColourDescription colour = known;
    complete(colour);
    return colour;
}

std::vector<unsigned char> player_seq_par_set(const StreamDescription& stream) {
    return SeqParSetRewriter(properties_of(stream))
        .rewrite(stream.seq_par_set.data(), static_cast<int>(stream.seq_par_set.size()));
}

}  // namespace zolt
