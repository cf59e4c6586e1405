#include <emmintrin.h>

#include <cstring>
#include <initializer_list>

#include "kernels/deblock_simd.h"
#include "kernels/predict_4x4.h"
#include "kernels/x86_tables.h"
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

__m128i load(const void* p) {
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}
__m128i load_aligned(const void* p) {
    return _mm_load_si128(static_cast<const __m128i*>(p));
}
__m128i load_8(const void* p) {
    return _mm_loadl_epi64(static_cast<const __m128i*>(p));
}
__m128i load_4(const void* p) {
    int32_t value;
    std::memcpy(&value, p, sizeof value);
    return _mm_cvtsi32_si128(value);
}
void store(void* p, __m128i v) {
    _mm_storeu_si128(static_cast<__m128i*>(p), v);
}
void store_8(void* p, __m128i v) {
    _mm_storel_epi64(static_cast<__m128i*>(p), v);
}
void store_4(void* p, __m128i v) {
    const int32_t value = _mm_cvtsi128_si32(v);
    std::memcpy(p, &value, sizeof value);
}

__m128i widen_low(__m128i samples) {
    return _mm_unpacklo_epi8(samples, _mm_setzero_si128());
}
__m128i widen_high(__m128i samples) {
    return _mm_unpackhi_epi8(samples, _mm_setzero_si128());
}
__m128i absolute_16(__m128i v) {
    return _mm_max_epi16(v, _mm_sub_epi16(_mm_setzero_si128(), v));
}
__m128i absolute_32(__m128i v) {
    const __m128i sign = _mm_srai_epi32(v, 31);
    return _mm_sub_epi32(_mm_xor_si128(v, sign), sign);
}

// ---- Distortion of the motion search ----

__m128i even_columns() {
    return _mm_set1_epi16(0x00ff);
}

// A checkerboard row from an even row and the odd row below it.
__m128i checkerboard(__m128i even, __m128i odd) {
    return _mm_or_si128(_mm_and_si128(even, even_columns()), _mm_andnot_si128(even_columns(), odd));
}
__m128i checkerboard(const uint8_t* row, ptrdiff_t stride) {
    return checkerboard(load(row), load(row + stride));
}

// Where row n of an arranged block's samples and of its checkerboard stands.
constexpr int block_row(int n) {
    return 32 * (n & 7) + 16 * (n >> 3);
}
constexpr int checkerboard_row(int n) {
    return 256 + 32 * (n & 3) + 16 * (n >> 2);
}

void arrange_block(const uint8_t* src, ptrdiff_t stride, uint8_t* block) {
    for (int n = 0; n < 8; ++n) {
        const __m128i even = load(src + 2 * n * stride);
        const __m128i odd = load(src + (2 * n + 1) * stride);
        store(block + block_row(2 * n), even);
        store(block + block_row(2 * n + 1), odd);
        store(block + checkerboard_row(n), checkerboard(even, odd));
    }
}

int add_halves(__m128i sum) {
    return _mm_cvtsi128_si32(_mm_add_epi32(sum, _mm_srli_si128(sum, 8)));
}

