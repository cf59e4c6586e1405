#include "zoltenc/PlayerHeadersSink.h"

#include "avc/SeqParSetRewriter.h"
#include "io/ToolError.h"

namespace zolt {
namespace {

SeqParSetRewriter::Properties properties_of(const StreamDescription& stream) {
    // Pictures of one QP take what they take; the library's highest target stands for that.
    constexpr int kUncontrolledKbs = 4000;
    SeqParSetRewriter::Properties properties;
    properties.shown_width = stream.traits.shown_width;
    properties.shown_height = stream.traits.shown_height;
    properties.bit_rate_kbs = stream.bit_rate_kbs > 0 ? stream.bit_rate_kbs : kUncontrolledKbs;

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

void PlayerHeadersSink::begin(const StreamDescription& stream) {
    StreamDescription told = stream;
    told.seq_par_set =
        SeqParSetRewriter(properties_of(stream))
            .rewrite(stream.seq_par_set.data(), static_cast<int>(stream.seq_par_set.size()));
    if (told.seq_par_set.empty()) {
        throw ToolError(name() +
                        ": the encoder's sequence parameter set cannot be read; "
                        "--plain-headers leaves it as it is");
    }
    SinkDecorator::begin(told);
}

}  // namespace zolt
