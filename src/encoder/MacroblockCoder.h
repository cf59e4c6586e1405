#pragma once

#include <cstddef>
#include <cstdint>

#include "encoder/BitWriter.h"
#include "encoder/Picture.h"
#include "kernels/Kernels.h"

class BitCursor;

// One worker's scratch and the functions over it: decides, transforms, reconstructs and writes one
// macroblock after the other, and deblocks them. A name without a prefix is this macroblock's or
// this row's; what is reached through `picture` is shared. Nothing but what belongs to the row (its
// bits and its skip run) is carried from one macroblock to the next: a neighbour's results come
// from the picture's maps.
class MacroblockCoder {
public:
    // The most bits that a macroblock can take, which is an intra 4x4 one in a P picture with
    // 28-bit levels only: blocks that have all their levels carry no total_zeros.
    static constexpr unsigned kHeaderBits =
        31 + 5 + 16 * 4 + 5 + 11 + 1;                         // mb_skip_run to mb_qp_delta
    static constexpr unsigned kLumaBlockBits = 16 + 16 * 28;  // coeff_token and levels
    static constexpr unsigned kChromaDcBits = 6 + 4 * 28;
    static constexpr unsigned kChromaAcBits = 16 + 15 * 28;
    static constexpr unsigned kMaxMacroblockBits =
        kHeaderBits + 16 * kLumaBlockBits + 2 * kChromaDcBits + 8 * kChromaAcBits;

    // The picture is shared with other coders and outlives them all.
    explicit MacroblockCoder(Picture& shared);
    MacroblockCoder(const MacroblockCoder&) = delete;
    MacroblockCoder& operator=(const MacroblockCoder&) = delete;

    // Codes macroblock mb_x of row mb_y into *bits: macroblock_layer(), clause 7.3.5, and in P
    // slices the mb_skip_run before it.
    void code_macroblock(int mb_x, int mb_y);

    // ---- macroblock ----
    void processCurrentMB_I();
    void processCurrentMB_P();
    void setMBOffsets();
    void prefetch_samples() const;
    void load_intra() const;
    std::ptrdiff_t first_block() const;
    void code_intra();
    void code_intra4x4();
    void code_intra4x4_by_block(std::int8_t* modes, std::ptrdiff_t stride, std::uint8_t* predicted);
    void set_block_availability();
    std::uint8_t has_up_right() const;
    void generatePredError16x16();
    void predict_inter_chroma();
    void setMBType_CBP();
    void set_pred_MVD();
    void setMBValues_P();

    // ---- transform ----
    const zolt::Quantizer& luma_quantizer() const;
    void quantTransform_luma_4x4(int k, const std::uint8_t* pred);
    void quantTransform_luma_16x16(const std::uint8_t* pred);
    void quantTransform_luma_16x16P();
    void quantTransform_chroma(const std::uint8_t* pred);

    // ---- intrapredict: clause 8.3 ----
    // The 13 neighbours of the 4x4 block at src: L, K, J, I, M, A..H. Where A..D or I..L or M are
    // not available 128 stands in, for E..H D. Flags: 1 = available.
    static void gather_neighbours4(std::uint8_t* neighbours, const std::uint8_t* src,
                                   std::ptrdiff_t stride, int up, int left, int up_right,
                                   int up_left);
    // Predictions (strides 4, 16, 8) of a 4x4 luma block, mode 0..8, from its neighbours; of a
    // 16x16 luma block, mode 0..3; and of an 8x8 chroma block, mode 0..3, from the samples around
    // src. A mode that does not exist, and a 16x16 mode without its neighbours, end the process
    // with status 104.
    static void ipred4(std::uint8_t* pred, const std::uint8_t* neighbours, int up, int left,
                       int mode);
    static void ipred16(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride, int up,
                        int left, int mode);
    static void ipred_c(std::uint8_t* pred, const std::uint8_t* src, std::ptrdiff_t stride, int up,
                        int left, int mode);
    // The DC value of a 4x4 block (clause 8.3.1.2.3).
    static int ipred4_dc(const std::uint8_t* neighbours, int up, int left);

    // ---- learn: learned intra decisions ----
    int learn16_4();
    int setLearnPIMode();
    int learn16_mode();
    int learn_chroma_mode();
    int learn4_mode(int k, int predicted_mode, std::uint8_t* pred);
    zolt::Intra4x4 intra4x4_rule(std::int8_t* modes, std::ptrdiff_t stride,
                                 std::uint8_t* predicted);
    void compute_block_features();

    // ---- cavlc: macroblock_layer(), clauses 7.3.5 and 9.2 ----
    void writeMBSyntax();
    void writeMBSyntax_P();
    bool encode_mb_skip();
    void encode_header();
    void encode_I4Modes(BitCursor& out);
    void encode_MB_Pred_P(BitCursor& out);
    void encode_CBP(BitCursor& out);
    void encodeBlock();
    void encode_luma_blocks(BitCursor& out, bool intra16x16);
    void encode_chroma_ac_blocks(BitCursor& out, int component);

    // ---- diamond: motion search ----
    void generateMBPred();

    // ---- motioncomp ----
    // Vector prediction of clause 8.4.1.3 for the partition of w x h samples at block column bx and
    // row by of the current macroblock, with reference index ref; quarter pels.
    void form_mv_prediction(std::int16_t* pmv_x, std::int16_t* pmv_y, std::int8_t ref, int bx,
                            int by, int w, int h) const;
    // Luma prediction of the 16x16 block at sample (px, py) for a vector in quarter pels, and
    // predictions of Cb and then Cr of the 8x8 blocks at chroma sample (cx, cy) for the same
    // vector.
    void qpmc_16x16_L0(std::uint8_t* pred, int mvx, int mvy, int px, int py) const;
    void qpmc_c_core(std::uint8_t* pred, int mvx, int mvy, int cx, int cy) const;