// row(n): row n of what the block is compared with.
template <typename Row>
void add_phases(const uint8_t* block, Row row, int* sums) {
    __m128i all[2], even[2];  // all and the even columns, of even and of odd rows
    for (int parity = 0; parity < 2; ++parity) {
        all[parity] = even[parity] = _mm_setzero_si128();
        for (int n = parity; n < 16; n += 2) {
            const __m128i a = load_aligned(block + block_row(n));
            const __m128i b = row(n);
            all[parity] = _mm_add_epi32(all[parity], _mm_sad_epu8(a, b));
            even[parity] = _mm_add_epi32(
                even[parity],
                _mm_sad_epu8(_mm_and_si128(a, even_columns()), _mm_and_si128(b, even_columns())));
        }
    }
    sums[0] = add_halves(even[0]);
    sums[2] = sums[0] + add_halves(all[1]);
    sums[1] = sums[2] - add_halves(even[1]);
    sums[3] = add_halves(all[0]) + sums[2] - sums[0];
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(
        block, [=](int n) { return load(ref + n * stride); }, sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(
        block, [=](int n) { return _mm_avg_epu8(load(a + n * stride), load(b + n * stride)); },
        sums);
}

// Whether the SAD of the checkerboard and rows(n), row n of another one, is below the limit.
template <typename Rows>
bool first_phases_below(const uint8_t* block, Rows rows, int32_t limit) {
    __m128i sum = _mm_setzero_si128();
    for (int n = 0; n < 8; ++n) {
        sum = _mm_add_epi32(sum, _mm_sad_epu8(load_aligned(block + checkerboard_row(n)), rows(n)));
    }
    return add_halves(sum) < limit;
}

template <int kCount>
uint32_t first_phases_below(const uint8_t* block, const uint8_t* const* refs, ptrdiff_t stride,
                            const int32_t* limits) {
    uint32_t below = 0;
    for (int i = 0; i < kCount; ++i) {
        const auto rows = [=](int n) { return checkerboard(refs[i] + 2 * n * stride, stride); };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

uint32_t first_phases_below_half(const uint8_t* block, const HalfSamples& at, ptrdiff_t stride,
                                 const int32_t* limits) {
    const uint8_t* refs[8];
    half_candidates(at, stride, refs);
    return first_phases_below<8>(block, refs, stride, limits);
}

void gather_checkerboard(const uint8_t* src, ptrdiff_t stride, __m128i* rows) {
    for (int n = 0; n < 8; ++n) {
        rows[n] = checkerboard(src + 2 * n * stride, stride);
    }
}

uint32_t first_phases_below_star(const uint8_t* block, const uint8_t* centre,
                                 const uint8_t* const* refs, ptrdiff_t stride,
                                 const int32_t* limits) {
    __m128i c[8];
    gather_checkerboard(centre, stride, c);
    uint32_t below = 0;
    for (int i = 0; i < 8; ++i) {
        const auto rows = [&](int n) {
            return _mm_avg_epu8(c[n], checkerboard(refs[i] + 2 * n * stride, stride));
        };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    __m128i boards[5][8];  // the four, and the centre
    for (int i = 0; i < 4; ++i) {
        gather_checkerboard(refs[i], stride, boards[i]);
    }
    gather_checkerboard(centre, stride, boards[4]);
    uint32_t below = 0;
    for (int i = 0; i < 8; ++i) {
        const __m128i* a = boards[i < 4 ? 4 : kCrossPairs[i - 4][0]];
        const __m128i* b = boards[i < 4 ? i : kCrossPairs[i - 4][1]];
        const auto rows = [=](int n) { return _mm_avg_epu8(a[n], b[n]); };
        below |= uint32_t{first_phases_below(block, rows, limits[i])} << i;
    }
    return below;
}

// ---- Reference planes ----

// (E - 5F + 20G + 20H - 5I + J + 16) >> 5 in 16-bit lanes.
__m128i half_sample(__m128i outer, __m128i middle, __m128i inner) {
    const __m128i t = _mm_sub_epi16(_mm_slli_epi16(inner, 2), middle);  // 4 * inner - middle
    const __m128i sum = _mm_add_epi16(_mm_add_epi16(outer, t), _mm_slli_epi16(t, 2));
    return _mm_srai_epi16(_mm_add_epi16(sum, _mm_set1_epi16(16)), 5);
}

// 16 half samples between p[0] and p[step].
__m128i half_samples(const uint8_t* p, ptrdiff_t step) {
    const __m128i e = load(p - 2 * step), f = load(p - step), g = load(p);
    const __m128i h = load(p + step), i = load(p + 2 * step), j = load(p + 3 * step);
    const __m128i low = half_sample(_mm_add_epi16(widen_low(e), widen_low(j)),
                                    _mm_add_epi16(widen_low(f), widen_low(i)),
                                    _mm_add_epi16(widen_low(g), widen_low(h)));
    const __m128i high = half_sample(_mm_add_epi16(widen_high(e), widen_high(j)),
                                     _mm_add_epi16(widen_high(f), widen_high(i)),
                                     _mm_add_epi16(widen_high(g), widen_high(h)));
    return _mm_packus_epi16(low, high);
}

// A row of count >= 16 half samples; the last step overlaps the one before it.
void half_row(const uint8_t* src, ptrdiff_t step, uint8_t* dst, int count) {
    for (int x = 0; x < count - 16; x += 16) {
        store(dst + x, half_samples(src + x, step));
    }
    store(dst + count - 16, half_samples(src + count - 16, step));
}

void half_vertical_row(const uint8_t* src, ptrdiff_t stride, uint8_t* dst, int count) {
    if (count < 16) {
        scalar_kernels().half_vertical_row(src, stride, dst, count);
        return;
    }
    half_row(src, stride, dst, count);
}

void half_horizontal_row(const uint8_t* src, uint8_t* dst, int count) {
    if (count < 16) {
        scalar_kernels().half_horizontal_row(src, dst, count);
        return;
    }
    half_row(src, 1, dst, count);
}

// ---- Inter prediction ----

void copy_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    for (int y = 0; y < 16; ++y) {
        store(pred + 16 * y, load(src + y * stride));
    }
}

void average_16x16(uint8_t* pred, const uint8_t* a, ptrdiff_t a_stride, const uint8_t* b,
                   ptrdiff_t b_stride) {
    for (int y = 0; y < 16; ++y) {
        store(pred + 16 * y, _mm_avg_epu8(load(a + y * a_stride), load(b + y * b_stride)));
    }
}

// Unrounded vertical sums of 8 samples.
__m128i vertical_sums(const uint8_t* p, ptrdiff_t stride) {
    const __m128i outer =
        _mm_add_epi16(widen_low(load_8(p - 2 * stride)), widen_low(load_8(p + 3 * stride)));
    const __m128i middle =
        _mm_add_epi16(widen_low(load_8(p - stride)), widen_low(load_8(p + 2 * stride)));
    const __m128i inner = _mm_add_epi16(widen_low(load_8(p)), widen_low(load_8(p + stride)));
    const __m128i t = _mm_sub_epi16(_mm_slli_epi16(inner, 2), middle);
    return _mm_add_epi16(_mm_add_epi16(outer, t), _mm_slli_epi16(t, 2));
}

// (outer - 5 * middle + 20 * inner + 512) >> 10 with 32-bit sums.
__m128i centre_samples(__m128i outer, __m128i middle, __m128i inner) {
    const __m128i ones = _mm_set1_epi16(1);
    const __m128i outer_middle = _mm_set1_epi32(static_cast<int>(0xfffb0001u));  // 1, -5
    const __m128i inner_rounding = _mm_set1_epi32(512 << 16 | 20);
    const __m128i low =
        _mm_add_epi32(_mm_madd_epi16(_mm_unpacklo_epi16(outer, middle), outer_middle),
                      _mm_madd_epi16(_mm_unpacklo_epi16(inner, ones), inner_rounding));
    const __m128i high =
        _mm_add_epi32(_mm_madd_epi16(_mm_unpackhi_epi16(outer, middle), outer_middle),
                      _mm_madd_epi16(_mm_unpackhi_epi16(inner, ones), inner_rounding));
    return _mm_packs_epi32(_mm_srai_epi32(low, 10), _mm_srai_epi32(high, 10));
}

void centre_16x16(uint8_t* pred, const uint8_t* src, ptrdiff_t stride) {
    alignas(16) int16_t sums[24];  // columns -2..21, of which the last three are not used
    for (int y = 0; y < 16; ++y) {
        const uint8_t* row = src + y * stride - 2;
        _mm_store_si128(reinterpret_cast<__m128i*>(sums), vertical_sums(row, stride));
        _mm_store_si128(reinterpret_cast<__m128i*>(sums + 8), vertical_sums(row + 8, stride));
        store(sums + 13, vertical_sums(row + 13, stride));
        __m128i half[2];
        for (int x = 0; x < 2; ++x) {
            const int16_t* s = sums + 8 * x;
            half[x] = centre_samples(_mm_add_epi16(load(s), load(s + 5)),
                                     _mm_add_epi16(load(s + 1), load(s + 4)),
                                     _mm_add_epi16(load(s + 2), load(s + 3)));
        }
        store(pred + 16 * y, _mm_packus_epi16(half[0], half[1]));
    }
}

void chroma_component(uint8_t* pred, const uint8_t* src, ptrdiff_t stride, int fx, int fy) {
    const __m128i left = _mm_set1_epi16(static_cast<short>(8 - fx));
    const __m128i right = _mm_set1_epi16(static_cast<short>(fx));
    const __m128i upper_weight = _mm_set1_epi16(static_cast<short>(8 - fy));
    const __m128i lower_weight = _mm_set1_epi16(static_cast<short>(fy));
    // Column 8 is read only through the 8 samples that start at column 1.
    const auto horizontal = [&](const uint8_t* row) {
        return _mm_add_epi16(_mm_mullo_epi16(widen_low(load_8(row)), left),
                             _mm_mullo_epi16(widen_low(load_8(row + 1)), right));
    };
    __m128i upper = horizontal(src);
    for (int y = 0; y < 8; ++y) {
        const __m128i lower = horizontal(src + (y + 1) * stride);
        const __m128i sum = _mm_add_epi16(_mm_mullo_epi16(upper, upper_weight),
                                          _mm_mullo_epi16(lower, lower_weight));
        const __m128i rounded = _mm_srli_epi16(_mm_add_epi16(sum, _mm_set1_epi16(32)), 6);
        store_8(pred + 8 * y, _mm_packus_epi16(rounded, rounded));
        upper = lower;
    }
}

void chroma_8x8(uint8_t* pred, const uint8_t* u, const uint8_t* v, ptrdiff_t stride, int fx,
                int fy) {
    chroma_component(pred, u, stride, fx, fy);
    chroma_component(pred + 64, v, stride, fx, fy);
}

// ---- Residual ----

// Forward core transform across four vectors.
void forward_butterfly(__m128i* v) {
    const __m128i s = _mm_add_epi16(v[0], v[3]);
    const __m128i d = _mm_sub_epi16(v[0], v[3]);
    const __m128i t = _mm_add_epi16(v[1], v[2]);
    const __m128i u = _mm_sub_epi16(v[1], v[2]);
    v[0] = _mm_add_epi16(s, t);
    v[1] = _mm_add_epi16(_mm_add_epi16(d, d), u);
    v[2] = _mm_sub_epi16(s, t);
    v[3] = _mm_sub_epi16(d, _mm_add_epi16(u, u));
}

// Inverse core transform across four vectors.
void inverse_butterfly(__m128i* v) {
    const __m128i e = _mm_add_epi16(v[0], v[2]);
    const __m128i f = _mm_sub_epi16(v[0], v[2]);
    const __m128i g = _mm_sub_epi16(_mm_srai_epi16(v[1], 1), v[3]);
    const __m128i h = _mm_add_epi16(v[1], _mm_srai_epi16(v[3], 1));
    v[0] = _mm_add_epi16(e, h);
    v[1] = _mm_add_epi16(f, g);
    v[2] = _mm_sub_epi16(f, g);
    v[3] = _mm_sub_epi16(e, h);
}

// Transposes the two 4x4 blocks that stand side by side in four vectors.
void transpose_two(__m128i* v) {
    const __m128i a = _mm_unpacklo_epi16(v[0], v[1]);
    const __m128i b = _mm_unpackhi_epi16(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi16(v[2], v[3]);
    const __m128i d = _mm_unpackhi_epi16(v[2], v[3]);
    const __m128i first_01 = _mm_unpacklo_epi32(a, c);
    const __m128i first_23 = _mm_unpackhi_epi32(a, c);
    const __m128i second_01 = _mm_unpacklo_epi32(b, d);
    const __m128i second_23 = _mm_unpackhi_epi32(b, d);
    v[0] = _mm_unpacklo_epi64(first_01, second_01);
    v[1] = _mm_unpackhi_epi64(first_01, second_01);
    v[2] = _mm_unpacklo_epi64(first_23, second_23);
    v[3] = _mm_unpackhi_epi64(first_23, second_23);
}

// Sample offsets of the pair of blocks 2n, 2n + 1 in decoding order (Figure 6-10).
constexpr int pair_x(int n) {
    return 8 * (n >> 1 & 1);
}
constexpr int pair_y(int n) {
    return 4 * (n & 1) + 8 * (n >> 2);
}

// Levels and scaled coefficients of eight coefficients.
void quantize_eight(__m128i c, const int16_t* forward, const int16_t* dequant, __m128i rounding,
                    __m128i shift, __m128i* levels, __m128i* scaled) {
    const __m128i magnitude = absolute_16(c);
    const __m128i factor = load_aligned(forward);
    const __m128i low = _mm_mullo_epi16(magnitude, factor);
    const __m128i high = _mm_mulhi_epu16(magnitude, factor);
    const __m128i first =
        _mm_srl_epi32(_mm_add_epi32(_mm_unpacklo_epi16(low, high), rounding), shift);
    const __m128i second =
        _mm_srl_epi32(_mm_add_epi32(_mm_unpackhi_epi16(low, high), rounding), shift);
    const __m128i level = _mm_min_epi16(_mm_packs_epi32(first, second), _mm_set1_epi16(kMaxLevel));
    const __m128i sign = _mm_srai_epi16(c, 15);
    *levels = _mm_sub_epi16(_mm_xor_si128(level, sign), sign);
    *scaled = _mm_mullo_epi16(*levels, load_aligned(dequant));
}

// Quantises a block that has a coefficient beyond the dead zone; returns the mask of its levels.
uint16_t quantize_block(__m128i c0, __m128i c1, const Quantizer& quantizer, int16_t* coefs,
                        int16_t* scan) {
    const __m128i rounding = _mm_set1_epi32(quantizer.rounding);
    const __m128i shift = _mm_cvtsi32_si128(quantizer.shift);
    alignas(16) int16_t levels[16];
    __m128i level0, level1, scaled0, scaled1;
    quantize_eight(c0, quantizer.forward, quantizer.dequant, rounding, shift, &level0, &scaled0);
    quantize_eight(c1, quantizer.forward + 8, quantizer.dequant + 8, rounding, shift, &level1,
                   &scaled1);
    store(levels, level0);
    store(levels + 8, level1);
    store(coefs, scaled0);
    store(coefs + 8, scaled1);
    for (int n = 0; n < 16; ++n) {
        scan[n] = levels[kZigzag[n]];
    }
    const __m128i zeros =
        _mm_cmpeq_epi8(_mm_packs_epi16(load(scan), load(scan + 8)), _mm_setzero_si128());
    return static_cast<uint16_t>(~_mm_movemask_epi8(zeros));
}

// Whether a level of the block is not 0.
bool leaves_dead_zone(__m128i c0, __m128i c1, const Quantizer& quantizer) {
    const __m128i beyond =
        _mm_or_si128(_mm_cmpgt_epi16(absolute_16(c0), load_aligned(quantizer.dead_zone)),
                     _mm_cmpgt_epi16(absolute_16(c1), load_aligned(quantizer.dead_zone + 8)));
    return _mm_movemask_epi8(beyond) != 0;
}

void clear_block(int16_t* block) {
    store(block, _mm_setzero_si128());
    store(block + 8, _mm_setzero_si128());
}

// Codes two blocks side by side; dc, coefs, scan and nonzero are those of the first. Returns the
// mask of the coded ones.
uint32_t code_two(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred, ptrdiff_t pred_stride,
                  const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                  uint16_t* nonzero) {
    __m128i v[4];
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm_sub_epi16(widen_low(load_8(src + y * stride)),
                             widen_low(load_8(pred + y * pred_stride)));
    }
    forward_butterfly(v);
    transpose_two(v);
    forward_butterfly(v);
    if (dc) {
        dc[0] = static_cast<int16_t>(_mm_extract_epi16(v[0], 0));
        dc[1] = static_cast<int16_t>(_mm_extract_epi16(v[0], 4));
        v[0] = _mm_and_si128(v[0], _mm_set1_epi64x(~0xffffLL));
    }
    const __m128i blocks[2][2] = {{_mm_unpacklo_epi64(v[0], v[1]), _mm_unpacklo_epi64(v[2], v[3])},
                                  {_mm_unpackhi_epi64(v[0], v[1]), _mm_unpackhi_epi64(v[2], v[3])}};
    uint32_t coded = 0;
    for (int b = 0; b < 2; ++b) {
        if (leaves_dead_zone(blocks[b][0], blocks[b][1], quantizer)) {
            coded |= 1u << b;
            nonzero[b] = quantize_block(blocks[b][0], blocks[b][1], quantizer, coefs + 16 * b,
                                        scan + 16 * b);
        } else {
            nonzero[b] = 0;
            if (dc) {
                clear_block(coefs + 16 * b);
            }
        }
    }
    return coded;
}

uint32_t code_residual_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                             const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                             uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int n = 0; n < 8; ++n) {
        coded |= code_two(src + pair_y(n) * stride + pair_x(n), stride,
                          pred + pair_y(n) * 16 + pair_x(n), 16, quantizer,
                          dc ? dc + 2 * n : nullptr, coefs + 32 * n, scan + 32 * n, nonzero + 2 * n)
                 << (2 * n);
    }
    return coded;
}

uint32_t code_residual_8x8(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* dc, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    uint32_t coded = 0;
    for (int n = 0; n < 2; ++n) {
        coded |= code_two(src + 4 * n * stride, stride, pred + 32 * n, 8, quantizer,
                          dc ? dc + 2 * n : nullptr, coefs + 32 * n, scan + 32 * n, nonzero + 2 * n)
                 << (2 * n);
    }
    return coded;
}

uint32_t code_residual_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                           const Quantizer& quantizer, int16_t* coefs, int16_t* scan,
                           uint16_t* nonzero) {
    __m128i v[4];
    for (int y = 0; y < 4; ++y) {
        v[y] = _mm_sub_epi16(widen_low(load_4(src + y * stride)), widen_low(load_4(pred + 4 * y)));
    }
    forward_butterfly(v);
    transpose_two(v);
    forward_butterfly(v);
    const __m128i c0 = _mm_unpacklo_epi64(v[0], v[1]), c1 = _mm_unpacklo_epi64(v[2], v[3]);
    if (!leaves_dead_zone(c0, c1, quantizer)) {
        *nonzero = 0;
        return 0;
    }
    *nonzero = quantize_block(c0, c1, quantizer, coefs, scan);
    return 1;
}

