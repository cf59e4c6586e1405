#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "kernels/Kernels.h"
#include "kernels/color_scalar.h"
#include "kernels/predict_4x4.h"
#include "kernels/zigzag.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int32_t;
using std::int8_t;
using std::ptrdiff_t;
using std::uint16_t;
using std::uint32_t;
using std::uint8_t;

uint8_t clip_sample(int value) {
    return static_cast<uint8_t>(std::clamp(value, 0, 255));
}

// ---- Distortion of the motion search ----

// Where a row stands among the `rows` of an arranged block, in which those of the upper and of the
// lower half alternate.
constexpr int arranged_position(int row, int rows) {
    return 2 * (row % (rows / 2)) + row / (rows / 2);
}

// Samples of an arranged block: of the block itself, and of the checkerboard.
uint8_t* block_row(uint8_t* block, int y) {
    return block + 16 * arranged_position(y, 16);
}
const uint8_t* block_row(const uint8_t* block, int y) {
    return block + 16 * arranged_position(y, 16);
}
uint8_t* checkerboard_row(uint8_t* block, int n) {
    return block + 256 + 16 * arranged_position(n, 8);
}

void arrange_block(const uint8_t* src, ptrdiff_t stride, uint8_t* block) {
    for (int y = 0; y < 16; ++y) {
        for (int x = 0; x < 16; ++x) {
            const uint8_t sample = src[y * stride + x];
            block_row(block, y)[x] = sample;
            if ((x + y) % 2 == 0) {
                checkerboard_row(block, y / 2)[x] = sample;
            }
        }
    }
}

// First row and first column of each sampling phase.
constexpr int kPhaseRow[4] = {0, 1, 1, 0};
constexpr int kPhaseColumn[4] = {0, 1, 0, 1};

// SADs of the phases up to each; sample(y, x) is the sample to compare with.
template <typename Sample>
void add_phases(const uint8_t* block, Sample sample, int* sums) {
    int sum = 0;
    for (int p = 0; p < 4; ++p) {
        for (int y = kPhaseRow[p]; y < 16; y += 2) {
            for (int x = kPhaseColumn[p]; x < 16; x += 2) {
                sum += std::abs(block_row(block, y)[x] - sample(y, x));
            }
        }
        sums[p] = sum;
    }
}

auto samples_at(const uint8_t* ref, ptrdiff_t stride) {
    return [=](int y, int x) { return int{ref[y * stride + x]}; };
}

