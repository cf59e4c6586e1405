// Learned decisions: thresholds that were computed apart with exact fractions, at QPs where a value
// is close to an integer or the rule changes; trees as unions of their paths; mode searches on
// blocks whose mode is plain.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <vector>

#include "common/Random.h"
#include "encoder/MacroblockCoder.h"
#include "encoder/tables.h"

namespace {

// Energies that a stand-in for Kernels::hadamard_energy gives to the source and to the residual.
std::int32_t stand_in_energies[2][4];
int stand_in_calls = 0;

void stand_in_energy(const std::int32_t*, std::int32_t* energy) {
    std::copy(stand_in_energies[stand_in_calls], stand_in_energies[stand_in_calls] + 4, energy);
    ++stand_in_calls;
}

class LearnedTree : public testing::Test {
protected:
    static zolt::Kernels with_stand_in() {
        zolt::Kernels kernels = zolt::scalar_kernels();
        kernels.hadamard_energy = stand_in_energy;
        return kernels;
    }

    // The values at which any of the thresholds decides, and a step below.
    static std::vector<int> around(const int* thresholds, int count) {
        std::vector<int> values = {0, 100000};
        for (int i = 0; i < count; ++i) {
            values.push_back(std::max(thresholds[i] - 1, 0));
            values.push_back(std::max(thresholds[i], 0));
        }
        return values;
    }

