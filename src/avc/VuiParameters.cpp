#include "avc/VuiParameters.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <numeric>

#include "avc/BitStreamWriter.h"

namespace zolt {
namespace {

// Table E-1, aspect_ratio_idc 1 and on.
constexpr std::array<std::uint32_t, 2> kAspectRatios[] = {
    {1, 1},   {12, 11}, {10, 11}, {16, 11}, {40, 33},  {24, 11}, {20, 11}, {32, 11},
    {80, 33}, {18, 11}, {15, 11}, {64, 33}, {160, 99}, {4, 3},   {3, 2},   {2, 1},
};
constexpr std::uint32_t kExtendedSar = 255;

void write_aspect_ratio(BitStreamWriter& bits, std::uint32_t width, std::uint32_t height) {
    constexpr std::uint32_t kMaxSide = 65535;
    const std::uint32_t common = std::gcd(width, height);
    const bool is_known = width > 0 && height > 0 && std::max(width, height) / common <= kMaxSide;
    bits.u(1, is_known);  // aspect_ratio_info_present_flag
    if (!is_known) {
        return;
    }
    const std::array<std::uint32_t, 2> ratio = {width / common, height / common};
    const auto* const found = std::find(std::begin(kAspectRatios), std::end(kAspectRatios), ratio);
    if (found != std::end(kAspectRatios)) {
        bits.u(8, static_cast<std::uint64_t>(found - kAspectRatios) + 1);
    } else {
        bits.u(8, kExtendedSar).u(16, ratio[0]).u(16, ratio[1]);
    }
}

}  // namespace

void VuiParameters::write(BitStreamWriter& bits) const {
    constexpr unsigned kFormatUnspecified = 5;  // of video_format
    constexpr unsigned kNoLimit = 0;            // of bytes and bits
    constexpr unsigned kLog2MaxMvLength = 15;   // the longest that there is
    write_aspect_ratio(bits, sar_width, sar_height);
    bits.u(1, 0);  // overscan_info_present_flag

    const bool has_colours = colour_primaries != kUnspecified ||
                             transfer_characteristics != kUnspecified ||
                             matrix_coefficients != kUnspecified;
    const bool has_signal_type = has_colours || video_full_range_flag.has_value();
    bits.u(1, has_signal_type);
    if (has_signal_type) {
        bits.u(3, kFormatUnspecified).u(1, video_full_range_flag.value_or(false)).u(1, has_colours);
        if (has_colours) {
            bits.u(8, colour_primaries).u(8, transfer_characteristics);
            bits.u(8, matrix_coefficients);
        }
    }
    bits.u(1, 0);  // chroma_loc_info_present_flag

    const bool has_timing = num_units_in_tick > 0 && time_scale > 0;
    bits.u(1, has_timing);
    if (has_timing) {
        bits.u(32, num_units_in_tick).u(32, time_scale).u(1, fixed_frame_rate_flag);
    }
    bits.u(1, 0).u(1, 0);            // nal_, vcl_hrd_parameters_present_flag
    bits.u(1, 0);                    // pic_struct_present_flag
    bits.u(1, 1);                    // bitstream_restriction_flag
    bits.u(1, 1);                    // motion_vectors_over_pic_boundaries_flag
    bits.ue(kNoLimit).ue(kNoLimit);  // max_bytes_per_pic_denom, max_bits_per_mb_denom
    bits.ue(kLog2MaxMvLength).ue(kLog2MaxMvLength);  // horizontal, vertical
    bits.ue(max_num_reorder_frames).ue(max_dec_frame_buffering);
}

}  // namespace zolt
