#pragma once

#include <cstddef>
#include <cstdint>

namespace zolt {

// Quantiser of one QP and one rounding: factors per coefficient position. Coefficients of a 4x4
// block are kept column by column throughout the engine: position 4 * column + row. The factors are
// symmetric in row and column, so they read the same either way.
struct Quantizer {
    alignas(32) std::int16_t forward[16];    // forward factor
    alignas(32) std::int16_t dequant[16];    // normAdjust4x4 (clause 8.5.9) << (QP / 6)
    alignas(32) std::int16_t dead_zone[16];  // largest coefficient magnitude whose level is 0
    std::int32_t rounding;                   // added before the shift
    std::int32_t shift;                      // 15 + QP / 6
    std::int32_t dc_dead_zone;  // largest magnitude whose level is 0 with twice the rounding offset
                                // and a shift larger by 1, as DC values have it
};

// Levels are limited to this magnitude, the largest that the 28-bit escape code of clause 9.2.2.1
// can carry at suffixLength 0.
constexpr int kMaxLevel = 2063;

// Bytes of a block as arrange_block leaves it.
constexpr int kArrangedBlock = 384;

// The half samples below, right and below right of an integer sample, in planes of one stride.
struct HalfSamples {
    const std::uint8_t *vertical, *horizontal, *centre;
};

// Blocks at the eight half-sample positions around a block: below, above, right, left, then below
// right, below left, above right and above left.
inline void half_candidates(const HalfSamples& at, std::ptrdiff_t stride,
                            const std::uint8_t** blocks) {
    // One by one: from an array they would be written singly and read in pairs, which waits.
    blocks[0] = at.vertical;
    blocks[1] = at.vertical - stride;
    blocks[2] = at.horizontal;
    blocks[3] = at.horizontal - 1;
    blocks[4] = at.centre;
    blocks[5] = at.centre - 1;
    blocks[6] = at.centre - stride;
    blocks[7] = at.centre - stride - 1;
}

// The pairs of blocks whose averages are candidates 4..7 of first_phases_below_cross.
constexpr int kCrossPairs[4][2] = {{0, 1}, {2, 1}, {0, 3}, {2, 3}};

// Byte offsets of the colours in a pixel: blue two bytes before or after red, green between them.
struct RgbOffsets {
    int r, g, b;
};

// Two luma rows of a 4:2:0 picture and the chroma rows that belong to them.
struct IyuvRows {
    std::uint8_t *upper, *lower;
    std::uint8_t *u, *v;
};

// An intra 4x4 macroblock's luma for Kernels::code_intra_4x4.
struct Intra4x4 {
    // Its samples in the picture, which the reconstruction replaces. Those around it are read, as
    // far as 4 samples to the right of it, whether or not they are there.
    std::uint8_t* samples;
    std::ptrdiff_t stride;
    bool up, left, up_right;  // the macroblocks above, to the left and above to the right are there

    // Its entries in a map of modes by 4x4 block, to be written; those above and to the left of
    // them are read. A negative one: there is no block.
    std::int8_t* modes;
    std::ptrdiff_t modes_stride;

    const Quantizer* quantizer;

    // The predicted mode is kept up to a distortion of `kept`. Otherwise other
    // modes pay `rate` for each phase, and are dropped after phase n when they cost more than
    // drop[n] / 4 of the predicted mode's share, a fourth of its distortion.
    int rate, kept;
    std::int16_t drop[3];

    // Results by block in decoding order: predicted and chosen modes, the levels in zig-zag order
    // and the masks of those that are not 0.
    std::uint8_t *predicted, *chosen;
    std::int16_t* scan;
    std::uint16_t* nonzero;
};

// A macroblock's chroma for Kernels::code_chroma; of two pointers the first is Cb's.
struct Chroma {
    const std::uint8_t* src[2];  // 8x8 samples each, of which no other ones are read
    std::ptrdiff_t src_stride;
    const std::uint8_t* pred;  // the 8x8 prediction of Cb and after it that of Cr
    std::uint8_t* dst[2];      // of the reconstruction; may be src
    std::ptrdiff_t dst_stride;
    const Quantizer* quantizer;

