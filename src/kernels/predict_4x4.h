#pragma once

#include <cstdint>
#include <cstring>

namespace zolt {
namespace {

// (a + 2b + c + 2) >> 2 around the neighbour at p.
inline std::uint8_t filter3(const std::uint8_t* p) {
    return static_cast<std::uint8_t>((p[-1] + 2 * p[0] + p[1] + 2) >> 2);
}

// (a + b + 1) >> 1 of the neighbour at p and the one after it.
inline std::uint8_t filter2(const std::uint8_t* p) {
    return static_cast<std::uint8_t>((p[0] + p[1] + 1) >> 1);
}

// Intra 4x4 prediction of mode 0..8 (clause 8.3.1.2) from the 13 neighbours of a block: L, K, J, I,
// M, A..H. dc: the value of the DC mode. The rows of every directional mode are windows of one
// sequence of filtered neighbours.
inline void predict_4x4(std::uint8_t* pred, const std::uint8_t* neighbours, int dc, int mode) {
    const std::uint8_t* corner = neighbours + 4;  // M
    const std::uint8_t* above = neighbours + 5;   // A..H; I..L stand before the corner, last first
    const auto set_row = [pred](int y, const std::uint8_t* samples) {
        std::memcpy(pred + 4 * y, samples, 4);
    };
    std::uint8_t sequence[12];
    switch (mode) {
        case 0:  // vertical, clause 8.3.1.2.1
            for (int y = 0; y < 4; ++y) {
                set_row(y, above);
            }
            break;
        case 1:  // horizontal, clause 8.3.1.2.2
            for (int y = 0; y < 4; ++y) {
                std::memset(pred + 4 * y, neighbours[3 - y], 4);
            }
            break;
        case 2:  // DC, clause 8.3.1.2.3
            std::memset(pred, dc, 16);
            break;
        case 3:  // diagonal down-left, clause 8.3.1.2.4
            for (int i = 0; i < 6; ++i) {
                sequence[i] = filter3(above + i + 1);
            }
            sequence[6] = static_cast<std::uint8_t>((above[6] + 3 * above[7] + 2) >> 2);
            for (int y = 0; y < 4; ++y) {
                set_row(y, sequence + y);
            }
            break;
        case 4:  // diagonal down-right, clause 8.3.1.2.5
            for (int i = 0; i < 7; ++i) {
                sequence[i] = filter3(neighbours + 1 + i);
            }
            for (int y = 0; y < 4; ++y) {
                set_row(y, sequence + 3 - y);
            }
            break;
        case 5:  // vertical-right, clause 8.3.1.2.6: even rows, then odd rows
            sequence[0] = filter3(corner - 1);
            sequence[6] = filter3(corner - 2);
            for (int x = 0; x < 4; ++x) {
                sequence[1 + x] = filter2(corner + x);
                sequence[7 + x] = filter3(corner + x);
            }
            set_row(0, sequence + 1);
            set_row(1, sequence + 7);
            set_row(2, sequence);
            set_row(3, sequence + 6);
            break;
        case 6:  // horizontal-down, clause 8.3.1.2.7
            for (int i = 0; i < 4; ++i) {
                sequence[2 * i] = filter2(neighbours + i);
                sequence[2 * i + 1] = filter3(neighbours + i + 1);
            }
            sequence[8] = filter3(corner + 1);
            sequence[9] = filter3(corner + 2);
            for (int y = 0; y < 4; ++y) {
                set_row(y, sequence + 6 - 2 * y);
            }
            break;
        case 7:  // vertical-left, clause 8.3.1.2.8: even rows, then odd rows
            for (int x = 0; x < 5; ++x) {
                sequence[x] = filter2(above + x);
                sequence[6 + x] = filter3(above + x + 1);
            }
            set_row(0, sequence);
            set_row(1, sequence + 6);
            set_row(2, sequence + 1);
            set_row(3, sequence + 7);
            break;
        default:  // horizontal-up, clause 8.3.1.2.9
            for (int i = 0; i < 3; ++i) {
                sequence[2 * i] = filter2(neighbours + 2 - i);
                sequence[2 * i + 1] =
                    i < 2 ? filter3(neighbours + 2 - i)
                          : static_cast<std::uint8_t>((neighbours[1] + 3 * neighbours[0] + 2) >> 2);
            }
            std::memset(sequence + 6, neighbours[0], 4);
            for (int y = 0; y < 4; ++y) {
                set_row(y, sequence + 2 * y);
            }
            break;
    }
}

}  // namespace
}  // namespace zolt
