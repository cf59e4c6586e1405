#include "libav/QualityMeter.h"

#include <cstdint>
#include <vector>

namespace zolt {
namespace {

struct Plane {
    const std::uint8_t* samples;
    int stride;

    const std::uint8_t* row(int y) const {
        return samples + static_cast<std::ptrdiff_t>(y) * stride;
    }
};

Plane plane_of(const AVFrame& frame, int index) {
    return {frame.data[index], frame.linesize[index]};
}

double mean_squared_error(const Plane& a, const Plane& b, int width, int height) {
    std::uint64_t sum = 0;
    for (int y = 0; y < height; ++y) {
        const std::uint8_t* const row_a = a.row(y);
        const std::uint8_t* const row_b = b.row(y);
        std::uint32_t row_sum = 0;  // up to 66051 samples
        for (int x = 0; x < width; ++x) {
            const int difference = row_a[x] - row_b[x];
            row_sum += static_cast<std::uint32_t>(difference * difference);
        }
        sum += row_sum;
    }
    return static_cast<double>(sum) / (static_cast<double>(width) * height);
}

constexpr int kBlockSide = 4;  // half a window

struct BlockSums {
    std::uint32_t a = 0, b = 0;
    std::uint32_t squares = 0;  // of both
    std::uint32_t products = 0;

    BlockSums& operator+=(const BlockSums& other) {
        a += other.a;
        b += other.b;
        squares += other.squares;
        products += other.products;
        return *this;
    }
};

std::vector<BlockSums> block_row(const Plane& a, const Plane& b, int row, int blocks) {
    std::vector<BlockSums> sums(static_cast<std::size_t>(blocks));
    for (int y = row * kBlockSide; y < (row + 1) * kBlockSide; ++y) {
        const std::uint8_t* row_a = a.row(y);
        const std::uint8_t* row_b = b.row(y);
        for (BlockSums& block : sums) {
            for (int x = 0; x < kBlockSide; ++x) {
                const std::uint32_t sample_a = *row_a++;
                const std::uint32_t sample_b = *row_b++;
                block.a += sample_a;
                block.b += sample_b;
                block.squares += sample_a * sample_a + sample_b * sample_b;
                block.products += sample_a * sample_b;
            }
        }
    }
    return sums;
}

// The index of a window from the sums over its samples, with the usual constants.
double window_ssim(const BlockSums& sums) {
    constexpr double kCount = 4.0 * kBlockSide * kBlockSide;
    constexpr double kPeak = 255;
    constexpr double kC1 = 0.01 * kPeak * 0.01 * kPeak;
    constexpr double kC2 = 0.03 * kPeak * 0.03 * kPeak;
    const double mean_a = sums.a / kCount;
    const double mean_b = sums.b / kCount;
    const double variances =
        (sums.squares - kCount * (mean_a * mean_a + mean_b * mean_b)) / (kCount - 1);
    const double covariance = (sums.products - kCount * mean_a * mean_b) / (kCount - 1);
    return (2 * mean_a * mean_b + kC1) * (2 * covariance + kC2) /
           ((mean_a * mean_a + mean_b * mean_b + kC1) * (variances + kC2));
}

double structural_similarity(const Plane& a, const Plane& b, int width, int height) {
    const int columns = width / kBlockSide;
    const int rows = height / kBlockSide;
    double sum = 0;
    std::vector<BlockSums> above = block_row(a, b, 0, columns);
    for (int row = 1; row < rows; ++row) {
        std::vector<BlockSums> below = block_row(a, b, row, columns);
        for (std::size_t x = 0; x + 1 < below.size(); ++x) {
            BlockSums window = above[x];
            window += above[x + 1];
            window += below[x];
            window += below[x + 1];
            sum += window_ssim(window);
        }
        above = std::move(below);
    }
    return sum / (static_cast<double>(columns - 1) * (rows - 1));
}

}  // namespace

PictureQuality QualityMeter::compare(const AVFrame& source, const AVFrame& decoded) {
    const int width = source.width;
    const int height = source.height;
    const auto mse = [&](int plane) {
        const int shift = plane == 0 ? 0 : 1;
        return mean_squared_error(plane_of(source, plane), plane_of(decoded, plane), width >> shift,
                                  height >> shift);
    };
    return {mse(0), mse(1), mse(2),
            structural_similarity(plane_of(source, 0), plane_of(decoded, 0), width, height)};
}

}  // namespace zolt