// Whether 16-bit sums are exact for a block: no sum of the inverse transform, rounding included,
// exceeds the sum of the magnitudes.
bool fits_16_bits(const int16_t* coefs) {
    constexpr int kLargestSum = 32767 - 32;
    const __m128i ones = _mm_set1_epi16(1);
    __m128i sum = _mm_add_epi32(_mm_madd_epi16(absolute_16(load_aligned(coefs)), ones),
                                _mm_madd_epi16(absolute_16(load_aligned(coefs + 8)), ones));
    sum = _mm_add_epi32(sum, _mm_srli_si128(sum, 8));
    sum = _mm_add_epi32(sum, _mm_srli_si128(sum, 4));
    return _mm_cvtsi128_si32(sum) <= kLargestSum;
}

// Rows of the residual of two blocks side by side.
void inverse_two(const int16_t* first, const int16_t* second, __m128i* rows) {
    const __m128i first_01 = load_aligned(first), first_23 = load_aligned(first + 8);
    const __m128i second_01 = load_aligned(second), second_23 = load_aligned(second + 8);
    rows[0] = _mm_unpacklo_epi64(first_01, second_01);
    rows[1] = _mm_unpackhi_epi64(first_01, second_01);
    rows[2] = _mm_unpacklo_epi64(first_23, second_23);
    rows[3] = _mm_unpackhi_epi64(first_23, second_23);
    inverse_butterfly(rows);
    transpose_two(rows);
    inverse_butterfly(rows);
    for (int y = 0; y < 4; ++y) {
        rows[y] = _mm_srai_epi16(_mm_add_epi16(rows[y], _mm_set1_epi16(32)), 6);
    }
}

