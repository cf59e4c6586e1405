#include "kernels/color_scalar.h"

#include "kernels/color_rules.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::uint8_t;

uint8_t sample(int value) {
    return static_cast<uint8_t>(value);
}

// Luma of one pixel, adding its R and B to the sums.
int luma_and_sums(const uint8_t* pixel, RgbOffsets at, int& r_sum, int& b_sum) {
    const int r = pixel[at.r], g = pixel[at.g], b = pixel[at.b];
    r_sum += r;
    b_sum += b;
    return kColorRules.luma_of_r[r] + kColorRules.luma_of_g[g] + kColorRules.luma_of_b[b];
}

template <int kBytes>
void rgb_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at, IyuvRows to,
                      int width) {
    for (int x = 0; x < width; x += 2, upper += 2 * kBytes, lower += 2 * kBytes) {
        int r_sum = 0, b_sum = 0;
        const int y00 = luma_and_sums(upper, at, r_sum, b_sum);
        const int y01 = luma_and_sums(upper + kBytes, at, r_sum, b_sum);
        const int y10 = luma_and_sums(lower, at, r_sum, b_sum);
        const int y11 = luma_and_sums(lower + kBytes, at, r_sum, b_sum);
        const int y_mean = (y00 + y01 + y10 + y11) >> 2;
        to.upper[x] = sample(y00);
        to.upper[x + 1] = sample(y01);
        to.lower[x] = sample(y10);
        to.lower[x + 1] = sample(y11);
        to.u[x / 2] = kColorRules.u[(b_sum >> 2) - y_mean + 255];
        to.v[x / 2] = kColorRules.v[(r_sum >> 2) - y_mean + 255];
    }
}

}  // namespace

void scalar_rgb32_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at,
                               IyuvRows to, int width) {
    rgb_rows_to_iyuv<4>(upper, lower, at, to, width);
}

void scalar_rgb24_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, RgbOffsets at,
                               IyuvRows to, int width) {
    rgb_rows_to_iyuv<3>(upper, lower, at, to, width);
}

void scalar_ayuv_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    constexpr int kY = 1, kU = 2, kV = 3;
    for (int x = 0; x < width; x += 2, upper += 8, lower += 8) {
        const auto mean = [&](int at) {
            return sample((upper[at] + upper[4 + at] + lower[at] + lower[4 + at]) >> 2);
        };
        to.upper[x] = upper[kY];
        to.upper[x + 1] = upper[4 + kY];
        to.lower[x] = lower[kY];
        to.lower[x + 1] = lower[4 + kY];
        to.u[x / 2] = mean(kU);
        to.v[x / 2] = mean(kV);
    }
}

void scalar_yuy2_rows_to_iyuv(const uint8_t* upper, const uint8_t* lower, IyuvRows to, int width) {
    constexpr int kY0 = 0, kU = 1, kY1 = 2, kV = 3;
    for (int x = 0; x < width; x += 2, upper += 4, lower += 4) {
        to.upper[x] = upper[kY0];
        to.upper[x + 1] = upper[kY1];
        to.lower[x] = lower[kY0];
        to.lower[x + 1] = lower[kY1];
        to.u[x / 2] = sample((upper[kU] + lower[kU]) >> 1);
        to.v[x / 2] = sample((upper[kV] + lower[kV]) >> 1);
    }
}

void scalar::fill_color(Kernels& table) {
    table.rgb32_rows_to_iyuv = scalar_rgb32_rows_to_iyuv;
    table.rgb24_rows_to_iyuv = scalar_rgb24_rows_to_iyuv;
    table.ayuv_rows_to_iyuv = scalar_ayuv_rows_to_iyuv;
    table.yuy2_rows_to_iyuv = scalar_yuy2_rows_to_iyuv;
}

}  // namespace zolt
