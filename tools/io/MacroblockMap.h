#pragma once

#include <cstdint>
#include <vector>

namespace zolt {

// What a picture's macroblocks are, as a decoder found them; macroblocks in raster order.
struct MacroblockMap {
    enum class Type : std::uint8_t {
        skipped,
        inter_16x16,
        inter_parts,  // 16x8, 8x16 or 8x8
        intra_16x16,
        intra_4x4,
        pcm,
    };
    static constexpr int kTypes = 6;

    // From the centre of a block, in luma samples, to that of its prediction, in quarter samples.
    struct Motion {
        int x, y;
        int dx, dy;
    };

    int columns = 0;
    int rows = 0;
    std::vector<Type> types;  // empty where the decoder did not tell
    std::vector<int> qp;      // QPY; empty likewise
    std::vector<Motion> motion;
};

}  // namespace zolt