    // Results: AC levels in zig-zag order, behind a 0, and the masks of those that are not 0, of
    // the four blocks of Cb in raster order and then of Cr; four DC levels of Cb and four of Cr.
    std::int16_t* scan;
    std::uint16_t* nonzero;
    std::int16_t* dc;
};

// Deblocking of edges between samples of one mean QP: alpha 0..255, beta 0..18 and tC0 0..25 by bS
// 1..3 (clause 8.7.2.2); tc0[0] is -1, for segments that are not filtered.
struct EdgeFilter {
    std::uint8_t alpha, beta;
    std::int8_t tc0[4];
};

// The boundary strengths of an edge that has bS 4.
constexpr std::uint32_t kStrongEdge = 0x04040404;

// The per-sample loops of the engine and of the colour converter. A kernel computes; orders,
// thresholds and tie rules stay with its callers. Every entry of the scalar table is the definition
// that the entries of the other tables must equal on every input stated here.
//
// Samples are 8-bit; strides are in samples. A "16x16 prediction" is 256 samples with stride 16, an
// "8x8 prediction" 64 samples with stride 8, a "4x4 prediction" 16 samples with stride 4 unless a
// stride is given. Predictions of 16x16 and 8x8, arranged blocks and coefficients are aligned to 32
// bytes, 4x4 predictions to 16.
struct Kernels {
    const char* name;

    // ---- Distortion of the motion search ----
    // The search samples a 16x16 block in four phases of 64 samples: phase 0 is even rows and even
    // columns, 1 odd rows and odd columns, 2 odd rows and even columns, 3 even rows and odd
    // columns.

    // Arranges a block as the kernels below read it: its rows in the order 0, 8, 1, 9 .. 7, 15,
    // then phases 0 and 1 as a checkerboard of 8 rows, of which row n stems from rows 2n and 2n +
    // 1, in the order 0, 4, 1, 5 .. 3, 7 (kArrangedBlock bytes).
    void (*arrange_block)(const std::uint8_t* src, std::ptrdiff_t stride, std::uint8_t* block);

    // SADs between an arranged block and the block at ref, or the rounded averages (a + b + 1) >> 1
    // of those at a and b: sums[n] of the phases up to n.
    void (*phase_sads)(const std::uint8_t* block, const std::uint8_t* ref, std::ptrdiff_t stride,
                       int* sums);
    void (*phase_sads_average)(const std::uint8_t* block, const std::uint8_t* a,
                               const std::uint8_t* b, std::ptrdiff_t stride, int* sums);

    // Which candidates have a SAD of phases 0 and 1 below their limit: bit n of the result,
    // candidate n. x4: the candidates are the blocks at refs. Half: those of half_candidates().
    // Star: the averages of centre and each of eight. Cross: the averages of centre and each of
    // four, then those of refs 0 and 1, 2 and 1, 0 and 3, 2 and 3 (kCrossPairs).
    std::uint32_t (*first_phases_below_x4)(const std::uint8_t* block,
                                           const std::uint8_t* const* refs, std::ptrdiff_t stride,
                                           const std::int32_t* limits);
    std::uint32_t (*first_phases_below_half)(const std::uint8_t* block, const HalfSamples& at,
                                             std::ptrdiff_t stride, const std::int32_t* limits);
    std::uint32_t (*first_phases_below_star)(const std::uint8_t* block, const std::uint8_t* centre,
                                             const std::uint8_t* const* refs, std::ptrdiff_t stride,
                                             const std::int32_t* limits);
    std::uint32_t (*first_phases_below_cross)(const std::uint8_t* block, const std::uint8_t* centre,
                                              const std::uint8_t* const* refs,
                                              std::ptrdiff_t stride, const std::int32_t* limits);

    // ---- Reference planes ----

    // Repeats the outermost samples of a width x height plane into the border around it.
    void (*extend_edges)(std::uint8_t* origin, int width, int height, std::ptrdiff_t stride,
                         int border);

    // One row of count half samples below (rows -2..+3 are read) or right of (columns -2..+3 are
    // read) the samples at src: clip((E - 5F + 20G + 20H - 5I + J + 16) >> 5), clause 8.4.2.2.1.
    void (*half_vertical_row)(const std::uint8_t* src, std::ptrdiff_t stride, std::uint8_t* dst,
                              int count);
    void (*half_horizontal_row)(const std::uint8_t* src, std::uint8_t* dst, int count);

    // ---- Inter prediction ----

    void (*copy_16x16)(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride);
    void (*average_16x16)(std::uint8_t* pred, const std::uint8_t* a, std::ptrdiff_t a_stride,
                          const std::uint8_t* b, std::ptrdiff_t b_stride);
    // The centre half samples j of clause 8.4.2.2.1, from unrounded intermediate sums.
    void (*centre_16x16)(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride);
    // Bilinear samples of clause 8.4.2.2.2 of both chroma components: 8x8 predictions of Cb at pred
    // and of Cr after it; fx, fy in eighth pels, 0..7. Up to 16 samples of nine rows are read at u
    // and at v.
    void (*chroma_8x8)(std::uint8_t* pred, const std::uint8_t* u, const std::uint8_t* v,
                       std::ptrdiff_t stride, int fx, int fy);

    // ---- Residual ----

