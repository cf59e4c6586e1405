#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

#include "encoder/AlignedBuffer.h"
#include "kernels/Kernels.h"

// Values of slice_type that the engine writes (ITU-T H.264 Table 7-6).
enum SliceType : std::uint8_t { P_SLICE = 0, I_SLICE = 2 };

// Macroblock mode codes, as kept in g_mb_mode.
enum MbMode : std::uint8_t { MB_SKIP = 0, MB_P16x16 = 1, MB_INTRA4x4 = 6, MB_INTRA16x16 = 7 };

// Slice parameters.
struct slice_par_t {
    std::uint8_t sliceType;             // I_SLICE or P_SLICE
    std::uint8_t ppsId;                 // pic_parameter_set_id
    int disable_deblocking_filter_idc;  // 0: the filter runs, 1: it does not
    int slice_alpha_c0_offset;          // added to the QP that selects alpha and tC0
    int slice_beta_offset;              // added to the QP that selects beta
    std::uint16_t idr_pic_id;
};

// Deblocking control of one macroblock.
struct lfdata {
    std::uint8_t disable_flag;
    std::int8_t alpha_offset;
    std::int8_t beta_offset;
};

// Result of a motion search; its vector in quarter pels is (4x + dx, 4y + dy).
struct _mv {
    std::int16_t x, y;   // integer pels
    std::int8_t dx, dy;  // quarter pels, -3..3
    std::uint32_t sad;   // distortion without the rate term
    std::uint32_t cost;  // sad + rate term; 0xffffff: no candidate
};

// What the macroblocks of one picture share: geometry, samples, maps, slice parameters.
//
// Between pictures it belongs to the engine. While a picture is coded, several workers use it at
// once: what describes the picture as a whole does not change then; of the maps and of the current
// picture's samples each worker writes the entries of the macroblock that it codes or deblocks, and
// reads those of the neighbours that Wavefront's order has finished for it; the half-sample planes
// grow under a lock of their own.
class Picture {
public:
    // width, height: luma samples as given, checked by the engine.
    Picture(int width, int height, const zolt::Kernels& kernels);
    Picture(const Picture&) = delete;
    Picture& operator=(const Picture&) = delete;
    ~Picture();

    // ---- mem_alloc ----
    void allocGlobal();
    void freeGlobal();
    void allocGlobal2();
    void freeGlobal2();
    void allocImageBuffers();
    void freeImageBuffers();
    void allocFramePred();
    void freeFramePred();

    // ---- frame ----
    // Clears the maps that a picture starts with.
    void initFrameParams();
    // The deblocked picture becomes the reference; its predecessor gives room for the next frame.
    void manageRefBuffers();
    // Copies the reference picture (g_width16 x g_height16 luma samples, then Cb and Cr, no
    // padding) to dst.
    void copy_reference(unsigned char* dst) const;

    // ---- diamond ----
    void initDiamond(std::uint8_t range, std::uint8_t method, std::uint8_t subpel);
    // Prepares the reference for the macroblocks of a P picture.
    void framePredInitP();
    // Has the rows of the half-sample planes above picture row `end` built, as far as they are not
    // there yet. Any worker, at any time.
    void make_half_pixel_sds(int end);

    const zolt::Kernels* g_kernels;  // sample loops, not owned

    // ---- Geometry, fixed at construction ----
    int g_width, g_height;          // luma samples as given
    int g_mb_width, g_mb_height;    // macroblocks
    int g_width16, g_height16;      // luma samples, rounded down to multiples of 16
    int g_cwidth, g_cheight;        // chroma samples of the rounded-down size
    int g_num_mbs;                  // macroblocks of a picture
    int g_blk_width, g_blk_height;  // 4x4 blocks per row and column

