#include "avc/AvcLevel.h"

#include <algorithm>
#include <iterator>

namespace zolt {
namespace {

// Table A-1: macroblocks a second, of a frame, and of the decoded picture buffer; kbit/s of VCL NAL
// units.
struct Limits {
    AvcLevel level;
    std::uint32_t max_mbps;
    std::uint32_t max_fs;
    std::uint32_t max_dpb_mbs;
    std::uint32_t max_br;
};

constexpr Limits kLevels[] = {
    {{10, false}, 1485, 99, 396, 64},
    {{11, true}, 1485, 99, 396, 128},
    {{11, false}, 3000, 396, 900, 192},
    {{12, false}, 6000, 396, 2376, 384},
    {{13, false}, 11880, 396, 2376, 768},
    {{20, false}, 11880, 396, 2376, 2000},
    {{21, false}, 19800, 792, 4752, 4000},
    {{22, false}, 20250, 1620, 8100, 4000},
    {{30, false}, 40500, 1620, 8100, 10000},
    {{31, false}, 108000, 3600, 18000, 14000},
    {{32, false}, 216000, 5120, 20480, 20000},
    {{40, false}, 245760, 8192, 32768, 20000},
    {{41, false}, 245760, 8192, 32768, 50000},
    {{42, false}, 522240, 8704, 34816, 50000},
    {{50, false}, 589824, 22080, 110400, 135000},
    {{51, false}, 983040, 36864, 184320, 240000},
    {{52, false}, 2073600, 36864, 184320, 240000},
    {{60, false}, 4177920, 139264, 696320, 240000},
    {{61, false}, 8355840, 139264, 696320, 480000},
    {{62, false}, 16711680, 139264, 696320, 800000},
};

// Clause A.3.1, items on frame size, sides, macroblock rate, picture buffer and bit rate.
bool holds(const Limits& limits, const AvcLevel::Needs& needs) {
    const std::uint64_t frame = std::uint64_t{needs.width_in_mbs} * needs.height_in_mbs;
    const std::uint64_t side = std::max(needs.width_in_mbs, needs.height_in_mbs);
    return frame <= limits.max_fs && side * side <= std::uint64_t{8} * limits.max_fs &&
           static_cast<double>(frame) * needs.frames_per_second <= limits.max_mbps &&
           frame * needs.dec_frame_buffering <= limits.max_dpb_mbs &&
           needs.bit_rate_kbs <= limits.max_br;
}

}  // namespace

AvcLevel AvcLevel::lowest(const Needs& needs) {
    const auto* const found =
        std::find_if(std::begin(kLevels), std::end(kLevels),
                     [&needs](const Limits& limits) { return holds(limits, needs); });
    return found == std::end(kLevels) ? std::prev(found)->level : found->level;
}

}  // namespace zolt
