// Intra 4x4 macroblocks coded by one kernel against the same block by block.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "common/Random.h"
#include "encoder/MacroblockCoder.h"

namespace {

using zolt::Kernels;
using zolt_test::Random;

constexpr int kSize = 48;  // 3 x 3 macroblocks

// A picture and its coder with one of the kernel tables.
struct Bench {
    const std::uint8_t frame[kSize * kSize * 3 / 2] = {};
    Picture picture;
    MacroblockCoder coder{picture};

    explicit Bench(const Kernels& kernels) : picture(kSize, kSize, kernels) {
        picture.g_frame = frame;
    }

    // Draws samples, some beyond the picture too, and the modes around macroblock mb, and codes it.
    void code(int mb, Random random) {
        const int kind = random.between(0, 3);
        const int slope_x = random.between(-20, 20), slope_y = random.between(-20, 20);
        const int noise = 1 << random.between(0, 7);
        for (int y = -1; y < kSize; ++y) {
            for (int x = -1; x < kSize + 4; ++x) {
                const int texture = 128 + (slope_x * (x % 9) + slope_y * (y % 9)) / 2 +
                                    random.between(-noise, noise);
                const int values[] = {random.sample(), random.between(0, 1) * 255,
                                      (x / 4 + y / 4) % 2 * 255, std::clamp(texture, 0, 255)};
                picture.g_cur_y[y * picture.g_stride_luma + x] =
                    static_cast<std::uint8_t>(values[kind]);
            }
        }
        constexpr int kQps[] = {0, 1, 6, 12, 20, 28, 34, 40, 51};
        picture.g_mbQp = kQps[random.between(0, 8)];
        picture.g_slp->sliceType = random.between(0, 1) ? I_SLICE : P_SLICE;
        for (int b = 0; b < (kSize / 4 + 2) * (kSize / 4 + 1); ++b) {
            picture.g_i4mode[b] = static_cast<std::int8_t>(random.between(0, 8));
        }
        code(mb);
    }

    // Codes macroblock mb of what the picture holds.
    void code(int mb) {
        coder.g_mapMBNumber = mb;
        coder.g_mb_x = mb % picture.g_mb_width;
        coder.g_mb_y = mb / picture.g_mb_width;
        coder.setMBOffsets();
        coder.code_intra4x4();
    }
};

class Intra4x4Macroblock : public testing::TestWithParam<const Kernels*> {};

TEST_P(Intra4x4Macroblock, EqualsBlockByBlock) {
    Bench expected(zolt::scalar_kernels()), actual(*GetParam());
    int changed = 0;
    for (int iteration = 0; iteration < 4000; ++iteration) {
        const Random random(static_cast<std::uint64_t>(iteration));
        const int mb = iteration % 9;
        SCOPED_TRACE("iteration " + std::to_string(iteration));
        expected.code(mb, random);
        actual.code(mb, random);
        const MacroblockCoder &e = expected.coder, &a = actual.coder;
        for (int k = 0; k < 16; ++k) {
            ASSERT_EQ(a.g_ipMBPred[k], e.g_ipMBPred[k]) << "mode of block " << k;
            ASSERT_EQ(a.g_prev_intra4x4_pred_mode_flag[k], e.g_prev_intra4x4_pred_mode_flag[k]);
            ASSERT_EQ(a.g_rem_intra4x4_pred_mode[k], e.g_rem_intra4x4_pred_mode[k]);
            ASSERT_EQ(a.g_nonzero[k], e.g_nonzero[k]) << "levels of block " << k;
            if (e.g_nonzero[k] != 0) {
                ASSERT_TRUE(std::equal(a.g_scan_levels + 16 * k, a.g_scan_levels + 16 * k + 16,
                                       e.g_scan_levels + 16 * k))
                    << "levels of block " << k;
            }
            changed += e.g_prev_intra4x4_pred_mode_flag[k] ? 0 : 1;
        }
        ASSERT_EQ(a.g_luma_mask, e.g_luma_mask);
        for (int y = -1; y < kSize; ++y) {
            const int row = y * e.picture.g_stride_luma - 1;
            ASSERT_EQ(std::memcmp(a.picture.g_cur_y + row, e.picture.g_cur_y + row, kSize + 5), 0)
                << "samples in row " << y;
        }
        const int blocks = (kSize / 4 + 2) * (kSize / 4 + 1);
        ASSERT_EQ(std::memcmp(&a.picture.g_i4mode[0], &e.picture.g_i4mode[0], blocks), 0);
    }
    EXPECT_GT(changed, 4000 * 16 / 10) << "hardly any mode search was decided";
}

// Residuals that are quantised to coefficients whose inverse transform has a sum beyond 16 bits.
TEST_P(Intra4x4Macroblock, SumsBeyond16Bits) {
    constexpr int kBlock[16] = {255, 10, 0,   255, 255, 255, 255, 197,
                                203, 0,  255, 255, 255, 238, 0,   0};
    for (const int around : {0, 255}) {
        const auto reconstruct = [&](const Kernels& kernels) {
            Bench bench(kernels);
            Picture& picture = bench.picture;
            const std::ptrdiff_t stride = picture.g_stride_luma;
            for (int y = -1; y < kSize; ++y) {
                std::memset(picture.g_cur_y + y * stride - 1, around, kSize + 5);
            }
            std::uint8_t* block = picture.g_cur_y + 16 * stride + 16;
            for (int n = 0; n < 16; ++n) {
                block[n / 4 * stride + n % 4] =
                    static_cast<std::uint8_t>(around == 0 ? kBlock[n] : 255 - kBlock[n]);
            }
            picture.g_mbQp = 51;
            picture.g_slp->sliceType = I_SLICE;
            std::memset(picture.g_i4mode, 2, (kSize / 4 + 2) * (kSize / 4 + 1));
            bench.code(4);
            std::vector<int> samples;
            for (int n = 0; n < 16; ++n) {
                samples.push_back(block[n / 4 * stride + n % 4]);
            }
            return samples;
        };
        EXPECT_EQ(reconstruct(*GetParam()), reconstruct(zolt::scalar_kernels()))
            << "all around is " << around;
    }
}

std::vector<const Kernels*> tables() {
    std::vector<const Kernels*> list;
    for (const Kernels& table : zolt::kernel_tables()) {
        if (table.code_intra_4x4) {
            list.push_back(&table);
        }
    }
    return list;
}

INSTANTIATE_TEST_SUITE_P(Tables, Intra4x4Macroblock, testing::ValuesIn(tables()),
                         [](const auto& test) { return std::string(test.param->name); });
// A processor may have tables without such a kernel only.
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(Intra4x4Macroblock);

}  // namespace