    zolt::Kernels kernels_ = with_stand_in();
    const std::uint8_t frame_[16 * 16 * 3 / 2] = {};
    Picture picture_{16, 16, kernels_};
    MacroblockCoder coder_{picture_};
};

TEST_F(LearnedTree, Intra16x16Or4x4) {
    const struct {
        int qp, t[7];
    } cases[] = {
        {0, {0, 0, 0, 0, 0, 0, 0}},
        {5, {10, 9, 0, -21, 20, 0, 0}},
        {17, {34, 31, 0, -72, 68, 0, 0}},
        {18, {36, 33, 0, -77, 73, 0, 0}},
        {24, {56, 32, 0, 100, 48, 0, 0}},
        {28, {80, 42, 0, 129, 71, 0, 0}},
        {29, {87, 47, 0, 135, 82, 0, 0}},
        {30, {94, 52, 0, 141, 95, 0, 0}},
        {33, {119, 70, 180, 175, 146, 51, 132}},
        {39, {182, 122, 255, 407, 303, 138, 264}},
        {48, {309, 241, 396, 1558, 674, 526, 855}},
        {51, {359, 291, 450, 2262, 834, 725, 1156}},
    };
    picture_.g_slp->sliceType = I_SLICE;
    picture_.g_frame = frame_;
    coder_.setMBOffsets();
    for (const auto& [qp, t] : cases) {
        picture_.g_mbQp = qp;
        const std::vector<int> values = around(t, 7);
        for (const int d : values) {
            for (const int h : values) {
                for (const int v : values) {
                    const bool large = (t[0] > d && t[1] > d) ||
                                       (t[0] > d && t[1] <= d && t[3] > v && t[4] > h) ||
                                       (t[0] <= d && t[2] > d && t[5] > h && t[6] > v);
                    const std::int32_t energies[4] = {9, h, v, d};
                    std::copy(energies, energies + 4, stand_in_energies[0]);
                    stand_in_calls = 0;
                    ASSERT_EQ(coder_.learn16_4(), large ? 16 : 4)
                        << "QP " << qp << ", textures " << h << ", " << v << ", " << d;
                }
            }
        }
    }
}

TEST_F(LearnedTree, InterOrIntra) {
    const struct {
        int qp, t[10];
    } cases[] = {
        {10, {-1125, 706, 95, 364, -1320, 0, 0, 0, -2490, -2315}},
        {20, {392, 188, 27, 67, 91, 0, 0, 0, 617, 338}},
        {26, {464, 239, 44, 97, 190, 0, 0, 0, 765, 347}},
        {30, {480, 329, 70, 144, 179, 0, 0, 0, 774, 328}},
        {34, {648, 414, 102, 180, 238, 0, 0, 0, 1060, 644}},
        {35, {592, 110, 192, 149, 79, 62, 82, 0, 943, 408}},
        {36, {664, 142, 225, 169, 87, 67, 246, 0, 1031, 476}},
        {45, {1042, 421, 581, 240, 243, 96, 848, 0, 1569, 533}},
        {51, {3553, 1959, 1310, 766, 821, 126, 4231, 0, 4947, 1985}},
    };
    picture_.g_frame = frame_;
    coder_.setMBOffsets();
    for (const auto& [qp, t] : cases) {
        picture_.g_mbQp = qp;
        const std::vector<int> values = around(t, 10);
        for (const int x : values) {
            for (const int y : values) {
                const bool a = t[0] > y;
                const bool low_qp_intra = (a && t[1] <= y && t[4] > x) ||
                                          (a && t[1] > y && t[3] <= y && t[2] > x) ||
                                          (!a && t[8] <= y) || (!a && t[8] > y && t[9] > x);
                const bool high_qp_inter = (a && t[1] <= x) ||
                                           (a && t[1] > x && t[2] > y && t[3] > y) ||
                                           (a && t[1] > x && t[2] > y && t[3] <= y && t[5] <= x) ||
                                           (a && t[1] > x && t[2] <= y && t[4] <= x && t[6] > y) ||
                                           (!a && t[8] > y && t[9] <= x);
                // The energy counts with its constant part.
                const std::int32_t energies[2][4] = {{5, 6, 7, x}, {y / 2, 0, 0, y - y / 2}};
                std::copy(energies[0], energies[0] + 8, stand_in_energies[0]);
                stand_in_calls = 0;
                ASSERT_EQ(coder_.setLearnPIMode() != 0, qp < 35 ? !low_qp_intra : high_qp_inter)
                    << "QP " << qp << ", x " << x << ", y " << y;
            }
        }
    }
}

// Distortions that stand-ins for the mode kernels give, by phase and mode.
std::int32_t stand_in_distortions[16][4];

void stand_in_16x16(const std::uint8_t*, std::ptrdiff_t, bool, bool, std::uint8_t*,
                    std::int32_t* distortion) {
    std::copy(stand_in_distortions[0], stand_in_distortions[0] + 32, distortion);
}
void stand_in_chroma(const std::uint8_t*, const std::uint8_t*, std::ptrdiff_t, bool, bool,
                     std::uint8_t*, std::int32_t* distortion) {
    std::copy(stand_in_distortions[0], stand_in_distortions[0] + 48, distortion);
}

// The eliminations as they are described, in double precision. drops(cost, mean, step) tells which
// candidates go after a step, decides(step) after which steps any do.
template <typename Decides, typename Drops>
int plain_elimination(std::array<bool, 4> enabled, int rate, int last, unsigned fewest,
                      Decides decides, Drops drops) {
    int cost[4] = {}, best = -1;
    for (int step = 0; step <= last; ++step) {
        for (int mode = 0; mode < 4; ++mode) {
            cost[mode] += enabled[mode] ? stand_in_distortions[step][mode] : 0;
        }
        cost[0] -= enabled[0] ? rate : 0;
        if (!decides(step)) {
            continue;
        }
        int sum = 0, count = 0;
        best = -1;
        for (int mode = 0; mode < 4; ++mode) {
            if (enabled[mode]) {
                sum += cost[mode];
                ++count;
                best = best < 0 || cost[mode] < cost[best] ? mode : best;
            }
        }
        const double mean = static_cast<double>(sum) / count;
        unsigned left = 0;
        for (int mode = 0; mode < 4; ++mode) {
            enabled[mode] = enabled[mode] && !drops(cost[mode], mean, step);
            left += enabled[mode];
        }
        if (left < fewest) {
            break;
        }
    }
    return best;
}

int plain_16x16_mode(bool up, bool left) {
    constexpr double kFactors[16] = {2.25, 1.75, 1.5, 1.25, 1.0, 1.0, 1.0, 1.0,
                                     1.0,  1.0,  1.1, 1.1,  1.0, 1.0, 0.0, 0.0};
    return plain_elimination(
        {up, left, true, up && left}, 0, 15, 2, [](int) { return true; },
        [&](int cost, double mean, int step) { return cost >= mean * kFactors[step]; });
}

int plain_chroma_mode(bool up, bool left, int rate) {
    constexpr double kFactors[12] = {0, 0, 0, 2.0, 0, 1.6, 0, 1.2, 0, 1.0, 0, 1.0};
    return plain_elimination(
        {true, left, up, up && left}, rate, 11, 1,
        [](int step) { return step >= 3 && step % 2 == 1; },
        [&](int cost, double mean, int step) {
            return cost > static_cast<int>(kFactors[step] * mean);
        });
}

// Costs that are close to each other, so that they meet their limits exactly again and again.
TEST(ModeElimination, EqualsTheDescriptionInDoublePrecision) {
    zolt::Kernels kernels = zolt::scalar_kernels();
    kernels.intra_16x16_modes = stand_in_16x16;
    kernels.intra_chroma_modes = stand_in_chroma;
    Picture picture(16, 16, kernels);
    MacroblockCoder coder(picture);
    zolt_test::Random random(5);
    for (int iteration = 0; iteration < 400000; ++iteration) {
        const int base = 1 << random.between(0, 8);
        const int unit = random.between(1, 12);
        for (auto& phase : stand_in_distortions) {
            for (std::int32_t& d : phase) {
                d = unit * random.between(base / 2, base + base / 4);
            }
        }
        coder.g_mb_up = random.between(0, 3) > 0;
        coder.g_mb_left = random.between(0, 3) > 0;
        coder.g_intra_lambda = random.between(1, 91);
        const bool up = coder.g_mb_up != 0, left = coder.g_mb_left != 0;
        ASSERT_EQ(coder.learn16_mode(), plain_16x16_mode(up, left)) << "iteration " << iteration;
        ASSERT_EQ(coder.learn_chroma_mode(), plain_chroma_mode(up, left, coder.g_intra_lambda))
            << "iteration " << iteration;
    }
}

// Three chroma candidates of which the third's cost is 1.2 times the mean after step 7: in double
// precision the limit is then that cost or, where the product is rounded down below it, one less.
TEST(ModeElimination, RoundsTheChromaLimitInDoublePrecision) {
    zolt::Kernels kernels = zolt::scalar_kernels();
    kernels.intra_chroma_modes = stand_in_chroma;
    Picture picture(16, 16, kernels);
    MacroblockCoder coder(picture);
    coder.g_mb_up = coder.g_mb_left = 1;
    coder.g_intra_lambda = 0;
    int dropped = 0;
    for (int sum = 10; sum < 2000; sum += 10) {
        for (auto& phase : stand_in_distortions) {
            std::fill(phase, phase + 4, 0);
        }
        stand_in_distortions[0][3] = 100;  // dropped after step 3
        stand_in_distortions[7][0] = stand_in_distortions[7][1] = sum * 3 / 10;
        stand_in_distortions[7][2] = sum * 4 / 10;
        stand_in_distortions[8][0] = stand_in_distortions[8][1] = sum;
        const int mode = coder.learn_chroma_mode();
        ASSERT_EQ(mode, plain_chroma_mode(true, true, 0)) << "sum " << sum;
        dropped += mode != 2;
    }
    EXPECT_GT(dropped, 0) << "no limit was rounded down";
}

// The mean of the costs -1 and 0 gives the limit -0.8 after step 5. Truncated it is 0, so that the
// other mode stays, which wins by what DC costs later.
TEST(ModeElimination, TruncatesNegativeChromaLimitsTowardsZero) {
    zolt::Kernels kernels = zolt::scalar_kernels();
    kernels.intra_chroma_modes = stand_in_chroma;
    Picture picture(16, 16, kernels);
    MacroblockCoder coder(picture);
    coder.g_mb_up = 0;
    coder.g_mb_left = 1;
    coder.g_intra_lambda = 1;
    for (auto& phase : stand_in_distortions) {
        std::fill(phase, phase + 4, 0);
    }
    stand_in_distortions[0][0] = 4;
    stand_in_distortions[5][0] = 1;
    stand_in_distortions[6][0] = 100;
    EXPECT_EQ(coder.learn_chroma_mode(), 1);
}

class ModeSearch : public testing::Test {
protected:
    // Makes macroblock `mb` of 3 x 3 current, with samples from draw(x, y) in it and around it.
    template <typename Draw>
    void start(int mb, Draw draw, int qp = 12) {
        for (int y = 0; y < 48; ++y) {
            for (int x = 0; x < 48; ++x) {
                const auto value = static_cast<std::uint8_t>(draw(x, y));
                picture_.g_cur_y[y * picture_.g_stride_luma + x] = value;
                picture_.g_cur_u[y / 2 * picture_.g_stride_chroma + x / 2] = value;
                picture_.g_cur_v[y / 2 * picture_.g_stride_chroma + x / 2] = value;
            }
        }
        picture_.g_frame = frame_;
        picture_.g_mbQp = qp;  // 12: rate weight 1
        coder_.g_mapMBNumber = mb;
        coder_.g_mb_x = mb % picture_.g_mb_width;
        coder_.g_mb_y = mb / picture_.g_mb_width;
        coder_.setMBOffsets();
        coder_.set_block_availability();
    }