alignas(16) constexpr int16_t kNoCoefs[16] = {};

// Two blocks side by side; bits 0 and 1 of mask. Returns false when 16 bits are not enough.
bool reconstruct_two(const int16_t* coefs, uint32_t mask, const uint8_t* pred,
                     ptrdiff_t pred_stride, uint8_t* dst, ptrdiff_t stride) {
    if ((mask & 3) == 0) {
        for (int y = 0; y < 4; ++y) {
            store_8(dst + y * stride, load_8(pred + y * pred_stride));
        }
        return true;
    }
    const int16_t* first = mask & 1 ? coefs : kNoCoefs;
    const int16_t* second = mask & 2 ? coefs + 16 : kNoCoefs;
    if (!fits_16_bits(first) || !fits_16_bits(second)) {
        return false;
    }
    __m128i rows[4];
    inverse_two(first, second, rows);
    for (int y = 0; y < 4; ++y) {
        const __m128i sum = _mm_add_epi16(rows[y], widen_low(load_8(pred + y * pred_stride)));
        store_8(dst + y * stride, _mm_packus_epi16(sum, sum));
    }
    return true;
}

void reconstruct_16x16(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                       ptrdiff_t stride) {
    for (int n = 0; n < 8; ++n) {
        if (!reconstruct_two(coefs + 32 * n, mask >> (2 * n), pred + pair_y(n) * 16 + pair_x(n), 16,
                             dst + pair_y(n) * stride + pair_x(n), stride)) {
            scalar_kernels().reconstruct_16x16(coefs, mask, pred, dst, stride);
            return;
        }
    }
}

