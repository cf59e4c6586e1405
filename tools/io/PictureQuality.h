#pragma once

#include <cmath>
#include <limits>

namespace zolt {

// How far a decoded picture is from its source: mean squared errors of the planes, and the
// structural similarity of the luma planes (at most 1, which is equality).
struct PictureQuality {
    double mse_y = 0;
    double mse_u = 0;
    double mse_v = 0;
    double ssim_y = 0;

    // Of all samples of a 4:2:0 picture.
    double mse() const { return (4 * mse_y + mse_u + mse_v) / 6; }

    // Peak signal-to-noise ratio of a mean squared error of 8-bit samples, in decibels; infinite
    // where there is no error.
    static double psnr(double mse) {
        constexpr double kPeak = 255;
        return mse > 0 ? 10 * std::log10(kPeak * kPeak / mse)
                       : std::numeric_limits<double>::infinity();
    }
};

}  // namespace zolt
