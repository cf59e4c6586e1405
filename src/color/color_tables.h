#pragma once

#include <cstddef>
#include <cstdint>

#include "kernels/clip.h"
#include "kernels/color_rules.h"

// The rules of color_rules.h under the converter's names.
namespace zolt {

// RGB to YUV: luma parts by R, G and B; chroma by B - Y + 255 (U) and R - Y + 255 (V).
extern std::uint8_t TableCr[256], TableCg[256], TableCb[256];
extern std::uint8_t TableCu[511], TableCv[511];
// YUV to RGB, by U or V as stored (128 is zero): V's part of R, U's and V's part of G, U's part of
// B.
extern std::int32_t TableE02xCr[256], TableE11xCb[256], TableE12xCr[256], TableE21xCb[256];

// Fill the tables of a direction, once per process; safe from any thread.
void fill_tables_rgb_to_yuv();
void fill_tables_yuv_to_rgb();

inline int luma(int r, int g, int b) {
    return TableCr[r] + TableCg[g] + TableCb[b];
}

inline std::uint8_t chroma_u(int b, int y) {
    return TableCu[b - y + 255];
}

inline std::uint8_t chroma_v(int r, int y) {
    return TableCv[r - y + 255];
}

inline std::uint8_t red(int y, int v) {
    return clip_sample(y + TableE02xCr[v]);
}

inline std::uint8_t green(int y, int u, int v) {
    return clip_sample(y + TableE11xCb[u] + TableE12xCr[v]);
}

inline std::uint8_t blue(int y, int u) {
    return clip_sample(y + TableE21xCb[u]);
}

}  // namespace zolt