void reconstruct_8x8(const int16_t* coefs, uint32_t mask, const uint8_t* pred, uint8_t* dst,
                     ptrdiff_t stride) {
    for (int n = 0; n < 2; ++n) {
        if (!reconstruct_two(coefs + 32 * n, mask >> (2 * n), pred + 32 * n, 8,
                             dst + 4 * n * stride, stride)) {
            scalar_kernels().reconstruct_8x8(coefs, mask, pred, dst, stride);
            return;
        }
    }
}

void reconstruct_4x4(const int16_t* coefs, const uint8_t* pred, uint8_t* dst, ptrdiff_t stride) {
    if (!fits_16_bits(coefs)) {
        scalar_kernels().reconstruct_4x4(coefs, pred, dst, stride);
        return;
    }
    __m128i rows[4];
    inverse_two(coefs, kNoCoefs, rows);
    for (int y = 0; y < 4; ++y) {
        const __m128i sum = _mm_add_epi16(rows[y], widen_low(load_4(pred + 4 * y)));
        store_4(dst + y * stride, _mm_packus_epi16(sum, sum));
    }
}

// ---- Features and distortions of the intra decisions ----

void block_sums(const uint8_t* src, ptrdiff_t stride, int32_t* sums) {
    const __m128i zero = _mm_setzero_si128();
    const __m128i ones = _mm_set1_epi16(1);
    for (int block_row = 0; block_row < 4; ++block_row, src += 4 * stride) {
        __m128i low = zero;
        __m128i high = zero;
        for (int y = 0; y < 4; ++y) {
            const __m128i samples = load(src + y * stride);
            low = _mm_add_epi16(low, widen_low(samples));
            high = _mm_add_epi16(high, widen_high(samples));
        }
        // Sums of two columns each, then of four.
        const __m128i pairs =
            _mm_packs_epi32(_mm_madd_epi16(low, ones), _mm_madd_epi16(high, ones));
        store(sums + 4 * block_row, _mm_madd_epi16(pairs, ones));
    }
}

// 4-point Hadamard transform across four vectors.
void hadamard(__m128i* v) {
    const __m128i a = _mm_add_epi32(v[0], v[1]);
    const __m128i b = _mm_sub_epi32(v[0], v[1]);
    const __m128i c = _mm_add_epi32(v[2], v[3]);
    const __m128i d = _mm_sub_epi32(v[2], v[3]);
    v[0] = _mm_add_epi32(a, c);
    v[1] = _mm_add_epi32(b, d);
    v[2] = _mm_sub_epi32(a, c);
    v[3] = _mm_sub_epi32(b, d);
}

void hadamard_energy(const int32_t* values, int32_t* energy) {
    __m128i v[4];
    for (int i = 0; i < 4; ++i) {
        v[i] = load(values + 4 * i);
    }
    hadamard(v);
    const __m128i a = _mm_unpacklo_epi32(v[0], v[1]);
    const __m128i b = _mm_unpackhi_epi32(v[0], v[1]);
    const __m128i c = _mm_unpacklo_epi32(v[2], v[3]);
    const __m128i d = _mm_unpackhi_epi32(v[2], v[3]);
    v[0] = _mm_unpacklo_epi64(a, c);
    v[1] = _mm_unpackhi_epi64(a, c);
    v[2] = _mm_unpacklo_epi64(b, d);
    v[3] = _mm_unpackhi_epi64(b, d);
    hadamard(v);  // now vector j holds horizontal frequency j, lane i vertical frequency i
    for (__m128i& row : v) {
        row = _mm_srli_epi32(_mm_add_epi32(absolute_32(row), _mm_set1_epi32(8)), 4);
    }
    const __m128i others = _mm_add_epi32(_mm_add_epi32(v[1], v[2]), v[3]);
    const __m128i low = _mm_unpacklo_epi32(v[0], others);   // lanes 0 of both, lanes 1 of both
    const __m128i high = _mm_unpackhi_epi32(v[0], others);  // lanes 2, lanes 3
    const __m128i sums =
        _mm_add_epi32(_mm_add_epi32(_mm_srli_si128(low, 8), high), _mm_srli_si128(high, 8));
    store(energy, _mm_unpacklo_epi64(low, sums));
}

void phase_sad_16x16(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                     int32_t* distortion) {
    const __m128i zero = _mm_setzero_si128();
    for (int y = 0; y < 4; ++y) {
        __m128i sum = zero;
        for (int row = y; row < 16; row += 4) {
            const __m128i a = load(src + row * stride);
            const __m128i b = load(pred + 16 * row);
            const __m128i difference = _mm_or_si128(_mm_subs_epu8(a, b), _mm_subs_epu8(b, a));
            sum = _mm_add_epi16(sum, _mm_add_epi16(widen_low(difference), widen_high(difference)));
        }
        sum = _mm_add_epi16(sum, _mm_srli_si128(sum, 8));
        store(distortion + 4 * y, _mm_unpacklo_epi16(sum, zero));
    }
}

