#include "avc/SeqParSetRewriter.h"

#include <algorithm>

#include "avc/AvcLevel.h"
#include "avc/BitStreamWriter.h"
#include "avc/SequenceParameterSet.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

constexpr int kMaxBytes = 65536;
constexpr std::uint32_t kMacroblock = 16;
constexpr std::uint32_t kConstraintSet3 = 0x10;

std::uint32_t height_in_mbs(const SequenceParameterSet& set) {
    return (set.pic_height_in_map_units_minus1 + 1) * (set.frame_mbs_only_flag ? 1 : 2);
}

// Whether level 1b is told from level 1.1 by constraint_set3_flag; level_idc 9 stands for it
// elsewhere, clause A.3.4.
bool shares_level_1b(std::uint32_t profile_idc) {
    constexpr std::uint32_t kBaseline = 66, kMain = 77, kExtended = 88;
    return profile_idc == kBaseline || profile_idc == kMain || profile_idc == kExtended;
}

void set_level(SequenceParameterSet& set, const AvcLevel& level) {
    constexpr std::uint32_t kLevel1b = 9;
    set.level_idc = level.level_idc;
    if (shares_level_1b(set.profile_idc)) {
        set.constraint_set_flags =
            (set.constraint_set_flags & ~kConstraintSet3) | (level.is_1b ? kConstraintSet3 : 0);
    } else if (level.is_1b) {
        set.level_idc = kLevel1b;
    }
}

// Crops what is right of and below the part to be shown, clause 7.4.2.1.1. A picture that is shown
// as a whole keeps its cropping.
void set_cropping(SequenceParameterSet& set, int shown_width, int shown_height) {
    const bool half_width = set.chroma_array_type() == 1 || set.chroma_array_type() == 2;
    const bool half_height = set.chroma_array_type() == 1;
    const std::uint32_t unit_x = half_width ? 2 : 1;
    const std::uint32_t unit_y = (half_height ? 2 : 1) * (set.frame_mbs_only_flag ? 1 : 2);
    const auto cropped = [](std::uint32_t coded, int shown, std::uint32_t unit) {
        const auto kept = shown > 0 ? static_cast<std::uint32_t>(shown) : coded;
        return (coded - std::min(kept, coded)) / unit;
    };
    const std::uint32_t right =
        cropped((set.pic_width_in_mbs_minus1 + 1) * kMacroblock, shown_width, unit_x);
    const std::uint32_t bottom = cropped(height_in_mbs(set) * kMacroblock, shown_height, unit_y);
    if (right > 0 || bottom > 0) {
        set.frame_cropping_flag = true;
        set.frame_crop_left_offset = 0;
        set.frame_crop_right_offset = right;
        set.frame_crop_top_offset = 0;
        set.frame_crop_bottom_offset = bottom;
    }
}

double frames_per_second(const VuiParameters& vui) {
    return vui.num_units_in_tick == 0 ? 0.0
                                      : static_cast<double>(vui.time_scale) / 2.0 /
                                            static_cast<double>(vui.num_units_in_tick);
}

}  // namespace

std::vector<unsigned char> SeqParSetRewriter::rewrite(const unsigned char* nal, int size) const {
    SequenceParameterSet set = SequenceParameterSet::read(rbsp_bytes(nal, size, kMaxBytes));
    if (!set.is_complete) {
        return {};
    }
    VuiParameters vui = properties_.vui;
    vui.max_dec_frame_buffering = std::max(vui.max_dec_frame_buffering, set.max_num_ref_frames);
    set_level(set, AvcLevel::lowest({set.pic_width_in_mbs_minus1 + 1, height_in_mbs(set),
                                     vui.max_dec_frame_buffering, frames_per_second(vui),
                                     properties_.bit_rate_kbs}));
    set_cropping(set, properties_.shown_width, properties_.shown_height);
    BitStreamWriter bits;
    bits.u(8, nal[0]);
    set.write(bits, vui);
    return bits.trailing().escaped();
}

}  // namespace zolt
