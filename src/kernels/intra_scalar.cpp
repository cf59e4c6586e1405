#include <algorithm>
#include <cstdlib>

#include "kernels/families.h"
#include "kernels/intra_modes.h"
#include "kernels/predict_4x4.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::ptrdiff_t;
using std::uint8_t;

void block_sums(const uint8_t* src, ptrdiff_t stride, int32_t* sums) {
    for (int block = 0; block < 16; ++block) {
        const uint8_t* p = src + 4 * (block / 4) * stride + 4 * (block % 4);
        int32_t sum = 0;
        for (int y = 0; y < 4; ++y) {
            for (int x = 0; x < 4; ++x) {
                sum += p[y * stride + x];
            }
        }
        sums[block] = sum;
    }
}

// One 4-point Hadamard transform in place, entries step apart.
void hadamard(int32_t* v, int step) {
    const int32_t a = v[0] + v[step];
    const int32_t b = v[0] - v[step];
    const int32_t c = v[2 * step] + v[3 * step];
    const int32_t d = v[2 * step] - v[3 * step];
    v[0] = a + c;
    v[step] = b + d;
    v[2 * step] = a - c;
    v[3 * step] = b - d;
}

void hadamard_energy(const int32_t* values, int32_t* energy) {
    int32_t h[16];
    std::copy(values, values + 16, h);
    for (int i = 0; i < 4; ++i) {
        hadamard(h + 4 * i, 1);
    }
    for (int i = 0; i < 4; ++i) {
        hadamard(h + i, 4);
    }
    std::fill(energy, energy + 4, 0);
    for (int n = 0; n < 16; ++n) {
        const int group = (n % 4 != 0 ? 1 : 0) + (n / 4 != 0 ? 2 : 0);
        energy[group] += (std::abs(h[n]) + 8) >> 4;
    }
}

void phase_sad_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                     int32_t* distortion) {
    std::fill(distortion, distortion + 16, 0);
    for (int y = 0; y < 16; ++y) {
        for (int x = 0; x < 16; ++x) {
            distortion[4 * (y % 4) + x % 4] += std::abs(src[y * stride + x] - pred[16 * y + x]);
        }
    }
}

// Phases of a 2d x 2d block with the prediction stride 2d.
template <int d>
void phase_satd(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred, int32_t* distortion) {
    for (int y = 0; y < d; ++y) {
        for (int x = 0; x < d; ++x) {
            const auto difference = [&](int i, int j) {
                return src[(y + j) * stride + x + i] - pred[2 * d * (y + j) + x + i];
            };
            const int d00 = difference(0, 0);
            const int d01 = difference(d, 0);
            const int d10 = difference(0, d);
            const int d11 = difference(d, d);
            distortion[d * y + x] =
                std::abs(d00 + d01 + d10 + d11) + std::abs(d00 - d01 + d10 - d11) +
                std::abs(d00 + d01 - d10 - d11) + std::abs(d00 - d01 - d10 + d11);
        }
    }
}

void phase_satd_8x8(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    phase_satd<4>(src, stride, pred, distortion);
}

void phase_satd_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    phase_satd<2>(src, stride, pred, distortion);
}

void intra_4x4_modes(const uint8_t* src, ptrdiff_t stride, const uint8_t* neighbours, int dc,
                     uint8_t* preds, int16_t* distortion) {
    std::fill(distortion, distortion + 64, int16_t{0});
    for (int mode = 0; mode < 9; ++mode, preds += 16) {
        predict_4x4(preds, neighbours, dc, mode);
        int32_t phases[4];
        phase_satd_4x4(src, stride, preds, phases);
        for (int p = 0; p < 4; ++p) {
            distortion[16 * p + mode] = static_cast<int16_t>(phases[p]);
        }
    }
}

}  // namespace

void scalar::fill_intra(Kernels& table) {
    table.block_sums = block_sums;
    table.hadamard_energy = hadamard_energy;
    table.intra_16x16_modes = intra_16x16_modes_by<phase_sad_16x16>;
    table.intra_chroma_modes = intra_chroma_modes_by<phase_satd_8x8>;
    table.phase_satd_4x4 = phase_satd_4x4;
    table.intra_4x4_modes = intra_4x4_modes;
}

}  // namespace zolt
