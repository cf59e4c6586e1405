#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "kernels/chroma_dc.h"
#include "kernels/clip.h"
#include "kernels/families.h"
#include "kernels/zigzag.h"

namespace zolt {
namespace {

using std::int16_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

// Forward core transform of four values, written with the given step.
void forward_butterfly(const int* x, int* y, int step) {
    const int s = x[0] + x[3];
    const int d = x[0] - x[3];
    const int t = x[1] + x[2];
    const int u = x[1] - x[2];
    y[0] = s + t;
    y[step] = 2 * d + u;
    y[2 * step] = s - t;
    y[3 * step] = d - 2 * u;
}

void transform_block(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                     ptrdiff_t pred_stride, int16_t* coefs) {
    int rows[16];  // column by column: entry 4 * column + row
    for (int y = 0; y < 4; ++y) {
        int x[4];
        for (int i = 0; i < 4; ++i) {
            x[i] = src[y * stride + i] - pred[y * pred_stride + i];
        }
        forward_butterfly(x, rows + y, 4);
    }
    for (int column = 0; column < 4; ++column) {
        int y[4];
        forward_butterfly(rows + 4 * column, y, 1);
        for (int i = 0; i < 4; ++i) {
            coefs[4 * column + i] = static_cast<int16_t>(y[i]);
        }
    }
}

// Sample offsets of the blocks of a 16x16 block in decoding order (Figure 6-10).
constexpr int block_x(int k) {
    return 4 * ((k & 1) + ((k >> 1) & 2));
}
constexpr int block_y(int k) {
    return 4 * (((k >> 1) & 1) + ((k >> 2) & 2));
}

// Levels of a block in scan and their mask in nonzero, and the coefficients replaced by what the
// levels stand for; returns the largest magnitude of a level.
int quantize(int16_t* coefs, const Quantizer& quantizer, int16_t* scan, uint16_t* nonzero) {
    unsigned mask = 0;
    int largest = 0;
    for (int n = 0; n < 16; ++n) {
        const int position = kZigzag[n];
        const int c = coefs[position];
        const int magnitude = std::min(
            (std::abs(c) * quantizer.forward[position] + quantizer.rounding) >> quantizer.shift,
            kMaxLevel);
        const int level = c < 0 ? -magnitude : magnitude;
        scan[n] = static_cast<int16_t>(level);
        coefs[position] = static_cast<int16_t>(level * quantizer.dequant[position]);
        mask |= (level != 0 ? 1u : 0u) << n;
        largest = std::max(largest, magnitude);
    }
    *nonzero = static_cast<uint16_t>(mask);
    return largest;
}

// The blocks of a prediction whose rows are pred_stride samples long.
template <int kBlocks, int pred_stride>
uint32_t code_residual(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                       const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                       uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int k = 0; k < kBlocks; ++k) {
        int16_t block[16], levels[16];
        transform_block(src + block_y(k) * stride + block_x(k), stride,
                        pred + block_y(k) * pred_stride + block_x(k), pred_stride, block);
        if (dc) {
            dc[k] = block[0];
            block[0] = 0;
        }
        const int largest = quantize(block, quantizer, levels, nonzero + k);
        if (largest > 0) {
            coded |= (largest > 1 ? 0x10001u : 1u) << k;
            std::copy(levels, levels + 16, scan + 16 * k);
            std::copy(block, block + 16, coefs + 16 * k);
        } else if (dc) {
            std::fill(coefs + 16 * k, coefs + 16 * k + 16, int16_t{0});
        }
    }
    return coded;
}

uint32_t code_residual_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    return code_residual<1, 4>(src, stride, pred, quantizer, nullptr, coefs, scan, nonzero) & 1;
}

// The 4x4 Hadamard transform of clause 8.5.10, in place.
void hadamard_4x4(int* v) {
    for (int pass = 0; pass < 2; ++pass) {
        const int step = pass == 0 ? 1 : 4;
        for (int i = 0; i < 4; ++i) {
            int* x = v + (pass == 0 ? 4 * i : i);
            const int a = x[0] + x[step];
            const int b = x[0] - x[step];
            const int c = x[2 * step] + x[3 * step];
            const int d = x[2 * step] - x[3 * step];
            x[0] = a + c;
            x[step] = a - c;
            x[2 * step] = b - d;
            x[3 * step] = b + d;
        }
    }
}