    // ---- The picture as a whole, written before its first macroblock ----
    // The caller's frame, borrowed while it is coded, with any alignment: g_width x g_height luma
    // samples, then Cb and Cr, g_width / 2 x g_height / 2 each, no padding.
    const std::uint8_t* g_frame = nullptr;
    int g_mbQp = 10;                    // QP of the current picture, 0..51
    std::uint8_t g_num_ref_active = 1;  // active list-0 references
    zolt::AlignedBuffer<slice_par_t> g_slp;

    // ---- Samples ----
    // Two pictures with borders, in one block; the planes' strides are g_stride_luma and
    // g_stride_chroma, the pointers address sample (0, 0). The current picture fills with the
    // frame's reconstruction as coding proceeds; the two change places when it becomes the
    // reference.
    zolt::AlignedBuffer<std::uint8_t> g_alloc_images;
    std::uint8_t *g_cur_y = nullptr, *g_cur_u = nullptr, *g_cur_v = nullptr;
    std::uint8_t *g_ref_y = nullptr, *g_ref_u = nullptr, *g_ref_v = nullptr;
    // Half-sample planes of the reference (sample (0, 0)): half a pel below, right, and both.
    zolt::AlignedBuffer<std::uint8_t> g_half_planes;
    std::uint8_t *g_half_v_L0 = nullptr, *g_half_h_L0 = nullptr, *g_half_hv_L0 = nullptr;
    // Picture row where the half-sample planes end that are built. It is raised after the rows are
    // there, by the worker that has set g_half_rows_busy.
    std::atomic<int> g_half_rows_end{0};
    std::atomic<bool> g_half_rows_busy{false};

    // ---- Per-macroblock maps ----
    zolt::AlignedBuffer<std::uint8_t> g_mb_mode;  // MbMode
    zolt::AlignedBuffer<std::uint8_t> g_mb_qp;    // luma QP
    zolt::AlignedBuffer<lfdata> g_lf_data;
    // Inter: 4x4 luma blocks with levels, raster order.
    zolt::AlignedBuffer<std::uint16_t> g_coded_blocks;
    zolt::AlignedBuffer<_mv> g_mv_array;  // 16x16 search results
    zolt::AlignedBuffer<_mv> g_me_mb_L0;  // their integer stage: the neighbours of later searches

    // ---- Per-4x4-block maps, g_blk_width entries per row ----
    // Intra 4x4 modes with a border row above and a border column on either side, g_blk_width + 2
    // entries per row; -1: no such block, 2: no intra 4x4 block.
    zolt::AlignedBuffer<std::int8_t> g_i4mode;
    zolt::AlignedBuffer<std::int8_t> g_blk_ref;              // reference index, -1: intra
    zolt::AlignedBuffer<std::int16_t> g_blk_mvx, g_blk_mvy;  // quarter pels
    zolt::AlignedBuffer<std::uint8_t> g_cnum_l;              // TotalCoeff of luma blocks
    zolt::AlignedBuffer<std::uint8_t> g_cnum_u, g_cnum_v;  // of Cb and Cr, g_blk_width / 2 per row

    // ---- Motion search, fixed at construction ----
    int g_search_range = 0;                // pels
    int g_search_method = 0;               // 1: subsampled diamond
    int g_subpel_enable = 0;               // 1: refine to quarter pels
    int g_pad_luma = 0, g_pad_chroma = 0;  // borders of the planes, samples
    int g_stride_luma = 0, g_stride_chroma = 0;
    int g_origin_luma = 0, g_origin_chroma = 0;  // offset of sample (0, 0) in a plane
    int g_size_Y = 0, g_size_U = 0;              // samples of a plane with its borders
    int g_visit_dim = 0;  // rows and columns of a worker's table of visited vectors
    // Samples that quarter-pel candidates average with the result's own: plane (0 reference, then
    // the half-sample planes below, right, both) and offset in samples, by the kind of the result's
    // sample: integer, right, below, both.
    struct plane_offset_t {
        std::ptrdiff_t plane, offset;
    };
    plane_offset_t g_quarter_samples[4][8];

private:
    void build_half_rows(int end);
};
