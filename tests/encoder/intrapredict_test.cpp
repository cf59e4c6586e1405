// Intra prediction against the equations of clause 8.3, in the standard's coordinates.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <vector>

#include "common/Random.h"
#include "encoder/CEncoder.h"

namespace {

using zolt_test::Random;

constexpr std::ptrdiff_t kStride = 40;

// Samples around a block at (16, 16), of one of several kinds.
struct Picture {
    std::vector<std::uint8_t> samples = std::vector<std::uint8_t>(kStride * 40);

    explicit Picture(Random& random) {
        const int kind = random.between(0, 2);
        const int slope = random.between(-40, 40);
        for (std::size_t i = 0; i < samples.size(); ++i) {
            const int steep = 128 + slope * (static_cast<int>(i % kStride + i / kStride) - 32);
            const int values[] = {random.sample(), random.between(0, 1) * 255,
                                  std::clamp(steep, 0, 255)};
            samples[i] = static_cast<std::uint8_t>(values[kind]);
        }
    }
    const std::uint8_t* block() const { return &samples[16 * kStride + 16]; }
    // p[x, y] of the standard.
    int operator()(int x, int y) const { return block()[y * kStride + x]; }
};

struct Available {
    bool up, left, up_right, up_left;
};

// Intra_4x4 sample at (x, y), clauses 8.3.1.2.1 to 8.3.1.2.9. What is not available is 128, and
// p[4..7, -1] is p[3, -1].
int reference4(const Picture& picture, const Available& a, int mode, int x, int y) {
    const auto p = [&](int px, int py) {
        if (px < 0) {
            return py < 0 ? (a.up_left ? picture(-1, -1) : 128) : a.left ? picture(-1, py) : 128;
        }
        if (px > 3 && !a.up_right) {
            px = 3;
        }
        return px > 3 || a.up ? picture(px, -1) : 128;
    };
    const auto three = [](int i, int j, int k) { return (i + 2 * j + k + 2) >> 2; };
    const auto two = [](int i, int j) { return (i + j + 1) >> 1; };
    const int corner = three(p(-1, 0), p(-1, -1), p(0, -1));
    switch (mode) {
        case 0:
            return p(x, -1);
        case 1:
            return p(-1, y);
        case 2: {
            int sum = 0;
            for (int i = 0; i < 4; ++i) {
                sum += (a.up ? p(i, -1) : 0) + (a.left ? p(-1, i) : 0);
            }
            return a.up && a.left ? (sum + 4) >> 3 : a.up || a.left ? (sum + 2) >> 2 : 128;
        }
        case 3:
            return x == 3 && y == 3 ? three(p(6, -1), p(7, -1), p(7, -1))
                                    : three(p(x + y, -1), p(x + y + 1, -1), p(x + y + 2, -1));
        case 4:
            return x > y   ? three(p(x - y - 2, -1), p(x - y - 1, -1), p(x - y, -1))
                   : x < y ? three(p(-1, y - x - 2), p(-1, y - x - 1), p(-1, y - x))
                           : corner;
        case 5: {
            const int z = 2 * x - y, i = x - (y >> 1);
            return z == -1  ? corner
                   : z < -1 ? three(p(-1, y - 1), p(-1, y - 2), p(-1, y - 3))
                   : z % 2  ? three(p(i - 2, -1), p(i - 1, -1), p(i, -1))
                            : two(p(i - 1, -1), p(i, -1));
        }
        case 6: {
            const int z = 2 * y - x, i = y - (x >> 1);
            return z == -1  ? corner
                   : z < -1 ? three(p(x - 1, -1), p(x - 2, -1), p(x - 3, -1))
                   : z % 2  ? three(p(-1, i - 2), p(-1, i - 1), p(-1, i))
                            : two(p(-1, i - 1), p(-1, i));
        }
        case 7: {
            const int i = x + (y >> 1);
            return y % 2 ? three(p(i, -1), p(i + 1, -1), p(i + 2, -1))
                         : two(p(i, -1), p(i + 1, -1));
        }
        default: {
            const int z = x + 2 * y, i = y + (x >> 1);
            return z > 5    ? p(-1, 3)
                   : z == 5 ? three(p(-1, 2), p(-1, 3), p(-1, 3))
                   : z % 2  ? three(p(-1, i), p(-1, i + 1), p(-1, i + 2))
                            : two(p(-1, i), p(-1, i + 1));
        }
    }
}

// Plane prediction of an n x n block, clauses 8.3.3.4 and 8.3.4.4.
int plane(const Picture& p, int n, int x, int y) {
    const int half = n / 2;
    int h = 0, v = 0;
    for (int i = 0; i < half; ++i) {
        h += (i + 1) * (p(half + i, -1) - p(half - 2 - i, -1));
        v += (i + 1) * (p(-1, half + i) - p(-1, half - 2 - i));
    }
    const int b = n == 16 ? (5 * h + 32) >> 6 : (34 * h + 32) >> 6;
    const int c = n == 16 ? (5 * v + 32) >> 6 : (34 * v + 32) >> 6;
    const int a = 16 * (p(-1, n - 1) + p(n - 1, -1));
    return std::clamp((a + b * (x - half + 1) + c * (y - half + 1) + 16) >> 5, 0, 255);
}

// Mean of the n samples above from x0 on and to the left from y0 on, as far as they are used.
int mean(const Picture& p, int n, int x0, int y0, bool up, bool left) {
    int sum = 0;
    for (int i = 0; i < n; ++i) {
        sum += (up ? p(x0 + i, -1) : 0) + (left ? p(-1, y0 + i) : 0);
    }
    const int count = n * (up + left);
    return count == 0 ? 128 : (sum + count / 2) / count;
}

int reference16(const Picture& p, bool up, bool left, int mode, int x, int y) {
    return mode == 0   ? p(x, -1)
           : mode == 1 ? p(-1, y)
           : mode == 2 ? mean(p, 16, 0, 0, up, left)
                       : plane(p, 16, x, y);
}

// Chroma DC: the block at the top right prefers the samples above, that at the lower left those to
// its left (clause 8.3.4).
int reference_c(const Picture& p, bool up, bool left, int mode, int x, int y) {
    const int x0 = x / 4 * 4, y0 = y / 4 * 4;
    const bool only_up = up && x0 > 0 && y0 == 0;
    const bool only_left = left && x0 == 0 && y0 > 0;
    return mode == 0   ? mean(p, 4, x0, y0, up && !only_left, left && !only_up)
           : mode == 1 ? p(-1, y)
           : mode == 2 ? p(x, -1)
                       : plane(p, 8, x, y);
}

TEST(IntraPrediction, Luma4x4) {
    Random random(1);
    for (int iteration = 0; iteration < 4000; ++iteration) {
        const Picture picture(random);
        Available a = {random.between(0, 3) > 0, random.between(0, 3) > 0, false, false};
        a.up_right = a.up && random.between(0, 1);
        a.up_left = a.up && a.left;
        const int mode = random.between(0, 8);
        std::uint8_t neighbours[13], pred[16];
        MacroblockCoder::gather_neighbours4(neighbours, picture.block(), kStride, a.up, a.left,
                                            a.up_right, a.up_left);
        MacroblockCoder::ipred4(pred, neighbours, a.up, a.left, mode);
        for (int i = 0; i < 16; ++i) {
            ASSERT_EQ(pred[i], reference4(picture, a, mode, i % 4, i / 4))
                << "mode " << mode << " at (" << i % 4 << ", " << i / 4 << ")";
        }
    }
}

TEST(IntraPrediction, Luma16x16AndChroma) {
    Random random(2);
    for (int iteration = 0; iteration < 3000; ++iteration) {
        const Picture picture(random);
        const bool up = random.between(0, 3) > 0, left = random.between(0, 3) > 0;
        const int mode = random.between(0, 3);
        std::uint8_t pred[256];
        if (mode == 2 || (up && left)) {
            MacroblockCoder::ipred16(pred, picture.block(), kStride, up, left, mode);
            for (int i = 0; i < 256; ++i) {
                ASSERT_EQ(pred[i], reference16(picture, up, left, mode, i % 16, i / 16))
                    << "mode " << mode << " at (" << i % 16 << ", " << i / 16 << ")";
            }
        }
        if (mode == 0 || (up && left)) {
            MacroblockCoder::ipred_c(pred, picture.block(), kStride, up, left, mode);
            for (int i = 0; i < 64; ++i) {
                ASSERT_EQ(pred[i], reference_c(picture, up, left, mode, i % 8, i / 8))
                    << "chroma mode " << mode << " at (" << i % 8 << ", " << i / 8 << ")";
            }
        }
    }
}

// Mode numbers that do not exist, and 16x16 modes without their neighbours.
TEST(IntraPredictionDeath, ModesThatAreNotPossible) {
    Random random(3);
    const Picture picture(random);
    const std::uint8_t neighbours[13] = {};
    std::uint8_t pred[256];
    const auto exits = testing::ExitedWithCode(104);
    EXPECT_EXIT(MacroblockCoder::ipred4(pred, neighbours, 1, 1, 9), exits,
                "^Illegal intra prediction mode\n$");
    for (const auto& [up, left, mode] :
         {std::array{1, 1, 4}, std::array{0, 1, 0}, std::array{1, 0, 1}, std::array{1, 0, 3}}) {
        EXPECT_EXIT(MacroblockCoder::ipred16(pred, picture.block(), kStride, up, left, mode), exits,
                    "^Unsupported prediction in Luma 16x16 Intra Prediction Routine\n$");
    }
    EXPECT_EXIT(MacroblockCoder::ipred_c(pred, picture.block(), kStride, 1, 1, 4), exits,
                "^Unsupported Intra Prediction Mode\n$");
}

}  // namespace