void phase_satd_8x8(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    const __m128i zero = _mm_setzero_si128();
    const auto difference = [&](int y) {
        return _mm_sub_epi16(widen_low(load_8(src + y * stride)), widen_low(load_8(pred + 8 * y)));
    };
    for (int y = 0; y < 4; ++y) {
        const __m128i upper = difference(y);
        const __m128i lower = difference(y + 4);
        const __m128i sums = absolute_16(_mm_add_epi16(upper, lower));
        const __m128i differences = absolute_16(_mm_sub_epi16(upper, lower));
        // |a + b| + |a - b| = 2 max(|a|, |b|), a and b four columns apart.
        const __m128i largest =
            _mm_add_epi16(_mm_max_epi16(sums, _mm_srli_si128(sums, 8)),
                          _mm_max_epi16(differences, _mm_srli_si128(differences, 8)));
        store(distortion + 4 * y, _mm_unpacklo_epi16(_mm_add_epi16(largest, largest), zero));
    }
}

// A 4x4 block's rows 0, 1 and 2, 3 in 16-bit lanes.
struct TwoRowPairs {
    __m128i rows_01, rows_23;
};

TwoRowPairs load_4x4(const uint8_t* src, ptrdiff_t stride) {
    return {widen_low(_mm_unpacklo_epi32(load_4(src), load_4(src + stride))),
            widen_low(_mm_unpacklo_epi32(load_4(src + 2 * stride), load_4(src + 3 * stride)))};
}

// The distortions of the four phases as 16-bit values in the low half.
__m128i phase_satds(const TwoRowPairs& src, const uint8_t* pred) {
    const __m128i rows_01 = _mm_sub_epi16(src.rows_01, widen_low(load_8(pred)));
    const __m128i rows_23 = _mm_sub_epi16(src.rows_23, widen_low(load_8(pred + 8)));
    const __m128i sums = absolute_16(_mm_add_epi16(rows_01, rows_23));
    const __m128i differences = absolute_16(_mm_sub_epi16(rows_01, rows_23));
    // As above, two columns apart: each row is a group of four lanes.
    const __m128i largest =
        _mm_add_epi16(_mm_max_epi16(sums, _mm_srli_epi64(sums, 32)),
                      _mm_max_epi16(differences, _mm_srli_epi64(differences, 32)));
    return _mm_shuffle_epi32(_mm_add_epi16(largest, largest), _MM_SHUFFLE(3, 1, 2, 0));
}

void phase_satd_4x4(const uint8_t* src, ptrdiff_t stride, const uint8_t* pred,
                    int32_t* distortion) {
    const __m128i phases = phase_satds(load_4x4(src, stride), pred);
    store(distortion, _mm_unpacklo_epi16(phases, _mm_setzero_si128()));
}

void intra_4x4_modes(const uint8_t* src, ptrdiff_t stride, const uint8_t* neighbours, int dc,
                     uint8_t* preds, int16_t* distortion) {
    const TwoRowPairs block = load_4x4(src, stride);
    __m128i d[9];
    for (int mode = 0; mode < 9; ++mode) {
        predict_4x4(preds + 16 * mode, neighbours, dc, mode);
        d[mode] = phase_satds(block, preds + 16 * mode);
    }
    const __m128i d01 = _mm_unpacklo_epi16(d[0], d[1]), d23 = _mm_unpacklo_epi16(d[2], d[3]);
    const __m128i d45 = _mm_unpacklo_epi16(d[4], d[5]), d67 = _mm_unpacklo_epi16(d[6], d[7]);
    const __m128i first_low = _mm_unpacklo_epi32(d01, d23),
                  first_high = _mm_unpackhi_epi32(d01, d23);
    const __m128i last_low = _mm_unpacklo_epi32(d45, d67), last_high = _mm_unpackhi_epi32(d45, d67);
    store(distortion, _mm_unpacklo_epi64(first_low, last_low));
    store(distortion + 16, _mm_unpackhi_epi64(first_low, last_low));
    store(distortion + 32, _mm_unpacklo_epi64(first_high, last_high));
    store(distortion + 48, _mm_unpackhi_epi64(first_high, last_high));
    const __m128i first_value = _mm_setr_epi16(-1, 0, 0, 0, 0, 0, 0, 0);
    store(distortion + 8, _mm_and_si128(d[8], first_value));
    store(distortion + 24, _mm_and_si128(_mm_srli_epi64(d[8], 16), first_value));
    store(distortion + 40, _mm_and_si128(_mm_srli_epi64(d[8], 32), first_value));
    store(distortion + 56, _mm_and_si128(_mm_srli_epi64(d[8], 48), first_value));
}

// ---- Deblocking ----

// Eight lines of an edge.
struct Lanes {
    __m128i v;

    static Lanes load(const uint8_t* p) { return {widen_low(load_8(p))}; }
    void store(uint8_t* p) const { store_8(p, _mm_packus_epi16(v, v)); }
    static Lanes splat(int value) { return {_mm_set1_epi16(static_cast<short>(value))}; }

    friend Lanes operator+(Lanes a, Lanes b) { return {_mm_add_epi16(a.v, b.v)}; }
    friend Lanes operator-(Lanes a, Lanes b) { return {_mm_sub_epi16(a.v, b.v)}; }
    friend Lanes operator*(Lanes a, Lanes b) { return {_mm_mullo_epi16(a.v, b.v)}; }
    friend Lanes operator&(Lanes a, Lanes b) { return {_mm_and_si128(a.v, b.v)}; }
    static Lanes andnot(Lanes a, Lanes b) { return {_mm_andnot_si128(a.v, b.v)}; }
    static Lanes less(Lanes a, Lanes b) { return {_mm_cmplt_epi16(a.v, b.v)}; }
    static Lanes min(Lanes a, Lanes b) { return {_mm_min_epi16(a.v, b.v)}; }
    static Lanes max(Lanes a, Lanes b) { return {_mm_max_epi16(a.v, b.v)}; }
    static Lanes average(Lanes a, Lanes b) { return {_mm_avg_epu16(a.v, b.v)}; }
    static Lanes shift_right(Lanes a, int n) { return {_mm_srai_epi16(a.v, n)}; }
    static Lanes absolute_difference(Lanes a, Lanes b) {
        return {absolute_16(_mm_sub_epi16(a.v, b.v))};
    }
    static Lanes select(Lanes mask, Lanes a, Lanes b) {
        return {_mm_or_si128(_mm_and_si128(mask.v, a.v), _mm_andnot_si128(mask.v, b.v))};
    }
    static bool any(Lanes a) { return _mm_movemask_epi8(a.v) != 0; }
};

