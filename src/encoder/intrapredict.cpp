#include <cstring>

#include "encoder/MacroblockCoder.h"
#include "encoder/errors.h"
#include "kernels/predict_4x4.h"
#include "kernels/predict_intra.h"

namespace {

constexpr int kIllegalMode = 104;

}  // namespace

void MacroblockCoder::gather_neighbours4(std::uint8_t* neighbours, const std::uint8_t* src,
                                         std::ptrdiff_t stride, int up, int left, int up_right,
                                         int up_left) {
    std::uint8_t* above = neighbours + 5;
    if (left) {
        for (int y = 0; y < 4; ++y) {
            neighbours[3 - y] = src[y * stride - 1];
        }
    } else {
        std::memset(neighbours, 128, 4);
    }
    neighbours[4] = up_left ? src[-stride - 1] : std::uint8_t{128};
    if (up) {
        std::memcpy(above, src - stride, 4);
    } else {
        std::memset(above, 128, 4);
    }
    if (up_right) {
        std::memcpy(above + 4, src - stride + 4, 4);
    } else {
        std::memset(above + 4, above[3], 4);
    }
}

void MacroblockCoder::ipred4(std::uint8_t* pred, const std::uint8_t* neighbours, int up, int left,
                             int mode) {
    if (mode < 0 || mode > 8) {
        exitOnError("Illegal intra prediction mode", kIllegalMode);
    }
    zolt::predict_4x4(pred, neighbours, ipred4_dc(neighbours, up, left), mode);
}

int MacroblockCoder::ipred4_dc(const std::uint8_t* neighbours, int up, int left) {
    const int above_sum = up ? zolt::sum(neighbours + 5, 1, 4) : 0;
    const int left_sum = left ? zolt::sum(neighbours, 1, 4) : 0;
    return up && left   ? (above_sum + left_sum + 4) >> 3
           : up || left ? (above_sum + left_sum + 2) >> 2
                        : 128;
}

void MacroblockCoder::ipred16(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride,
                              int up, int left, int mode) {
    const bool possible =
        (mode == 0 && up) || (mode == 1 && left) || mode == 2 || (mode == 3 && up && left);
    if (!possible) {
        exitOnError("Unsupported prediction in Luma 16x16 Intra Prediction Routine", kIllegalMode);
    }
    zolt::predict_16x16(pred, src, stride, up != 0, left != 0, mode);
}

void MacroblockCoder::ipred_c(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride,
                              int up, int left, int mode) {
    if (mode < 0 || mode > 3) {
        exitOnError("Unsupported Intra Prediction Mode", kIllegalMode);
    }
    zolt::predict_chroma(pred, src, stride, up != 0, left != 0, mode);
}