    // ---- lfilter: deblocking filter ----
    void filter_mb(int mb_x, int mb_y);
    void find_edge_strengths(int mb_x, int mb_y);
    bool vectors_differ(int mb, int other) const;

    // The members are public so that tests and benchmarks can reach every unit.

    Picture& picture;
    const zolt::Kernels* g_kernels;  // the picture's sample loops

    // ---- The row ----
    BitWriter row_bits;           // room for a row
    BitWriter* bits = &row_bits;  // where the row's syntax goes; not owned
    int g_skip_run = 0;           // mb_skip_run: skipped macroblocks since the last coded one
    // The row's first mb_skip_run is not written but kept here, since the rows above may end with
    // skipped macroblocks that it has to count; negative before there is one.
    bool keep_first_run = false;
    int first_run = -1;

    // ---- Current macroblock ----
    int g_mapMBNumber = 0;                    // its address, raster order
    int g_mb_x = 0, g_mb_y = 0;               // position in macroblocks
    std::uint8_t g_mb_up = 0, g_mb_left = 0;  // 1: the macroblock above / to the left exists
    // Its samples in the caller's frame, strides g_width and g_width / 2. They have any alignment,
    // and the frame may end with them.
    const std::uint8_t *g_mb_src_y = nullptr, *g_mb_src_u = nullptr, *g_mb_src_v = nullptr;
    // Its place in the current picture: an intra macroblock's samples until they are coded, then
    // the reconstruction. Strides g_stride_luma and g_stride_chroma.
    std::uint8_t *g_mb_rec_y = nullptr, *g_mb_rec_u = nullptr, *g_mb_rec_v = nullptr;
    // Neighbour availability of the 4x4 blocks in decoding order, 1: available.
    std::uint8_t g_blk_up[16] = {}, g_blk_left[16] = {};
    std::uint8_t g_blk_up_left[16] = {}, g_blk_up_right[16] = {};
    int g_intra_lambda = 1;            // rate weight of the intra decisions
    int g_sad_lambda = 1;              // rate weight of the motion search
    std::uint8_t g_cur_mb_mode = 0;    // MbMode
    std::uint8_t g_ipMBPred[16] = {};  // intra 4x4 modes in decoding order; [0]: intra 16x16 mode
    std::uint8_t g_chroma_mode = 0;    // intra_chroma_pred_mode
    std::uint8_t g_prev_intra4x4_pred_mode_flag[16] = {};
    std::uint8_t g_rem_intra4x4_pred_mode[16] = {};
    int g_mb_type = 0;                      // mb_type as coded
    int g_coded_block_pattern = 0;          // luma bits 0..3, 16 * chroma pattern 0..2
    std::uint8_t g_skip_flag = 0;           // 1: P_Skip
    std::int16_t g_pmv_x = 0, g_pmv_y = 0;  // predicted vector, quarter pels
    std::int16_t g_mvd_x = 0, g_mvd_y = 0;  // vector difference, quarter pels

    // Prediction samples of an inter macroblock: luma 16x16, Cb 8x8, Cr 8x8.
    alignas(64) std::uint8_t g_mb_pred[384] = {};
    // Those of an intra macroblock by mode, luma, and Cb and Cr.
    alignas(64) std::uint8_t g_intra_pred_16x16[4][256] = {};
    alignas(64) std::uint8_t g_intra_pred_chroma[4][128] = {};
    // Scaled coefficients (level * dequant) of luma blocks 0..15 in decoding order; inside a block
    // column by column. Those of a block without levels are left over from others, or 0 where the
    // DC coefficients have a transform of their own.
    alignas(64) std::int16_t g_mb_coefs[16 * 16] = {};
    // Levels of the same blocks, and of the four of Cb and of Cr, in zig-zag order, left over from
    // others where a block has none, and masks of the levels that are not 0.
    alignas(64) std::int16_t g_scan_levels[24 * 16] = {};
    std::uint16_t g_nonzero[24] = {};
    // DC levels: intra 16x16 in zig-zag order, with the mask of those that are not 0, Cb
    // and then Cr in raster order.
    std::int16_t g_luma_dc[16] = {};
    std::uint16_t g_luma_dc_nonzero = 0;
    std::int16_t g_chroma_dc[8] = {};
    // Coded-block masks: bit per block with levels (without the DC levels above).
    unsigned g_luma_mask = 0, g_chroma_ac_mask = 0;
    unsigned g_chroma_dc_mask = 0;  // of the chroma DC levels that are not 0

    // Block-sum features of the learned decisions: sums of the 4x4 blocks in raster order, and
    // energy of their Hadamard transform (Kernels::hadamard_energy).
    std::int32_t g_block_sums[16] = {};
    std::int32_t g_block_energy[4] = {};

    // ---- Motion search ----
    // Stamp of the last search that evaluated each vector, [x + offset][y + offset].
    zolt::AlignedBuffer<std::uint8_t> g_visit_L0;
    std::uint8_t g_visit_stamp = 0;  // stamp of the running search

    // ---- Deblocking: boundary strengths of the macroblock being filtered ----
    // Four segments of 8 bits each, the first lowest; edge 0 is the left or the top one.
    std::uint32_t bs_ver[4] = {};
    std::uint32_t bs_hor[4] = {};
};
