#pragma once

#include <cstdint>

namespace zolt {
namespace {

// What the samples of the nine intra 4x4 predictions are (clause 8.3.1.2), as indices: every one is
// a neighbour, two in a row averaged, three in a row filtered, or the mean.
//
// The neighbours in a row, L, K, J, I, M, A..H, are 0..12. The average of neighbours i and i + 1 is
// kTwo + i; the filtered one around neighbour i, the outermost repeated, is kThree + i.
constexpr int kTwo = 16;
constexpr int kThree = 32;
constexpr int kMean = 48;

constexpr int kIntra4Modes = 9;

constexpr int predicted_sample(int mode, int x, int y) {
    const int across = x - (y >> 1);
    const int down = y - (x >> 1);
    switch (mode) {
        case 0:  // vertical
            return 5 + x;
        case 1:  // horizontal
            return 3 - y;
        case 2:  // DC
            return kMean;
        case 3:  // diagonal down-left
            return kThree + 6 + x + y;
        case 4:  // diagonal down-right
            return kThree + 4 + x - y;
        case 5:  // vertical-right
            return across < 0 ? kThree + 5 - y : (y % 2 == 0 ? kTwo : kThree) + 4 + across;
        case 6:  // horizontal-down
            return down < 0 ? kThree + 3 + x : x % 2 == 0 ? kTwo + 3 - down : kThree + 4 - down;
        case 7:  // vertical-left
            return y % 2 == 0 ? kTwo + 5 + x + (y >> 1) : kThree + 6 + x + (y >> 1);
        default:  // horizontal-up
            return x + 2 * y > 5 ? 0 : (x % 2 == 0 ? kTwo : kThree) + 2 - y - (x >> 1);
    }
}

}  // namespace
}  // namespace zolt
