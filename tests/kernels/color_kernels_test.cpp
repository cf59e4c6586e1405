// The colour conversions of every table against the scalar ones. Sources are allocations that end
// with the row, so that AddressSanitizer sees a read beyond it; the results are compared with the
// margins around their rows, so that a stray write shows as a difference.

#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <vector>

#include "common/Random.h"
#include "kernels/Kernels.h"

namespace {

using zolt::Kernels;
using zolt_test::Random;
using Bytes = std::vector<std::uint8_t>;

struct Case {
    const char* name;
    int pair_bytes;  // of two pixels
    void (*run)(const Kernels& k, const std::uint8_t* upper, const std::uint8_t* lower,
                zolt::IyuvRows to, int width);
};

template <Kernels::RgbConversion Kernels::*conversion, int kR, int kG, int kB>
void run_rgb(const Kernels& k, const std::uint8_t* upper, const std::uint8_t* lower,
             zolt::IyuvRows to, int width) {
    (k.*conversion)(upper, lower, {kR, kG, kB}, to, width);
}

template <Kernels::YuvConversion Kernels::*conversion>
void run_yuv(const Kernels& k, const std::uint8_t* upper, const std::uint8_t* lower,
             zolt::IyuvRows to, int width) {
    (k.*conversion)(upper, lower, to, width);
}

constexpr Case kCases[] = {
    {"BGRA", 8, run_rgb<&Kernels::rgb32_rows_to_iyuv, 2, 1, 0>},
    {"RGBA", 8, run_rgb<&Kernels::rgb32_rows_to_iyuv, 0, 1, 2>},
    {"ARGB", 8, run_rgb<&Kernels::rgb32_rows_to_iyuv, 1, 2, 3>},
    {"ABGR", 8, run_rgb<&Kernels::rgb32_rows_to_iyuv, 3, 2, 1>},
    {"BGR", 6, run_rgb<&Kernels::rgb24_rows_to_iyuv, 2, 1, 0>},
    {"RGB", 6, run_rgb<&Kernels::rgb24_rows_to_iyuv, 0, 1, 2>},
    {"AYUV", 8, run_yuv<&Kernels::ayuv_rows_to_iyuv>},
    {"YUY2", 4, run_yuv<&Kernels::yuy2_rows_to_iyuv>},
};
static_assert(sizeof(Kernels) - offsetof(Kernels, rgb32_rows_to_iyuv) == 4 * sizeof(void (*)()),
              "a colour conversion without a case");

// The result rows with margins before and after each.
Bytes convert(const Kernels& k, const Case& c, const Bytes& upper, const Bytes& lower, int width,
              std::size_t skipped = 0) {
    constexpr int kMargin = 64;
    Bytes result(static_cast<std::size_t>(5 * kMargin + 3 * width), 0xa5);
    std::uint8_t* const first = result.data() + kMargin;
    std::uint8_t* const second = first + width + kMargin;
    std::uint8_t* const u = second + width + kMargin;
    std::uint8_t* const v = u + width / 2 + kMargin;
    c.run(k, upper.data() + skipped, lower.data() + skipped, {first, second, u, v}, width);
    return result;
}

class ColorKernelTable : public testing::TestWithParam<std::tuple<const Kernels*, Case>> {};

TEST_P(ColorKernelTable, EqualsScalar) {
    const auto [table, c] = GetParam();
    std::vector<int> widths = {126, 128, 130, 640, 642, 1280};
    for (int width = 2; width <= 70; width += 2) {
        widths.push_back(width);
    }
    enum Pattern { kNoise, kExtremes, kBlackAndWhite, kPatternCount };
    Random random(1);
    for (const int width : widths) {
        for (int iteration = 0; iteration < 8 * kPatternCount; ++iteration) {
            const int pattern = iteration % kPatternCount;
            // Rows of any alignment, every other time starting where the allocation does.
            const auto skipped =
                static_cast<std::size_t>(iteration % 2 == 0 ? 0 : random.between(1, 31));
            const auto row_bytes =
                static_cast<std::size_t>(width) / 2 * static_cast<std::size_t>(c.pair_bytes);
            Bytes rows[2];
            for (int row = 0; row < 2; ++row) {
                rows[row].resize(skipped + row_bytes);
                for (std::uint8_t& byte : rows[row]) {
                    const int values[kPatternCount] = {random.sample(), random.between(0, 1) * 255,
                                                       row * 255};
                    byte = static_cast<std::uint8_t>(values[pattern]);
                }
            }
            ASSERT_EQ(convert(*table, c, rows[0], rows[1], width, skipped),
                      convert(zolt::scalar_kernels(), c, rows[0], rows[1], width, skipped))
                << "width " << width << ", pattern " << pattern;
        }
    }
}

// Blocks of one colour each reach the differences that means of random pixels do not.
TEST_P(ColorKernelTable, EqualsScalarOnAGridOfColors) {
    const auto [table, c] = GetParam();
    Bytes row;
    int width = 0;
    for (int color = 0; color < 52 * 52 * 52; ++color) {
        const std::uint8_t levels[3] = {static_cast<std::uint8_t>(color % 52 * 5),
                                        static_cast<std::uint8_t>(color / 52 % 52 * 5),
                                        static_cast<std::uint8_t>(color / (52 * 52) * 5)};
        for (int i = 0; i < c.pair_bytes; ++i) {
            row.push_back(levels[i % (c.pair_bytes / 2) % 3]);
        }
        width += 2;
    }
    ASSERT_EQ(convert(*table, c, row, row, width),
              convert(zolt::scalar_kernels(), c, row, row, width));
}

// The tables to compare with the scalar one.
std::vector<const Kernels*> tables() {
    std::vector<const Kernels*> list;
    for (const Kernels* table = zolt::kernel_tables().begin() + 1;
         table != zolt::kernel_tables().end(); ++table) {
        list.push_back(table);
    }
    return list;
}

INSTANTIATE_TEST_SUITE_P(Tables, ColorKernelTable,
                         testing::Combine(testing::ValuesIn(tables()), testing::ValuesIn(kCases)),
                         [](const auto& test) {
                             return std::string(std::get<0>(test.param)->name) + "_" +
                                    std::get<1>(test.param).name;
                         });
// A processor may have the scalar table only.
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(ColorKernelTable);

}  // namespace
