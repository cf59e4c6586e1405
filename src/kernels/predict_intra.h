#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "kernels/clip.h"

namespace zolt {
namespace {

inline int sum(const std::uint8_t* p, std::ptrdiff_t step, int count) {
    int total = 0;
    for (int i = 0; i < count; ++i) {
        total += p[i * step];
    }
    return total;
}

// Plane prediction of an n x n block: a, b, c as in clauses 8.3.3.4 and 8.3.4.4.
inline void predict_plane(std::uint8_t* pred, int n, int a, int b, int c) {
    const int centre = n / 2 - 1;
    for (int y = 0; y < n; ++y) {
        for (int x = 0; x < n; ++x) {
            pred[n * y + x] = clip_sample((a + b * (x - centre) + c * (y - centre) + 16) >> 5);
        }
    }
}

// The weighted differences H or V of the plane parameters: `half` samples on either side of the
// middle of the neighbours that start at p, the one before p included.
inline int gradient(const std::uint8_t* p, std::ptrdiff_t step, int half) {
    int total = 0;
    for (int k = 1; k <= half; ++k) {
        total += k * (p[(half - 1 + k) * step] - p[(half - 1 - k) * step]);
    }
    return total;
}

inline void fill_4x4(std::uint8_t* pred, std::ptrdiff_t stride, int value) {
    for (int y = 0; y < 4; ++y) {
        std::memset(pred + y * stride, value, 4);
    }
}

constexpr int kIntraModes = 4;

// Intra 16x16 prediction of mode 0..3 (clause 8.3.3) from the samples around src; up, left: which
// of them the mean is of.
inline void predict_16x16(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride,
                          bool up, bool left, int mode) {
    const std::uint8_t* above = src - stride;
    switch (mode) {
        case 0:  // vertical, clause 8.3.3.1
            for (int y = 0; y < 16; ++y) {
                std::memcpy(pred + 16 * y, above, 16);
            }
            break;
        case 1:  // horizontal, clause 8.3.3.2
            for (int y = 0; y < 16; ++y) {
                std::memset(pred + 16 * y, src[y * stride - 1], 16);
            }
            break;
        case 2: {  // DC, clause 8.3.3.3
            const int above_sum = up ? sum(above, 1, 16) : 0;
            const int left_sum = left ? sum(src - 1, stride, 16) : 0;
            const int dc = up && left ? (above_sum + left_sum + 16) >> 5
                           : left     ? (left_sum + 8) >> 4
                           : up       ? (above_sum + 8) >> 4
                                      : 128;
            std::memset(pred, dc, 256);
            break;
        }
        default: {  // plane, clause 8.3.3.4
            const int b = (5 * gradient(above, 1, 8) + 32) >> 6;
            const int c = (5 * gradient(src - 1, stride, 8) + 32) >> 6;
            predict_plane(pred, 16, 16 * (above[15] + src[15 * stride - 1]), b, c);
            break;
        }
    }
}

// Chroma prediction of mode 0..3 (clause 8.3.4), likewise.
inline void predict_chroma(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride,
                           bool up, bool left, int mode) {
    const std::uint8_t* above = src - stride;
    switch (mode) {
        case 0: {  // DC, clauses 8.3.4.1 to 8.3.4.3
            const int s0 = up ? sum(above, 1, 4) : 0;
            const int s1 = up ? sum(above + 4, 1, 4) : 0;
            const int s2 = left ? sum(src - 1, stride, 4) : 0;
            const int s3 = left ? sum(src - 1 + 4 * stride, stride, 4) : 0;
            int dc[4] = {128, 128, 128, 128};  // blocks in raster order
            if (up && left) {
                dc[0] = (s0 + s2 + 4) >> 3;
                dc[1] = (s1 + 2) >> 2;
                dc[2] = (s3 + 2) >> 2;
                dc[3] = (s1 + s3 + 4) >> 3;
            } else if (up) {
                dc[0] = dc[2] = (s0 + 2) >> 2;
                dc[1] = dc[3] = (s1 + 2) >> 2;
            } else if (left) {
                dc[0] = dc[1] = (s2 + 2) >> 2;
                dc[2] = dc[3] = (s3 + 2) >> 2;
            }
            for (int b = 0; b < 4; ++b) {
                fill_4x4(pred + 32 * (b >> 1) + 4 * (b & 1), 8, dc[b]);
            }
            break;
        }
        case 1:  // horizontal
            for (int y = 0; y < 8; ++y) {
                std::memset(pred + 8 * y, src[y * stride - 1], 8);
            }
            break;
        case 2:  // vertical
            for (int y = 0; y < 8; ++y) {
                std::memcpy(pred + 8 * y, above, 8);
            }
            break;
        default: {  // plane, clause 8.3.4.4
            const int b = (17 * gradient(above, 1, 4) + 16) >> 5;
            const int c = (17 * gradient(src - 1, stride, 4) + 16) >> 5;
            predict_plane(pred, 8, 16 * (above[7] + src[7 * stride - 1]), b, c);
            break;
        }
    }
}

}  // namespace
}  // namespace zolt
