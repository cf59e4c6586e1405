#pragma once

#include <cstdint>

#include "kernels/clip.h"

// The colour rules: 8-bit samples of full range, luma of 0.3 R, 0.59 G and 0.11 B, chroma of the
// differences B - Y and R - Y. All is integer arithmetic on hundredths, so that the tables below
// are made when they are compiled.
namespace zolt {

constexpr int kRedPercent = 30, kGreenPercent = 59, kBluePercent = 11;

// What a step of U and of V stands for, in percent of a step of B - Y and of R - Y: the ranges of
// these differences (0.89 and 0.7 to either side) fill that of a sample.
constexpr int kStepPercentU = 178, kStepPercentV = 140;

// Rounded half away from zero; the divisor is positive.
constexpr int rounded_quotient(int dividend, int divisor) {
    const int half = dividend < 0 ? -divisor : divisor;
    return (2 * dividend + half) / (2 * divisor);
}

// The rules as look-ups. From R, G and B: the rounded part of each in luma, which is their sum;
// chroma by B - Y + 255 (u) and R - Y + 255 (v). To R, G and B, by U or V as stored (128 is zero):
// what is added to luma; V's part of R, U's and V's part of G, U's part of B.
struct ColorRules {
    std::uint8_t luma_of_r[256], luma_of_g[256], luma_of_b[256];
    std::uint8_t u[511], v[511];
    std::int32_t r_of_v[256], g_of_u[256], g_of_v[256], b_of_u[256];

    constexpr ColorRules()
        : luma_of_r(), luma_of_g(), luma_of_b(), u(), v(), r_of_v(), g_of_u(), g_of_v(), b_of_u() {
        for (int i = 0; i < 256; ++i) {
            luma_of_r[i] = clip_sample(rounded_quotient(kRedPercent * i, 100));
            luma_of_g[i] = clip_sample(rounded_quotient(kGreenPercent * i, 100));
            luma_of_b[i] = clip_sample(rounded_quotient(kBluePercent * i, 100));
            const int chroma = i - 128;
            r_of_v[i] = rounded_quotient(kStepPercentV * chroma, 100);
            g_of_u[i] =
                rounded_quotient(-kBluePercent * kStepPercentU * chroma, 100 * kGreenPercent);
            g_of_v[i] =
                rounded_quotient(-kRedPercent * kStepPercentV * chroma, 100 * kGreenPercent);
            b_of_u[i] = rounded_quotient(kStepPercentU * chroma, 100);
        }
        for (int i = 0; i < 511; ++i) {
            const int difference = i - 255;
            u[i] = clip_sample(
                rounded_quotient(128 * kStepPercentU + 100 * difference, kStepPercentU));
            v[i] = clip_sample(
                rounded_quotient(128 * kStepPercentV + 100 * difference, kStepPercentV));
        }
    }
};
inline constexpr ColorRules kColorRules;

// The rules from R, G and B as products with factors of 1 / 32768, for vectors of 16-bit numbers.
constexpr int kRedFactor = 9831, kGreenFactor = 19334, kBlueFactor = 3605;
constexpr int kFactorU = 18409, kFactorV = 23406;

constexpr int scaled(int value, int factor) {
    return (value * factor + (1 << 14)) >> 15;
}

constexpr bool factors_equal_rules() {
    for (int i = 0; i < 256; ++i) {
        if (scaled(i, kRedFactor) != kColorRules.luma_of_r[i] ||
            scaled(i, kGreenFactor) != kColorRules.luma_of_g[i] ||
            scaled(i, kBlueFactor) != kColorRules.luma_of_b[i]) {
            return false;
        }
    }
    for (int i = 0; i < 511; ++i) {
        if (clip_sample(128 + scaled(i - 255, kFactorU)) != kColorRules.u[i] ||
            clip_sample(128 + scaled(i - 255, kFactorV)) != kColorRules.v[i]) {
            return false;
        }
    }
    return true;
}
static_assert(factors_equal_rules());

}  // namespace zolt