// Filters on samples in memory: rows[i] is the address of the row of samples p3, p2, p1, p0, q0,
// q1, q2, q3 (chroma: p1, p0, q0, q1), one line a lane. They return false when nothing changed.
bool luma_rows(uint8_t* const* rows, int alpha, int beta, Lanes tc0) {
    Lanes p1 = Lanes::load(rows[2]), p0 = Lanes::load(rows[3]);
    Lanes q0 = Lanes::load(rows[4]), q1 = Lanes::load(rows[5]);
    if (!filter_luma(Lanes::load(rows[1]), p1, p0, q0, q1, Lanes::load(rows[6]), alpha, beta,
                     tc0)) {
        return false;
    }
    p1.store(rows[2]);
    p0.store(rows[3]);
    q0.store(rows[4]);
    q1.store(rows[5]);
    return true;
}

bool luma_rows_strong(uint8_t* const* rows, int alpha, int beta) {
    Lanes p2 = Lanes::load(rows[1]), p1 = Lanes::load(rows[2]), p0 = Lanes::load(rows[3]);
    Lanes q0 = Lanes::load(rows[4]), q1 = Lanes::load(rows[5]), q2 = Lanes::load(rows[6]);
    if (!filter_luma_strong(Lanes::load(rows[0]), p2, p1, p0, q0, q1, q2, Lanes::load(rows[7]),
                            alpha, beta)) {
        return false;
    }
    p2.store(rows[1]);
    p1.store(rows[2]);
    p0.store(rows[3]);
    q0.store(rows[4]);
    q1.store(rows[5]);
    q2.store(rows[6]);
    return true;
}

bool chroma_rows(uint8_t* const* rows, int alpha, int beta, Lanes tc0) {
    Lanes p0 = Lanes::load(rows[1]), q0 = Lanes::load(rows[2]);
    if (!filter_chroma(Lanes::load(rows[0]), p0, q0, Lanes::load(rows[3]), alpha, beta, tc0)) {
        return false;
    }
    p0.store(rows[1]);
    q0.store(rows[2]);
    return true;
}

bool chroma_rows_strong(uint8_t* const* rows, int alpha, int beta) {
    Lanes p0 = Lanes::load(rows[1]), q0 = Lanes::load(rows[2]);
    if (!filter_chroma_strong(Lanes::load(rows[0]), p0, q0, Lanes::load(rows[3]), alpha, beta)) {
        return false;
    }
    p0.store(rows[1]);
    q0.store(rows[2]);
    return true;
}

// tC0 of two luma segments, four lines each, of which the strengths are the lowest ones; of four
// chroma segments, two lines each.
Lanes luma_tc0(const int8_t* tc0, uint32_t strengths) {
    const __m128i segments =
        _mm_set_epi16(0, 0, 0, 0, 0, 0, tc0[strengths >> 8 & 0xff], tc0[strengths & 0xff]);
    const __m128i pairs = _mm_unpacklo_epi16(segments, segments);
    return {_mm_unpacklo_epi32(pairs, pairs)};
}
Lanes chroma_tc0(const int8_t* tc0, uint32_t strengths) {
    const __m128i segments =
        _mm_set_epi16(0, 0, 0, 0, tc0[strengths >> 24], tc0[strengths >> 16 & 0xff],
                      tc0[strengths >> 8 & 0xff], tc0[strengths & 0xff]);
    return {_mm_unpacklo_epi16(segments, segments)};
}

// Transposes an 8x8 block of samples.
void transpose_8x8(const uint8_t* src, ptrdiff_t src_stride, uint8_t* dst, ptrdiff_t dst_stride) {
    __m128i a[4];
    for (int i = 0; i < 4; ++i) {
        a[i] = _mm_unpacklo_epi8(load_8(src + i * src_stride), load_8(src + (i + 4) * src_stride));
    }
    const __m128i b0 = _mm_unpacklo_epi8(a[0], a[2]), b1 = _mm_unpackhi_epi8(a[0], a[2]);
    const __m128i b2 = _mm_unpacklo_epi8(a[1], a[3]), b3 = _mm_unpackhi_epi8(a[1], a[3]);
    const __m128i rows[4] = {_mm_unpacklo_epi8(b0, b2), _mm_unpackhi_epi8(b0, b2),
                             _mm_unpacklo_epi8(b1, b3), _mm_unpackhi_epi8(b1, b3)};
    for (int i = 0; i < 4; ++i) {
        store_8(dst + 2 * i * dst_stride, rows[i]);
        store_8(dst + (2 * i + 1) * dst_stride, _mm_srli_si128(rows[i], 8));
    }
}

// Runs filter on the rows around a horizontal edge: `side` samples on each side, first q sample at
// pix.
template <typename Filter>
void filter_rows(uint8_t* pix, ptrdiff_t stride, int side, Filter filter) {
    uint8_t* rows[8];
    for (int i = 0; i < 2 * side; ++i) {
        rows[i] = pix + (i - side) * stride;
    }
    filter(rows);
}

// Runs filter on the four columns on either side of a vertical edge of eight lines, which it sees
// as rows.
template <typename Filter>
void filter_luma_columns(uint8_t* pix, ptrdiff_t stride, Filter filter) {
    alignas(16) uint8_t block[64];
    uint8_t* rows[8];
    for (int i = 0; i < 8; ++i) {
        rows[i] = block + 8 * i;
    }
    transpose_8x8(pix - 4, stride, block, 8);
    if (filter(rows)) {
        transpose_8x8(block, 8, pix - 4, stride);
    }
}

