#pragma once

#include <algorithm>
#include <cstdint>

#include "color/color_tables.h"

// Row loops of the colour converter, but for the conversions to 4:2:0, which are kernels. Widths
// are output pixels; loops over pixel pairs need even ones.
namespace zolt {

struct Rgba {
    int r, g, b, a;  // byte offsets in a pixel
};

// Alpha of pixels whose source has none.
constexpr std::uint8_t kOpaque = 255;
constexpr std::uint8_t kNeutralChroma = 128;

// Byte offsets in an AYUV pixel and in a YUY2 pair.
constexpr int kAyuvA = 0, kAyuvY = 1, kAyuvU = 2, kAyuvV = 3;
constexpr int kYuy2Y0 = 0, kYuy2U = 1, kYuy2Y1 = 2, kYuy2V = 3;

// Luma of one pixel, adding its R and B to the sums.
inline int luma_and_sums(const std::uint8_t* pixel, const Rgba& at, int* r_sum, int* b_sum) {
    const int r = pixel[at.r];
    const int b = pixel[at.b];
    *r_sum += r;
    *b_sum += b;
    return luma(r, pixel[at.g], b);
}

template <int kBytes>
void put_rgb(std::uint8_t* pixel, const Rgba& at, int y, int u, int v,
             std::uint8_t alpha = kOpaque) {
    pixel[at.r] = red(y, v);
    pixel[at.g] = green(y, u, v);
    pixel[at.b] = blue(y, u);
    if (kBytes == 4) {
        pixel[at.a] = alpha;
    }
}

inline void put_ayuv(std::uint8_t* pixel, std::uint8_t alpha, int y, int u, int v) {
    pixel[kAyuvA] = alpha;
    pixel[kAyuvY] = static_cast<std::uint8_t>(y);
    pixel[kAyuvU] = static_cast<std::uint8_t>(u);
    pixel[kAyuvV] = static_cast<std::uint8_t>(v);
}

template <int kFrom, int kTo>
void rgb_row_to_rgb(const std::uint8_t* from, const Rgba& in, std::uint8_t* to, const Rgba& out,
                    int width) {
    for (int x = 0; x < width; ++x, from += kFrom, to += kTo) {
        to[out.r] = from[in.r];
        to[out.g] = from[in.g];
        to[out.b] = from[in.b];
        if (kTo == 4) {
            to[out.a] = kFrom == 4 ? from[in.a] : kOpaque;
        }
    }
}

template <int kFrom>
void rgb_row_to_ayuv(const std::uint8_t* from, const Rgba& in, std::uint8_t* to, int width) {
    for (int x = 0; x < width; ++x, from += kFrom, to += 4) {
        const int r = from[in.r];
        const int b = from[in.b];
        const int y = luma(r, from[in.g], b);
        put_ayuv(to, kFrom == 4 ? from[in.a] : kOpaque, y, chroma_u(b, y), chroma_v(r, y));
    }
}

template <int kFrom>
void rgb_row_to_yuy2(const std::uint8_t* from, const Rgba& in, std::uint8_t* to, int width) {
    for (int x = 0; x < width; x += 2, from += 2 * kFrom, to += 4) {
        int r_sum = 0, b_sum = 0;
        const int y0 = luma_and_sums(from, in, &r_sum, &b_sum);
        const int y1 = luma_and_sums(from + kFrom, in, &r_sum, &b_sum);
        const int y_mean = (y0 + y1) >> 1;
        to[kYuy2Y0] = static_cast<std::uint8_t>(y0);
        to[kYuy2Y1] = static_cast<std::uint8_t>(y1);
        to[kYuy2U] = chroma_u(b_sum >> 1, y_mean);
        to[kYuy2V] = chroma_v(r_sum >> 1, y_mean);
    }
}

template <int kTo>
void ayuv_row_to_rgb(const std::uint8_t* from, std::uint8_t* to, const Rgba& out, int width) {
    for (int x = 0; x < width; ++x, from += 4, to += kTo) {
        put_rgb<kTo>(to, out, from[kAyuvY], from[kAyuvU], from[kAyuvV], from[kAyuvA]);
    }
}

inline void ayuv_row_to_yuy2(const std::uint8_t* from, std::uint8_t* to, int width) {
    for (int x = 0; x < width; x += 2, from += 8, to += 4) {
        to[kYuy2Y0] = from[kAyuvY];
        to[kYuy2Y1] = from[4 + kAyuvY];
        to[kYuy2U] = static_cast<std::uint8_t>((from[kAyuvU] + from[4 + kAyuvU]) >> 1);
        to[kYuy2V] = static_cast<std::uint8_t>((from[kAyuvV] + from[4 + kAyuvV]) >> 1);
    }
}

// One row of a format whose pixels share chroma samples in pairs: the luma samples from the first
// output pixel on, and the chroma samples from its pair on.
struct PairedRow {
    const std::uint8_t* y;
    int y_step;
    const std::uint8_t *u, *v;
    int chroma_step;
    int chroma_count;  // samples up to the end of the row, at least 1
};

// Calls put(pixel, y, u, v) for each of the `width` pixels of kTo bytes at `to`.
template <int kTo, class Put>
void paired_row_to_pixels(const PairedRow& row, std::uint8_t* to, int width, Put put) {
    const int pairs = width / 2;
    for (int i = 0; i < pairs; ++i, to += 2 * kTo) {
        const int u = row.u[i * row.chroma_step];
        const int v = row.v[i * row.chroma_step];
        put(to, row.y[2 * i * row.y_step], u, v);
        put(to + kTo, row.y[(2 * i + 1) * row.y_step], u, v);
    }
    if (width % 2 != 0) {
        const int last = std::min(pairs, row.chroma_count - 1) * row.chroma_step;
        put(to, row.y[2 * pairs * row.y_step], row.u[last], row.v[last]);
    }
}

template <int kTo>
void paired_row_to_rgb(const PairedRow& row, std::uint8_t* to, const Rgba& out, int width) {
    paired_row_to_pixels<kTo>(row, to, width, [&](std::uint8_t* pixel, int y, int u, int v) {
        put_rgb<kTo>(pixel, out, y, u, v);
    });
}

inline void paired_row_to_yuy2(const PairedRow& row, std::uint8_t* to, int width) {
    for (int x = 0; x < width; x += 2, to += 4) {
        to[kYuy2Y0] = row.y[x * row.y_step];
        to[kYuy2Y1] = row.y[(x + 1) * row.y_step];
        to[kYuy2U] = row.u[x / 2 * row.chroma_step];
        to[kYuy2V] = row.v[x / 2 * row.chroma_step];
    }
}

}  // namespace zolt