    const std::uint8_t frame_[48 * 48 * 3 / 2] = {};
    Picture picture_{48, 48, zolt::best_kernels()};
    MacroblockCoder coder_{picture_};
};

TEST_F(ModeSearch, FindsTheModeOfPlainBlocks) {
    const auto modes = [&](int mb, auto draw) {
        start(mb, draw);
        return std::make_pair(coder_.learn16_mode(), coder_.learn_chroma_mode());
    };
    // 16x16 modes: vertical, horizontal, DC, plane; chroma modes: DC, horizontal, vertical, plane.
    EXPECT_EQ(modes(4, [](int x, int) { return x / 2 * 37 % 256; }), std::make_pair(0, 2));
    EXPECT_EQ(modes(4, [](int, int y) { return y / 2 * 37 % 256; }), std::make_pair(1, 1));
    EXPECT_EQ(modes(4, [](int x, int y) { return x / 2 * 3 + y / 2 * 6; }), std::make_pair(3, 3));
    EXPECT_EQ(modes(4, [](int, int) { return 77; }), std::make_pair(0, 0)) << "ties";
    EXPECT_EQ(modes(0, [](int x, int) { return x * 5; }), std::make_pair(2, 0)) << "only DC";
    EXPECT_EQ(modes(1, [](int, int y) { return y / 2 * 9; }), std::make_pair(1, 1))
        << "no row above";
    EXPECT_EQ(modes(3, [](int x, int) { return x / 2 * 9; }), std::make_pair(0, 2)) << "none left";
}

// The predicted mode is kept up to a distortion of 8 * rate weight + 64, here 72; a block d away
// from its prediction has 16 * d.
TEST_F(ModeSearch, KeepsThePredicted4x4Mode) {
    std::uint8_t pred[16];
    for (const int d : {4, 5}) {
        // Block 0 of the middle macroblock continues the row above; DC, as predicted, is d off.
        start(4, [d](int x, int y) { return x < 16 && y >= 16 ? 100 + 2 * d : 100; });
        EXPECT_EQ(coder_.learn4_mode(0, 2, pred), d == 4 ? 2 : 0);
        EXPECT_EQ(pred[0], d == 4 ? 104 : 100);
    }
    start(0, [](int x, int y) { return 13 * x * y % 256; });
    EXPECT_EQ(coder_.learn4_mode(0, 2, pred), 2) << "no other candidate";
}

// The elimination mode by mode: a candidate that is dropped takes no further part.
int plain_4x4_mode(const MacroblockCoder& e, int k, int predicted) {
    const std::uint8_t* src = e.g_mb_rec_y + 4 * zolt::luma_scan_j[k] * e.picture.g_stride_luma +
                              4 * zolt::luma_scan_i[k];
    const bool up = e.g_blk_up[k], left = e.g_blk_left[k];
    std::uint8_t neighbours[16];
    MacroblockCoder::gather_neighbours4(neighbours, src, e.picture.g_stride_luma, up, left,
                                        e.g_blk_up_right[k], e.g_blk_up_left[k]);
    int distortion[9][4];
    for (int mode = 0; mode < 9; ++mode) {
        std::uint8_t pred[16];
        MacroblockCoder::ipred4(pred, neighbours, up, left, mode);
        for (int step = 0; step < 4; ++step) {
            const auto d = [&](int x, int y) {
                x += step % 2, y += step / 2;
                return src[y * e.picture.g_stride_luma + x] - pred[4 * y + x];
            };
            const int a = d(0, 0), b = d(2, 0), c = d(0, 2), f = d(2, 2);
            distortion[mode][step] = std::abs(a + b + c + f) + std::abs(a - b + c - f) +
                                     std::abs(a + b - c - f) + std::abs(a - b - c + f);
        }
    }
    const int* p = distortion[predicted];
    const int reference = p[0] + p[1] + p[2] + p[3];
    if (reference <= 8 * e.g_intra_lambda + 64) {
        return predicted;
    }
    constexpr double kFactors[3] = {2.0, 1.25, 1.0};
    int best = predicted;
    int best_cost = 4 * (reference / 4);
    for (int mode = 0; mode < 9; ++mode) {
        const bool needs_up = mode == 0 || mode == 3 || mode == 7;
        const bool needs_left = mode == 1 || mode == 8;
        const bool possible = mode == 2 || (needs_up ? up : needs_left ? left : up && left);
        int cost = 0;
        bool kept = possible && mode != predicted;
        for (int step = 0; step < 4 && kept; ++step) {
            cost += distortion[mode][step] + 2 * e.g_intra_lambda;
            kept = step == 3 || !(cost > (step + 1) * (reference / 4) * kFactors[step]);
        }
        if (kept && cost < best_cost) {
            best = mode;
            best_cost = cost;
        }
    }
    return best;
}

TEST_F(ModeSearch, Equals4x4EliminationModeByMode) {
    zolt_test::Random random(4);
    int changed = 0;
    for (int iteration = 0; iteration < 600; ++iteration) {
        const int slope_x = random.between(-20, 20), slope_y = random.between(-20, 20);
        const int noise = 1 << random.between(0, 7);
        constexpr int kQps[] = {0, 12, 28, 40, 51};
        constexpr int kMacroblocks[] = {0, 1, 3, 4, 5};
        start(
            kMacroblocks[random.between(0, 4)],
            [&](int x, int y) {
                return std::clamp(128 + (slope_x * (x % 9) + slope_y * (y % 9)) / 2 +
                                      random.between(-noise, noise),
                                  0, 255);
            },
            kQps[random.between(0, 4)]);
        for (int k = 0; k < 16; ++k) {
            const bool up = coder_.g_blk_up[k], left = coder_.g_blk_left[k];
            const int predicted = up && left ? random.between(0, 8) : 2;
            alignas(16) std::uint8_t pred[16];
            const int mode = coder_.learn4_mode(k, predicted, pred);
            ASSERT_EQ(mode, plain_4x4_mode(coder_, k, predicted))
                << "block " << k << ", predicted " << predicted << ", QP " << picture_.g_mbQp;
            changed += mode != predicted;
        }
    }
    EXPECT_GT(changed, 600 * 16 / 10) << "hardly any mode search was decided";
}

}  // namespace