// The same for the two columns on either side of a chroma edge, of which the inner ones change.
template <typename Filter>
void filter_chroma_columns(uint8_t* pix, ptrdiff_t stride, Filter filter) {
    alignas(16) uint8_t block[32];
    uint8_t* rows[4];
    for (int i = 0; i < 4; ++i) {
        rows[i] = block + 8 * i;
    }
    __m128i a[4];
    for (int i = 0; i < 4; ++i) {
        a[i] = _mm_unpacklo_epi8(load_4(pix - 2 + i * stride), load_4(pix - 2 + (i + 4) * stride));
    }
    const __m128i even = _mm_unpacklo_epi8(a[0], a[2]);
    const __m128i odd = _mm_unpacklo_epi8(a[1], a[3]);
    store(block, _mm_unpacklo_epi8(even, odd));
    store(block + 16, _mm_unpackhi_epi8(even, odd));
    if (!filter(rows)) {
        return;
    }
    alignas(16) uint8_t pairs[16];
    store(pairs, _mm_unpacklo_epi8(load_8(rows[1]), load_8(rows[2])));
    for (int i = 0; i < 8; ++i) {
        std::memcpy(pix - 1 + i * stride, pairs + 2 * i, 2);
    }
}

void deblock_luma_horizontal(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                             uint32_t strengths) {
    for (int half = 0; half < 2; ++half) {
        filter_rows(pix + 8 * half, stride, 4, [&](uint8_t* const* rows) {
            return luma_rows(rows, alpha, beta, luma_tc0(tc0, strengths >> (16 * half)));
        });
    }
}

void deblock_luma_vertical(uint8_t* pix, ptrdiff_t stride, int alpha, int beta, const int8_t* tc0,
                           uint32_t strengths) {
    for (int half = 0; half < 2; ++half) {
        filter_luma_columns(pix + 8 * half * stride, stride, [&](uint8_t* const* rows) {
            return luma_rows(rows, alpha, beta, luma_tc0(tc0, strengths >> (16 * half)));
        });
    }
}

void deblock_luma_horizontal_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int half = 0; half < 2; ++half) {
        filter_rows(pix + 8 * half, stride, 4,
                    [&](uint8_t* const* rows) { return luma_rows_strong(rows, alpha, beta); });
    }
}

void deblock_luma_vertical_strong(uint8_t* pix, ptrdiff_t stride, int alpha, int beta) {
    for (int half = 0; half < 2; ++half) {
        filter_luma_columns(pix + 8 * half * stride, stride, [&](uint8_t* const* rows) {
            return luma_rows_strong(rows, alpha, beta);
        });
    }
}

void deblock_chroma_horizontal(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                               const int8_t* tc0, uint32_t strengths) {
    for (uint8_t* pix : {u, v}) {
        filter_rows(pix, stride, 2, [&](uint8_t* const* rows) {
            return chroma_rows(rows, alpha, beta, chroma_tc0(tc0, strengths));
        });
    }
}

void deblock_chroma_vertical(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta,
                             const int8_t* tc0, uint32_t strengths) {
    for (uint8_t* pix : {u, v}) {
        filter_chroma_columns(pix, stride, [&](uint8_t* const* rows) {
            return chroma_rows(rows, alpha, beta, chroma_tc0(tc0, strengths));
        });
    }
}

void deblock_chroma_horizontal_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha,
                                      int beta) {
    for (uint8_t* pix : {u, v}) {
        filter_rows(pix, stride, 2,
                    [&](uint8_t* const* rows) { return chroma_rows_strong(rows, alpha, beta); });
    }
}

void deblock_chroma_vertical_strong(uint8_t* u, uint8_t* v, ptrdiff_t stride, int alpha, int beta) {
    for (uint8_t* pix : {u, v}) {
        filter_chroma_columns(pix, stride, [&](uint8_t* const* rows) {
            return chroma_rows_strong(rows, alpha, beta);
        });
    }
}

}  // namespace

Kernels with_sse2(const Kernels& base) {
    Kernels k = base;
    k.name = "sse2";
    k.arrange_block = arrange_block;
    k.phase_sads = phase_sads;
    k.phase_sads_average = phase_sads_average;
    k.first_phases_below_x4 = first_phases_below<4>;
    k.first_phases_below_half = first_phases_below_half;
    k.first_phases_below_star = first_phases_below_star;
    k.first_phases_below_cross = first_phases_below_cross;
    k.half_vertical_row = half_vertical_row;
    k.half_horizontal_row = half_horizontal_row;
    k.copy_16x16 = copy_16x16;
    k.average_16x16 = average_16x16;
    k.centre_16x16 = centre_16x16;
    k.chroma_8x8 = chroma_8x8;
    k.code_residual_16x16 = code_residual_16x16;
    k.code_residual_8x8 = code_residual_8x8;
    k.code_residual_4x4 = code_residual_4x4;
    k.reconstruct_16x16 = reconstruct_16x16;
    k.reconstruct_8x8 = reconstruct_8x8;
    k.reconstruct_4x4 = reconstruct_4x4;
    k.block_sums = block_sums;
    k.hadamard_energy = hadamard_energy;
    k.phase_sad_16x16 = phase_sad_16x16;
    k.phase_satd_8x8 = phase_satd_8x8;
    k.phase_satd_4x4 = phase_satd_4x4;
    k.intra_4x4_modes = intra_4x4_modes;
    k.deblock_luma_vertical = deblock_luma_vertical;
    k.deblock_luma_horizontal = deblock_luma_horizontal;
    k.deblock_chroma_vertical = deblock_chroma_vertical;
    k.deblock_chroma_horizontal = deblock_chroma_horizontal;
    k.deblock_luma_vertical_strong = deblock_luma_vertical_strong;
    k.deblock_luma_horizontal_strong = deblock_luma_horizontal_strong;
    k.deblock_chroma_vertical_strong = deblock_chroma_vertical_strong;
    k.deblock_chroma_horizontal_strong = deblock_chroma_horizontal_strong;
    return k;
}

}  // namespace zolt
