#include <cstring>

#include "kernels/clip.h"
#include "kernels/families.h"

namespace zolt {
namespace {

using std::ptrdiff_t;
using std::uint8_t;

// ---- Reference planes ----

void extend_edges(uint8_t* origin, int width, int height, ptrdiff_t stride, int border) {
    for (int y = 0; y < height; ++y) {
        uint8_t* row = origin + y * stride;
        std::memset(row - border, row[0], static_cast<std::size_t>(border));
        std::memset(row + width, row[width - 1], static_cast<std::size_t>(border));
    }
    const std::size_t row_size =
        static_cast<std::size_t>(width) + 2 * static_cast<std::size_t>(border);
    uint8_t* first = origin - border;
    uint8_t* last = first + (height - 1) * stride;
    for (int y = 1; y <= border; ++y) {
        std::memcpy(first - y * stride, first, row_size);
        std::memcpy(last + y * stride, last, row_size);
    }
}

// The 6-tap filter of clause 8.4.2.2.1 between the samples at p[0] and p[step].
template <typename T>
int six_tap(const T* p, ptrdiff_t step) {
    return p[-2 * step] - 5 * p[-step] + 20 * p[0] + 20 * p[step] - 5 * p[2 * step] + p[3 * step];
}

void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    for (int x = 0; x < count; ++x) {
        dst[x] = clip_sample((six_tap(src + x, stride) + 16) >> 5);
    }
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    for (int x = 0; x < count; ++x) {
        dst[x] = clip_sample((six_tap(src + x, 1) + 16) >> 5);
    }
}

// ---- Inter prediction ----

void copy_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    for (int y = 0; y < 16; ++y) {
        std::memcpy(pred + 16 * y, src + y * stride, 16);
    }
}

void average_16x16(uint8_t* pred, const uint8_t* a, ptrdiff_t a_stride, const uint8_t* b,
                   ptrdiff_t b_stride) {
    for (int y = 0; y < 16; ++y) {
        for (int x = 0; x < 16; ++x) {
            pred[16 * y + x] =
                static_cast<uint8_t>((a[y * a_stride + x] + b[y * b_stride + x] + 1) >> 1);
        }
    }
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    int vertical[21];
    for (int y = 0; y < 16; ++y) {
        const uint8_t* row = src + y * stride - 2;
        for (int x = 0; x < 21; ++x) {
            vertical[x] = six_tap(row + x, stride);
        }
        for (int x = 0; x < 16; ++x) {
            pred[16 * y + x] = clip_sample((six_tap(vertical + x + 2, 1) + 512) >> 10);
        }
    }
}

void chroma_component(uint8_t* pred, const uint8_t* src, ptrdiff_t stride, int fx, int fy) {
    const int a = (8 - fx) * (8 - fy);
    const int b = fx * (8 - fy);
    const int c = (8 - fx) * fy;
    const int d = fx * fy;
    for (int y = 0; y < 8; ++y) {
        const uint8_t* row = src + y * stride;
        for (int x = 0; x < 8; ++x) {
            pred[8 * y + x] =
                static_cast<uint8_t>((a * row[x] + b * row[x + 1] + c * row[stride + x] +
                                      d * row[stride + x + 1] + 32) >>
                                     6);
        }
    }
}

void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    chroma_component(pred, u, stride, fx, fy);
    chroma_component(pred + 64, v, stride, fx, fy);
}

}  // namespace

void scalar::fill_prediction(Kernels& table) {
    table.extend_edges = extend_edges;
    table.half_vertical_row = half_vertical_row;
    table.half_horizontal_row = half_horizontal_row;
    table.copy_16x16 = copy_16x16;
    table.average_16x16 = average_16x16;
    table.centre_16x16 = centre_16x16;
    table.chroma_8x8 = chroma_8x8;
}

}  // namespace zolt