uint32_t code_luma_dc(const int16_t* dc, const Quantizer& quantizer, int16_t* coefs,
                      int16_t* scan) {
    int v[16];  // column by column, as kZigzag has it
    for (int k = 0; k < 16; ++k) {
        v[block_x(k) + block_y(k) / 4] = dc[k];
    }
    hadamard_4x4(v);
    uint32_t coded = 0;
    for (int n = 0; n < 16; ++n) {
        int& c = v[kZigzag[n]];
        c >>= 1;
        const int level = quantize_dc(c, quantizer);
        scan[n] = static_cast<int16_t>(level);
        coded |= (level != 0 ? 1u : 0u) << n;
        c = level * quantizer.dequant[0];
    }
    hadamard_4x4(v);
    for (int k = 0; k < 16; ++k) {
        const int value = (v[block_x(k) + block_y(k) / 4] + 2) >> 2;
        coefs[16 * k] = static_cast<int16_t>(value);
        coded |= (value != 0 ? 0x10000u : 0u) << k;
    }
    return coded;
}

// Inverse core transform of four values with the given input step, written contiguously.
void inverse_butterfly(const int* w, int step, int* x) {
    const int e = w[0] + w[2 * step];
    const int f = w[0] - w[2 * step];
    const int g = (w[step] >> 1) - w[3 * step];
    const int h = w[step] + (w[3 * step] >> 1);
    x[0] = e + h;
    x[1] = f + g;
    x[2] = f - g;
    x[3] = e - h;
}

void reconstruct_block(const int16_t* coefs, const uint8_t* pred, ptrdiff_t pred_stride,
                       uint8_t* dst, ptrdiff_t stride) {
    int w[16];
    std::copy(coefs, coefs + 16, w);
    int rows[16];  // row by row
    for (int y = 0; y < 4; ++y) {
        inverse_butterfly(w + y, 4, rows + 4 * y);
    }
    for (int column = 0; column < 4; ++column) {
        int x[4];
        inverse_butterfly(rows + column, 4, x);
        for (int y = 0; y < 4; ++y) {
            dst[y * stride + column] =
                clip_sample(pred[y * pred_stride + column] + ((x[y] + 32) >> 6));
        }
    }
}

void reconstruct_blocks(int count, const int16_t* coefs, uint32_t mask, const uint8_t* pred,
                        ptrdiff_t pred_stride, uint8_t* dst, ptrdiff_t stride) {
    for (int k = 0; k < count; ++k) {
        const uint8_t* block_pred = pred + block_y(k) * pred_stride + block_x(k);
        uint8_t* block_dst = dst + block_y(k) * stride + block_x(k);
        if (mask >> k & 1) {
            reconstruct_block(coefs + 16 * k, block_pred, pred_stride, block_dst, stride);
        } else {
            for (int y = 0; y < 4; ++y) {
                std::memcpy(block_dst + y * stride, block_pred + y * pred_stride, 4);
            }
        }
    }
}

void reconstruct_16x16(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                       ptrdiff_t stride) {
    reconstruct_blocks(16, coefs, mask, pred, 16, dst, stride);
}

void reconstruct_4x4(const int16_t* coefs, const uint8_t* pred, uint8_t* dst, ptrdiff_t stride) {
    reconstruct_block(coefs, pred, 4, dst, stride);
}

uint32_t code_chroma(const Chroma& chroma) {
    uint32_t coded = 0;
    for (int c = 0; c < 2; ++c) {
        const uint8_t* pred = chroma.pred + 64 * c;
        int16_t dc[4], coefs[64];
        const uint32_t ac_mask =
            0xf & code_residual<4, 8>(chroma.src[c], chroma.src_stride, pred, *chroma.quantizer, dc,
                                      coefs, chroma.scan + 64 * c, chroma.nonzero + 4 * c);
        const uint32_t levels = code_chroma_dc(dc, *chroma.quantizer, chroma.dc + 4 * c, coefs);
        reconstruct_blocks(4, coefs, 0xf, pred, 8, chroma.dst[c], chroma.dst_stride);
        coded |= (ac_mask | levels << 8) << (4 * c);
    }
    return coded;
}

}  // namespace

void scalar::fill_residual(Kernels& table) {
    table.code_residual_16x16 = code_residual<16, 16>;
    table.code_residual_4x4 = code_residual_4x4;
    table.code_luma_dc = code_luma_dc;
    table.reconstruct_16x16 = reconstruct_16x16;
    table.reconstruct_4x4 = reconstruct_4x4;
    table.code_chroma = code_chroma;
}

}  // namespace zolt