auto averages_at(const uint8_t* a, const uint8_t* b, ptrdiff_t stride) {
    return [=](int y, int x) { return (a[y * stride + x] + b[y * stride + x] + 1) >> 1; };
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(block, samples_at(ref, stride), sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(block, averages_at(a, b, stride), sums);
}

template <typename Sample>
bool first_phases_below(const uint8_t* block, Sample sample, int32_t limit) {
    int sums[4];
    add_phases(block, sample, sums);
    return sums[1] < limit;
}

template <int kCount>
uint32_t first_phases_below(const uint8_t* block, const uint8_t* const* refs, ptrdiff_t stride,
                            const int32_t* limits) {
    uint32_t below = 0;
    for (int n = 0; n < kCount; ++n) {
        below |= uint32_t{first_phases_below(block, samples_at(refs[n], stride), limits[n])} << n;
    }
    return below;
}

uint32_t first_phases_below_half(const uint8_t* block, const HalfSamples& at, ptrdiff_t stride,
                                 const int32_t* limits) {
    const uint8_t* refs[8];
    half_candidates(at, stride, refs);
    return first_phases_below<8>(block, refs, stride, limits);
}

// The averages of centre and each of kCount blocks.
template <int kCount>
uint32_t averages_below(const uint8_t* block, const uint8_t* centre, const uint8_t* const* refs,
                        ptrdiff_t stride, const int32_t* limits) {
    uint32_t below = 0;
    for (int n = 0; n < kCount; ++n) {
        below |=
            uint32_t{first_phases_below(block, averages_at(centre, refs[n], stride), limits[n])}
            << n;
    }
    return below;
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    uint32_t below = averages_below<4>(block, centre, refs, stride, limits);
    for (int n = 0; n < 4; ++n) {
        const uint8_t* a = refs[kCrossPairs[n][0]];
        const uint8_t* b = refs[kCrossPairs[n][1]];
        below |= uint32_t{first_phases_below(block, averages_at(a, b, stride), limits[4 + n])}
                 << (4 + n);
    }
    return below;
}

// ---- Reference planes ----

void extend_edges(uint8_t* origin, int width, int height, ptrdiff_t stride, int border) {
    for (int y = 0; y < height; ++y) {
        uint8_t* row = origin + y * stride;
        std::memset(row - border, row[0], static_cast<std::size_t>(border));
        std::memset(row + width, row[width - 1], static_cast<std::size_t>(border));
    }
    const std::size_t row_size = static_cast<std::size_t>(width + 2 * border);
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

// ---- Residual ----

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
// levels stand for; returns whether there is a level other than 0.
bool quantize(int16_t* coefs, const Quantizer& quantizer, int16_t* scan, uint16_t* nonzero) {
    unsigned mask = 0;
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
    }
    *nonzero = static_cast<uint16_t>(mask);
    return mask != 0;
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
        if (quantize(block, quantizer, levels, nonzero + k)) {
            coded |= 1u << k;
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
    return code_residual<1, 4>(src, stride, pred, quantizer, nullptr, coefs, scan, nonzero);
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

void reconstruct_8x8(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                     ptrdiff_t stride) {
    reconstruct_blocks(4, coefs, mask, pred, 8, dst, stride);
}

void reconstruct_4x4(const int16_t* coefs, const uint8_t* pred, uint8_t* dst, ptrdiff_t stride) {
    reconstruct_block(coefs, pred, 4, dst, stride);
}

// ---- Features and distortions of the intra decisions ----

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

// ---- Deblocking ----

// Whether a line of samples across an edge is filtered at all: clause 8.7.2.2, filterSamplesFlag.
bool line_is_filtered(int p1, int p0, int q0, int q1, int alpha, int beta) {
    return std::abs(p0 - q0) < alpha && std::abs(p1 - p0) < beta && std::abs(q1 - q0) < beta;
}

// One line of a luma edge, clause 8.7.2.3; q is its first q sample, samples are step apart.
void filter_luma_line(uint8_t* q, ptrdiff_t step, int alpha, int beta, int tc0) {
    const int p2 = q[-3 * step], p1 = q[-2 * step], p0 = q[-step];
    const int q0 = q[0], q1 = q[step], q2 = q[2 * step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const bool ap = std::abs(p2 - p0) < beta;
    const bool aq = std::abs(q2 - q0) < beta;
    const int tc = tc0 + (ap ? 1 : 0) + (aq ? 1 : 0);
    const int delta = std::clamp(((q0 - p0) * 4 + (p1 - q1) + 4) >> 3, -tc, tc);
    q[-step] = clip_sample(p0 + delta);
    q[0] = clip_sample(q0 - delta);
    const int average = (p0 + q0 + 1) >> 1;
    if (ap) {
        q[-2 * step] =
            static_cast<uint8_t>(p1 + std::clamp((p2 + average - 2 * p1) >> 1, -tc0, tc0));
    }
    if (aq) {
        q[step] = static_cast<uint8_t>(q1 + std::clamp((q2 + average - 2 * q1) >> 1, -tc0, tc0));
    }
}

void filter_chroma_line(uint8_t* q, ptrdiff_t step, int alpha, int beta, int tc0) {
    const int p1 = q[-2 * step], p0 = q[-step], q0 = q[0], q1 = q[step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const int tc = tc0 + 1;
    const int delta = std::clamp(((q0 - p0) * 4 + (p1 - q1) + 4) >> 3, -tc, tc);
    q[-step] = clip_sample(p0 + delta);
    q[0] = clip_sample(q0 - delta);
}

// One line of a luma edge with bS 4, clause 8.7.2.4.
void filter_luma_line_strong(uint8_t* q, ptrdiff_t step, int alpha, int beta) {
    const int p3 = q[-4 * step], p2 = q[-3 * step], p1 = q[-2 * step], p0 = q[-step];
    const int q0 = q[0], q1 = q[step], q2 = q[2 * step], q3 = q[3 * step];
    if (!line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        return;
    }
    const bool small_gap = std::abs(p0 - q0) < (alpha >> 2) + 2;
    if (small_gap && std::abs(q2 - q0) < beta) {
        q[0] = static_cast<uint8_t>((p1 + 2 * p0 + 2 * q0 + 2 * q1 + q2 + 4) >> 3);
        q[step] = static_cast<uint8_t>((p0 + q0 + q1 + q2 + 2) >> 2);
        q[2 * step] = static_cast<uint8_t>((2 * q3 + 3 * q2 + q1 + q0 + p0 + 4) >> 3);
    } else {
        q[0] = static_cast<uint8_t>((2 * q1 + q0 + p1 + 2) >> 2);
    }
    if (small_gap && std::abs(p2 - p0) < beta) {
        q[-step] = static_cast<uint8_t>((q1 + 2 * q0 + 2 * p0 + 2 * p1 + p2 + 4) >> 3);
        q[-2 * step] = static_cast<uint8_t>((q0 + p0 + p1 + p2 + 2) >> 2);
        q[-3 * step] = static_cast<uint8_t>((2 * p3 + 3 * p2 + p1 + p0 + q0 + 4) >> 3);
    } else {
        q[-step] = static_cast<uint8_t>((2 * p1 + p0 + q1 + 2) >> 2);
    }
}

void filter_chroma_line_strong(uint8_t* q, ptrdiff_t step, int alpha, int beta) {
    const int p1 = q[-2 * step], p0 = q[-step], q0 = q[0], q1 = q[step];
    if (line_is_filtered(p1, p0, q0, q1, alpha, beta)) {
        q[0] = static_cast<uint8_t>((2 * q1 + q0 + p1 + 2) >> 2);
        q[-step] = static_cast<uint8_t>((2 * p1 + p0 + q1 + 2) >> 2);
    }
}

// An edge of four segments: `across` leads from one sample of a line to the next, `along` from one
// line to the next.
template <typename FilterLine>
void filter_edge(uint8_t* pix, ptrdiff_t along, ptrdiff_t across, int lines_per_segment, int alpha,
                 int beta, const int8_t* tc0, uint32_t strengths, FilterLine filter_line) {
    for (int line = 0; line < 4 * lines_per_segment; ++line) {
        const int segment_tc0 = tc0[strengths >> (8 * (line / lines_per_segment)) & 0xff];
        if (segment_tc0 >= 0) {
            filter_line(pix + line * along, across, alpha, beta, segment_tc0);
        }
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    filter_edge(pix, stride, 1, 4, alpha, beta, tc0, strengths, filter_luma_line);
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    filter_edge(pix, 1, stride, 4, alpha, beta, tc0, strengths, filter_luma_line);
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    filter_edge(u, stride, 1, 2, alpha, beta, tc0, strengths, filter_chroma_line);
    filter_edge(v, stride, 1, 2, alpha, beta, tc0, strengths, filter_chroma_line);
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    filter_edge(u, 1, stride, 2, alpha, beta, tc0, strengths, filter_chroma_line);
    filter_edge(v, 1, stride, 2, alpha, beta, tc0, strengths, filter_chroma_line);
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 16; ++line) {
        filter_luma_line_strong(pix + line * stride, 1, alpha, beta);
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 16; ++line) {
        filter_luma_line_strong(pix + line, stride, alpha, beta);
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    for (int line = 0; line < 8; ++line) {
        filter_chroma_line_strong(u + line * stride, 1, alpha, beta);
        filter_chroma_line_strong(v + line * stride, 1, alpha, beta);
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    for (int line = 0; line < 8; ++line) {
        filter_chroma_line_strong(u + line, stride, alpha, beta);
        filter_chroma_line_strong(v + line, stride, alpha, beta);
    }
}

}  // namespace

const Kernels& scalar_kernels() {
    static const Kernels table = {
        "scalar",
        arrange_block,
        phase_sads,
        phase_sads_average,
        first_phases_below<4>,
        first_phases_below_half,
        averages_below<8>,
        first_phases_below_cross,
        extend_edges,
        half_vertical_row,
        half_horizontal_row,
        copy_16x16,
        average_16x16,
        centre_16x16,
        chroma_8x8,
        code_residual<16, 16>,
        code_residual<4, 8>,
        code_residual_4x4,
        reconstruct_16x16,
        reconstruct_8x8,
        reconstruct_4x4,
        block_sums,
        hadamard_energy,
        phase_sad_16x16,
        phase_satd_8x8,
        phase_satd_4x4,
        intra_4x4_modes,
        deblock_luma_vertical,
        deblock_luma_horizontal,
        deblock_chroma_vertical,
        deblock_chroma_horizontal,
        deblock_luma_vertical_strong,
        deblock_luma_horizontal_strong,
        deblock_chroma_vertical_strong,
        deblock_chroma_horizontal_strong,
        scalar_rgb32_rows_to_iyuv,
        scalar_rgb24_rows_to_iyuv,
        scalar_ayuv_rows_to_iyuv,
        scalar_yuy2_rows_to_iyuv,
    };
    return table;
}

}  // namespace zolt