    // Prediction error, forward core transform and quantiser of the 16 luma blocks of a macroblock
    // in decoding order (Figure 6-10), and of one 4x4 block: level = sign(c) * min((|c| * forward +
    // rounding) >> shift, kMaxLevel). Bit b of the result: block b has a level other than 0; bit
    // 16 + b, of the 16 blocks only: it has one other than -1, 0 and 1. Writes such a block's
    // levels in zig-zag order (clause 8.5.6, frame) to scan and level * dequant to coefs, for a
    // block without levels zeros or nothing; of every block, the mask of the levels that are not 0
    // to nonzero (bit n: scan position n). With dc, which takes one value a block, the constant
    // coefficients go there and 0 stands in for them, and coefs gets the zeros.
    std::uint32_t (*code_residual_16x16)(const std::uint8_t* src, std::ptrdiff_t stride,
                                         const std::uint8_t* pred, const Quantizer& quantizer,
                                         std::int16_t* dc, std::int16_t* coefs, std::int16_t* scan,
                                         std::uint16_t* nonzero);
    std::uint32_t (*code_residual_4x4)(const std::uint8_t* src, std::ptrdiff_t stride,
                                       const std::uint8_t* pred, const Quantizer& quantizer,
                                       std::int16_t* coefs, std::int16_t* scan,
                                       std::uint16_t* nonzero);

    // The constant coefficients of the 16 luma blocks of an intra 16x16 macroblock, in decoding
    // order (magnitudes up to 4080): their own 4x4 transform, halved, and its quantiser, level =
    // sign(c) * min((|c| * forward[0] + 2 * rounding) >> (shift + 1), kMaxLevel). Writes the levels
    // in zig-zag order to scan and what clause 8.5.10 makes of them to the constant coefficients of
    // the blocks in coefs. Returns the mask of the levels that are not 0 (bit n: scan position n)
    // in the low half and that of the blocks whose constant coefficient is not 0 in the high half.
    std::uint32_t (*code_luma_dc)(const std::int16_t* dc, const Quantizer& quantizer,
                                  std::int16_t* coefs, std::int16_t* scan);

    // Inverse transform of clause 8.5.12.2 with 32-bit sums, added to the prediction, clipped and
    // stored at dst. Blocks whose bit of the mask is 0 are copies of the prediction. Needs |c| <
    // 2^15.
    void (*reconstruct_16x16)(const std::int16_t* coefs, std::uint32_t mask,
                              const std::uint8_t* pred, std::uint8_t* dst, std::ptrdiff_t stride);
    void (*reconstruct_4x4)(const std::int16_t* coefs, const std::uint8_t* pred, std::uint8_t* dst,
                            std::ptrdiff_t stride);

    // Both chroma components from prediction error to reconstruction (clauses 8.5.4, 8.5.11): AC
    // levels as code_residual_16x16 has them with dc; DC levels are those of the 2x2 transform of
    // a component's constant coefficients, by the quantiser of code_luma_dc. Masks and DC levels
    // are written always. Bit b of the result: block b has an AC level other than 0; bit 8 + n: DC
    // level n is not 0.
    std::uint32_t (*code_chroma)(const Chroma& chroma);

    // ---- Features and distortions of the intra decisions ----

    // Sums of the 16 samples of each 4x4 block of a 16x16 block, blocks in raster order.
    void (*block_sums)(const std::uint8_t* src, std::ptrdiff_t stride, std::int32_t* sums);

    // With H the 4x4 Hadamard transform of 16 values (|value| < 2^16) and F = (|H| + 8) >> 4:
    // energy[0] = F of the constant term, [1] the other three of the first row (horizontal
    // frequencies), [2] the other three of the first column, [3] the remaining nine.
    void (*hadamard_energy)(const std::int32_t* values, std::int32_t* energy);

    // Predictions of all four modes of an intra 16x16 block and of an intra chroma block of both
    // components (clauses 8.3.3, 8.3.4) from the samples around src, or around u and v, which are
    // read whether or not they are there; up, left: which of them the mean is of. They are left at
    // preds one after the other, 256 samples each, or 64 of Cb and 64 of Cr. And their distortions
    // by sampling phase, that of mode m at [4 * phase + m].
    //
    // 16x16: phase 4 * y + x, the first 8, is the sum of absolute differences at the 16 samples
    // (x + 4i, y + 4j). Chroma: phase 4 * y + x, the first 12, is the absolute sum of the 2x2
    // Hadamard transform of the differences at (x, y), (x + 4, y), (x, y + 4) and (x + 4, y + 4),
    // of both components.
    void (*intra_16x16_modes)(const std::uint8_t* src, std::ptrdiff_t stride, bool up, bool left,
                              std::uint8_t* preds, std::int32_t* distortion);
    void (*intra_chroma_modes)(const std::uint8_t* u, const std::uint8_t* v, std::ptrdiff_t stride,
                               bool up, bool left, std::uint8_t* preds, std::int32_t* distortion);

