// What no decoder checks: forward transform, quantiser, coefficient costs.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "common/Random.h"
#include "encoder/MacroblockCoder.h"
#include "encoder/tables.h"

namespace {

using zolt::Kernels;
using zolt_test::Random;

using Matrix = int[4][4];

// left * middle * transposed left.
void transform(const Matrix& left, const Matrix& middle, Matrix& result) {
    for (int i = 0; i < 4; ++i) {
        for (int j = 0; j < 4; ++j) {
            result[i][j] = 0;
            for (int k = 0; k < 16; ++k) {
                result[i][j] += left[i][k / 4] * middle[k / 4][k % 4] * left[j][k % 4];
            }
        }
    }
}

constexpr Matrix kCore = {{1, 1, 1, 1}, {2, 1, -1, -2}, {1, -1, -1, 1}, {1, -2, 2, -1}};
// Twice the transposed inverse core transform of clause 8.5.12.2, whose halves these are.
constexpr Matrix kInverse = {{2, 2, 2, 1}, {2, 1, -2, -2}, {2, -1, -2, 2}, {2, -2, 2, -1}};

TEST(Transform, InverseEqualsMatrixProducts) {
    Random random(1);
    for (int iteration = 0; iteration < 500; ++iteration) {
        alignas(32) std::uint8_t pred[16], dst[16];
        alignas(32) std::int16_t coefs[16];
        // With multiples of 4 no half is ever rounded.
        Matrix scaled, product;
        for (int i = 0; i < 16; ++i) {
            pred[i] = random.sample();
            scaled[i / 4][i % 4] = 4 * random.between(-600, 600);
            coefs[4 * (i % 4) + i / 4] = static_cast<std::int16_t>(scaled[i / 4][i % 4]);
        }
        zolt::scalar_kernels().reconstruct_4x4(coefs, pred, dst, 4);
        transform(kInverse, scaled, product);
        for (int i = 0; i < 16; ++i) {
            ASSERT_EQ(dst[i],
                      std::clamp(pred[i] + ((product[i / 4][i % 4] / 4 + 32) >> 6), 0, 255));
        }
    }
}

// Forward factors and normAdjust4x4 by QP % 6: rows and columns even, odd, mixed.
constexpr int kForward[6][3] = {{13107, 5243, 8066}, {11916, 4660, 7490}, {10082, 4194, 6554},
                                {9362, 3647, 5825},  {8192, 3355, 5243},  {7282, 2893, 4559}};
constexpr int kNorm[6][3] = {{10, 16, 13}, {11, 18, 14}, {13, 20, 16},
                             {14, 23, 18}, {16, 25, 20}, {18, 29, 23}};

TEST(Residual, LevelsAndScaledLevels) {
    // Rows and columns of the zig-zag scan.
    constexpr int kScan[16][2] = {{0, 0}, {0, 1}, {1, 0}, {2, 0}, {1, 1}, {0, 2}, {0, 3}, {1, 2},
                                  {2, 1}, {3, 0}, {3, 1}, {2, 2}, {1, 3}, {2, 3}, {3, 2}, {3, 3}};
    Random random(2);
    for (int iteration = 0; iteration < 52 * 80; ++iteration) {
        const int qp = iteration % 52, bits = 15 + qp / 6;
        const bool intra = iteration / 52 % 2;
        const std::int64_t rounding = (std::int64_t{1} << bits) / (intra ? 3 : 6);
        const int range = 255 >> random.between(0, 7);
        alignas(32) std::uint8_t src[16], pred[16];
        Matrix residual, c;
        for (int i = 0; i < 16; ++i) {
            src[i] = iteration % 3 ? random.sample() : i % 2 * 255;
            pred[i] = iteration % 3 ? static_cast<std::uint8_t>(std::clamp(
                                          src[i] + random.between(-range, range), 0, 255))
                                    : 255 - src[i];
            residual[i / 4][i % 4] = src[i] - pred[i];
        }
        transform(kCore, residual, c);

        alignas(32) std::int16_t coefs[16] = {}, scan[16] = {};
        std::uint16_t nonzero = 0;
        const auto coded = zolt::scalar_kernels().code_residual_4x4(
            src, 4, pred, intra ? zolt::intra_quantizer(qp) : zolt::inter_quantizer(qp), coefs,
            scan, &nonzero);
        for (int n = 0; n < 16; ++n) {
            const auto [row, column] = kScan[n];
            const int value = c[row][column];
            const int kind = row % 2 && column % 2 ? 1 : row % 2 || column % 2 ? 2 : 0;
            const std::int64_t magnitude = std::min<std::int64_t>(
                (std::int64_t{std::abs(value)} * kForward[qp % 6][kind] + rounding) >> bits, 2063);
            const int level = static_cast<int>(value < 0 ? -magnitude : magnitude);
            ASSERT_EQ(scan[n], level) << "QP " << qp;
            ASSERT_EQ(coefs[4 * column + row], level * kNorm[qp % 6][kind] * (1 << qp / 6));
            ASSERT_EQ(nonzero >> n & 1, level != 0);
        }
        ASSERT_EQ(coded, nonzero != 0 ? 1u : 0u);
    }
}

// Blocks whose error is constant have DC levels only.
TEST(Residual, ChromaDcLevelsAndWhatTheyStandFor) {
    Random random(3);
    for (int iteration = 0; iteration < 52 * 40; ++iteration) {
        const int qp = iteration % 52, bits = 16 + qp / 6;
        const bool intra = iteration / 52 % 2;
        const std::int64_t rounding = 2 * ((std::int64_t{1} << (bits - 1)) / (intra ? 3 : 6));
        const int range = 127 >> random.between(0, 7);
        int errors[2][4];
        alignas(32) std::uint8_t src[2][64], pred[2][64], dst[2][64];
        for (int i = 0; i < 128; ++i) {
            int& error = errors[i / 64][i % 64 / 32 * 2 + i % 8 / 4];
            error = i % 32 < 8 && i % 4 == 0 ? random.between(-range, range) : error;
            pred[i / 64][i % 64] = static_cast<std::uint8_t>(random.between(range, 255 - range));
            src[i / 64][i % 64] = static_cast<std::uint8_t>(pred[i / 64][i % 64] + error);
        }
        std::int16_t scan[128], dc[8];
        std::uint16_t nonzero[8];
        const std::uint32_t coded = zolt::scalar_kernels().code_chroma(
            {{src[0], src[1]},
             8,
             pred[0],
             {dst[0], dst[1]},
             8,
             intra ? &zolt::intra_quantizer(qp) : &zolt::inter_quantizer(qp),
             scan,
             nonzero,
             dc});
        ASSERT_EQ(coded & 0xff, 0u);
        for (int c = 0; c < 2; ++c) {
            constexpr int kSigns[4][4] = {
                {1, 1, 1, 1}, {1, -1, 1, -1}, {1, 1, -1, -1}, {1, -1, -1, 1}};
            for (int n = 0; n < 4; ++n) {
                int value = 0;
                for (int b = 0; b < 4; ++b) {
                    value += kSigns[n][b] * 16 * errors[c][b];
                }
                const std::int64_t magnitude = std::min<std::int64_t>(
                    (std::int64_t{std::abs(value)} * kForward[qp % 6][0] + rounding) >> bits, 2063);
                ASSERT_EQ(dc[4 * c + n], value < 0 ? -magnitude : magnitude) << "QP " << qp;
                ASSERT_EQ(coded >> (8 + 4 * c + n) & 1, magnitude != 0);
            }
            for (int i = 0; i < 64; ++i) {
                const int* const signs = kSigns[i / 32 * 2 + i % 8 / 4];
                int value = 0;
                for (int n = 0; n < 4; ++n) {
                    value += signs[n] * dc[4 * c + n] * kNorm[qp % 6][0] * (1 << qp / 6);
                }
                ASSERT_EQ(dst[c][i], std::clamp(pred[c][i] + (((value >> 1) + 32) >> 6), 0, 255));
            }
        }
    }
}

// Levels that a stand-in for transform and quantiser gives to the blocks of a macroblock.
std::int16_t stand_in_levels[16][16];

std::uint32_t stand_in_residual(const std::uint8_t*, std::ptrdiff_t, const std::uint8_t*,
                                const zolt::Quantizer&, std::int16_t*, std::int16_t*,
                                std::int16_t* scan, std::uint16_t* nonzero) {
    std::uint32_t mask = 0;
    for (int b = 0; b < 16; ++b) {
        std::copy(stand_in_levels[b], stand_in_levels[b] + 16, scan + 16 * b);
        nonzero[b] = 0;
        bool large = false;
        for (int n = 0; n < 16; ++n) {
            nonzero[b] = static_cast<std::uint16_t>(nonzero[b] | (scan[16 * b + n] != 0) << n);
            large = large || std::abs(scan[16 * b + n]) > 1;
        }
        mask |= (nonzero[b] == 0 ? 0u : large ? 0x10001u : 1u) << b;
    }
    return mask;
}

// A P macroblock with those levels.
class StandInMacroblock {
public:
    StandInMacroblock() {
        picture_.g_frame = frame_;
        picture_.g_slp->sliceType = P_SLICE;
        coder_.setMBOffsets();
    }

