#pragma once

#include "kernels/predict_intra.h"

// Mode searches of intra 16x16 and of chroma, mode after mode, over the distortion of one
// prediction at 16 phases, which the files of an instruction set supply.
namespace zolt {
namespace {

using PhaseDistortion = void (*)(const std::uint8_t* src, std::ptrdiff_t stride,
                                 const std::uint8_t* pred, std::int32_t* distortion);

template <PhaseDistortion sad>
void intra_16x16_modes_by(const std::uint8_t* src, std::ptrdiff_t stride, bool up, bool left,
                          std::uint8_t* preds, std::int32_t* distortion) {
    for (int mode = 0; mode < kIntraModes; ++mode, preds += 256) {
        predict_16x16(preds, src, stride, up, left, mode);
        std::int32_t phases[16];
        sad(src, stride, preds, phases);
        for (int phase = 0; phase < 8; ++phase) {
            distortion[kIntraModes * phase + mode] = phases[phase];
        }
    }
}

template <PhaseDistortion satd>
void intra_chroma_modes_by(const std::uint8_t* u, const std::uint8_t* v, std::ptrdiff_t stride,
                           bool up, bool left, std::uint8_t* preds, std::int32_t* distortion) {
    for (int mode = 0; mode < kIntraModes; ++mode, preds += 128) {
        predict_chroma(preds, u, stride, up, left, mode);
        predict_chroma(preds + 64, v, stride, up, left, mode);
        std::int32_t phases_u[16], phases_v[16];
        satd(u, stride, preds, phases_u);
        satd(v, stride, preds + 64, phases_v);
        for (int phase = 0; phase < 12; ++phase) {
            distortion[kIntraModes * phase + mode] = phases_u[phase] + phases_v[phase];
        }
    }
}

}  // namespace
}  // namespace zolt