    // Distortion of a 4x4 prediction by sampling phase, 2 * y + x: the absolute sum of the 2x2
    // Hadamard transform of the differences at (x, y), (x + 2, y), (x, y + 2) and (x + 2, y + 2).
    void (*phase_satd_4x4)(const std::uint8_t* src, std::ptrdiff_t stride, const std::uint8_t* pred,
                           std::int32_t* distortion);

    // The predictions of all nine intra 4x4 modes from a block's neighbours L, K, J, I, M, A..H (16
    // bytes are read), with dc for the DC mode: at preds, one after the other. And their
    // distortions as those of phase_satd_4x4: that of phase p of mode m at [16 * p + m], 0 at m
    // > 8.
    void (*intra_4x4_modes)(const std::uint8_t* src, std::ptrdiff_t stride,
                            const std::uint8_t* neighbours, int dc, std::uint8_t* preds,
                            std::int16_t* distortion);

    // Intra 4x4 luma of a macroblock, all blocks at once: mode, levels and reconstruction of every
    // block, as MacroblockCoder makes them block by block with the entries above. Returns the mask
    // of the blocks with levels. This one chooses as well, since every block waits for the choice
    // of the one before; the numbers that it goes by are its caller's. Null where block by block is
    // the fastest way.
    std::uint32_t (*code_intra_4x4)(const Intra4x4& macroblock);

    // ---- Deblocking (clause 8.7.2) ----

    // Filters the four edges of a macroblock in one direction, edge n before edge n + 1: pix, u and
    // v are its first samples; "vertical" edges are crossed horizontally and are at columns 0, 4, 8
    // and 12. Of chroma, edges 0 and 2 are at columns 0 and 4.
    //
    // strengths[n] holds bS 0..3 of the four segments of edge n, a byte each, the first lowest.
    // That of edge 0 may be kStrongEdge instead. outer is the filter of edge 0, inner that of the
    // others. The samples beyond edge 0 are those that its filter needs; where strengths[0] is 0,
    // up to two may be read and written as they were.
    using LumaFilter = void (*)(std::uint8_t* pix, std::ptrdiff_t stride,
                                const std::uint32_t* strengths, const EdgeFilter& outer,
                                const EdgeFilter& inner);
    using ChromaFilter = void (*)(std::uint8_t* u, std::uint8_t* v, std::ptrdiff_t stride,
                                  const std::uint32_t* strengths, const EdgeFilter& outer,
                                  const EdgeFilter& inner);
    LumaFilter deblock_luma_vertical;
    LumaFilter deblock_luma_horizontal;
    ChromaFilter deblock_chroma_vertical;
    ChromaFilter deblock_chroma_horizontal;

    // ---- Colour conversion ----

    // Two rows of a packed picture to 4:2:0. A row has width pixels, a positive even number, and
    // any alignment; the result (width luma samples a row, width / 2 samples of U and V) does not
    // overlap the source. Means over the pixels that share a chroma sample are rounded down.

    // RGB of 4 or 3 bytes a pixel: luma and chroma by the rules of color_rules.h, chroma from the
    // means of R, B and luma over 2x2 pixels. A fourth byte counts for nothing.
    using RgbConversion = void (*)(const std::uint8_t* upper, const std::uint8_t* lower,
                                   RgbOffsets at, IyuvRows to, int width);
    RgbConversion rgb32_rows_to_iyuv;
    RgbConversion rgb24_rows_to_iyuv;

    // AYUV (bytes A Y U V of each pixel): chroma is the mean over 2x2 pixels. YUY2 (bytes Y U Y V
    // of each pixel pair): chroma is the mean of the two rows.
    using YuvConversion = void (*)(const std::uint8_t* upper, const std::uint8_t* lower,
                                   IyuvRows to, int width);
    YuvConversion ayuv_rows_to_iyuv;
    YuvConversion yuy2_rows_to_iyuv;
};

// The scalar table; it runs on any processor.
const Kernels& scalar_kernels();

// The tables that this processor can run, the scalar one first, the fastest last; found once per
// process.
class KernelTables {
public:
    KernelTables(const Kernels* first, const Kernels* last) : m_first(first), m_last(last) {}
    const Kernels* begin() const { return m_first; }
    const Kernels* end() const { return m_last; }

private:
    const Kernels* m_first;
    const Kernels* m_last;
};
KernelTables kernel_tables();

// The last of them.
const Kernels& best_kernels();

}  // namespace zolt