    // The mask of the blocks whose levels are sent.
    unsigned kept() {
        coder_.quantTransform_luma_16x16P();
        return coder_.g_luma_mask;
    }

private:
    static Kernels kernels() {
        Kernels table = zolt::scalar_kernels();
        table.code_residual_16x16 = stand_in_residual;
        return table;
    }

    const Kernels kernels_ = kernels();
    const std::uint8_t frame_[16 * 16 * 3 / 2] = {};
    Picture picture_{16, 16, kernels_};
    MacroblockCoder coder_{picture_};
};

TEST(CoefficientCost, DropsCheapBlocksOfInterMacroblocks) {
    struct Level {
        int block, position, level;
    };
    const struct {
        std::vector<Level> levels;
        unsigned kept;
        const char* why;
    } cases[] = {
        {{{0, 0, 1}}, 0, "a single 1 costs 3"},
        {{{5, 15, -2}}, 1u << 5, "a 2 anywhere is kept"},
        {{{0, 0, 1}, {1, 1, -1}}, 0, "3 + 2: the 8x8 block is kept, the macroblock is not"},
        {{{0, 0, 1}, {1, 1, 1}, {4, 0, 1}, {5, 2, 1}}, 0x33, "two 8x8 blocks of 5"},
        {{{0, 0, 1}, {2, 0, 1}}, 0x5, "a macroblock of exactly 6"},
        {{{0, 0, 1}, {1, 1, 1}, {4, 0, 1}, {5, 3, 1}}, 0, "5, and 4 that does not count"},
        {{{8, 0, 1}, {8, 1, 1}}, 1u << 8, "the zeros before a level count from the last one"},
        {{{8, 6, 1}, {9, 8, 1}, {12, 15, 1}}, 0, "after six zeros a 1 is free"},
    };
    StandInMacroblock macroblock;
    for (const auto& c : cases) {
        std::fill(stand_in_levels[0], stand_in_levels[0] + 256, std::int16_t{0});
        for (const Level& l : c.levels) {
            stand_in_levels[l.block][l.position] = static_cast<std::int16_t>(l.level);
        }
        EXPECT_EQ(macroblock.kept(), c.kept) << c.why;
    }
}

// Level by level, for few ones anywhere, so that costs are near the limits.
TEST(CoefficientCost, IsThatOfEveryLevel) {
    constexpr int COEFF_COST[16] = {3, 2, 2, 1, 1, 1};
    StandInMacroblock macroblock;
    Random random(1);
    int empty = 0, partial = 0;
    for (int round = 0; round < 20000; ++round) {
        const int density = random.between(1, 40);
        unsigned coded = 0, expected = 0;
        int costs[4] = {};
        for (int b = 0; b < 16; ++b) {
            int zeros = 0;
            for (std::int16_t& level : stand_in_levels[b]) {
                const bool one = random.between(0, 255) < density;
                level = static_cast<std::int16_t>(!one ? 0 : random.between(0, 1) ? 1 : -1);
                costs[b / 4] += one ? COEFF_COST[zeros] : 0;
                zeros = one ? 0 : zeros + 1;
                coded |= (one ? 1u : 0u) << b;
            }
        }
        int total = 0;
        for (int block8x8 = 0; block8x8 < 4; ++block8x8) {
            if (costs[block8x8] >= 5) {
                total += costs[block8x8];
                expected |= 0xfu << (4 * block8x8);
            }
        }
        expected = total >= 6 ? expected & coded : 0;
        ASSERT_EQ(macroblock.kept(), expected) << "round " << round;
        empty += expected == 0 ? 1 : 0;
        partial += expected != 0 && expected != coded ? 1 : 0;
    }
    EXPECT_GT(empty, 1000);
    EXPECT_GT(partial, 1000);
}

}  // namespace
