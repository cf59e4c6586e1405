#pragma once

// From R, G and B to luma and chroma: 8-bit samples of full range, luma of 0.3 R, 0.59 G and
// 0.11 B, chroma of the differences B - Y and R - Y.
namespace zolt {

constexpr int kRedPercent = 30, kGreenPercent = 59, kBluePercent = 11;

// A colour's part of luma, rounded half up. Luma is the sum of the rounded parts.
constexpr int luma_part(int sample, int percent) {
    return (percent * sample + 50) / 100;
}

// What a step of U and of V stands for, in percent of a step of B - Y and of R - Y: the ranges of
// these differences (0.89 and 0.7 to either side) fill that of a sample.
constexpr int kStepPercentU = 178, kStepPercentV = 140;

// 128 + difference / step, rounded to nearest (no quotient lies halfway) and clipped. Negative
// quotients become 0 whichever way they are rounded.
constexpr int chroma(int difference, int step_percent) {
    const int rounded = (257 * step_percent + 200 * difference) / (2 * step_percent);
    return rounded < 0 ? 0 : rounded > 255 ? 255 : rounded;
}

// The same as products with factors of 1 / 32768, for vectors of 16-bit numbers.
constexpr int kRedFactor = 9831, kGreenFactor = 19334, kBlueFactor = 3605;
constexpr int kFactorU = 18409, kFactorV = 23406;

constexpr int scaled(int value, int factor) {
    return (value * factor + (1 << 14)) >> 15;
}

constexpr bool equals_luma_part(int factor, int percent) {
    for (int sample = 0; sample <= 255; ++sample) {
        if (scaled(sample, factor) != luma_part(sample, percent)) {
            return false;
        }
    }
    return true;
}

constexpr bool equals_chroma(int factor, int step_percent) {
    for (int difference = -255; difference <= 255; ++difference) {
        const int sum = 128 + scaled(difference, factor);
        if ((sum < 0 ? 0 : sum > 255 ? 255 : sum) != chroma(difference, step_percent)) {
            return false;
        }
    }
    return true;
}

static_assert(equals_luma_part(kRedFactor, kRedPercent));
static_assert(equals_luma_part(kGreenFactor, kGreenPercent));
static_assert(equals_luma_part(kBlueFactor, kBluePercent));
static_assert(equals_chroma(kFactorU, kStepPercentU));
static_assert(equals_chroma(kFactorV, kStepPercentV));

}  // namespace zolt
