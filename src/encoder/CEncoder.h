#pragma once

#include <cstddef>
#include <cstdint>

#include "encoder/AlignedBuffer.h"
#include "kernels/Kernels.h"

// Values of slice_type that the engine writes (ITU-T H.264 Table 7-6).
enum SliceType : std::uint8_t { P_SLICE = 0, I_SLICE = 2 };

// Macroblock mode codes, as kept in g_mb_mode.
enum MbMode : std::uint8_t { MB_SKIP = 0, MB_P16x16 = 1, MB_INTRA4x4 = 6, MB_INTRA16x16 = 7 };

// Sequence parameter set, fields in the order of clause 7.3.2.1.1.
struct seq_par_set_t {
    std::uint8_t profile_idc;
    std::uint8_t constraint_set0_flag;
    std::uint8_t constraint_set1_flag;
    std::uint8_t constraint_set2_flag;
    std::uint8_t reserved_zero_5bits;
    std::uint8_t level_idc;
    unsigned seq_parameter_set_id;
    unsigned log2_max_frame_num_minus4;
    unsigned pic_order_cnt_type;
    unsigned log2_max_pic_order_cnt_lsb_minus4;
    unsigned num_ref_frames;
    std::uint8_t gaps_in_frame_num_value_allowed_flag;
    unsigned pic_width_in_mbs_minus1;
    unsigned pic_height_in_map_units_minus1;
    std::uint8_t frame_mbs_only_flag;
    std::uint8_t direct_8x8_inference_flag;
    std::uint8_t frame_cropping_flag;
    std::uint8_t vui_parameters_present_flag;
};

// Picture parameter set, fields in the order of clause 7.3.2.2.
struct pic_par_set_t {
    unsigned pic_parameter_set_id;
    unsigned seq_parameter_set_id;
    std::uint8_t entropy_coding_mode_flag;
    std::uint8_t pic_order_present_flag;
    unsigned num_slice_groups_minus1;
    unsigned num_ref_idx_l0_active_minus1;
    unsigned num_ref_idx_l1_active_minus1;
    std::uint8_t weighted_pred_flag;
    std::uint8_t weighted_bipred_idc;
    int pic_init_qp_minus26;
    int pic_init_qs_minus26;
    int chroma_qp_index_offset;
    std::uint8_t deblocking_filter_control_present_flag;
    std::uint8_t constrained_intra_pred_flag;
    std::uint8_t redundant_pic_cnt_present_flag;
};

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

// H.264/AVC encoder engine: Main profile, level 2.2, CAVLC, one reference frame, one slice and one
// NAL unit per picture. One object per encoding session, used by one thread at a time; different
// objects share nothing but constant tables. All memory is allocated by the constructor.
//
// Life: construct, set parameters, initialize_encoder(), encode_sps(), encode_pps(), then
// encode_frame() for every frame; after each of these encode_ calls take the NAL unit and call
// reset_nal_buffer(). The bit rate, the frame rate and the intra period may change between frames.
//
// A state that the engine cannot go on from ends the process: exitOnError().
class CEncoder {
public:
    // width, height: luma samples, from 16 to 16880 each, at most 139264 macroblocks in all (else
    // exitOnError, status -1). Sizes that are not multiples of 16 are accepted; the picture coded
    // is the top left part of the size rounded down. kernels: the table of sample loops to use,
    // borrowed; null: the fastest of this processor.
    CEncoder(int width, int height, const zolt::Kernels* kernels = nullptr);
    CEncoder(const CEncoder&) = delete;
    CEncoder& operator=(const CEncoder&) = delete;
    ~CEncoder();

    // QP of every picture while no bit rate is set, and of the first picture otherwise; limited to
    // 0..51.
    void set_qp(int q);
    // Target in bit/s; 0 or less switches rate control off. Returns the previous value.
    int set_bit_rate(int bps);
    // Frames per second of the rate controller's budget. Returns the previous value.
    double set_frame_rate(double fps);
    // Distance of IDR pictures in frames, at least 1. Returns the previous value.
    unsigned set_intra_period(int n);
    // Distance of anchor pictures: 0 or 1 are stored, other values as 1. Returns the previous
    // value.
    unsigned set_inter_period(int n);

    // Fills the parameter sets and starts rate control and the counters; after the setters, before
    // the first frame. Ends the process (status 109) when the bit rate is above the level's limit.
    void initialize_encoder();

    // Leave the parameter set's NAL unit (clause 7.3.2.1, 7.3.2.2) in the NAL buffer.
    void encode_sps();
    void encode_pps();

    // Codes one planar 4:2:0 frame (width x height luma samples, then Cb and Cr of (width / 2) x
    // (height / 2) each, no padding) and leaves its NAL unit in the NAL buffer. The frame is read
    // during the call only.
    void encode_frame(const void* frame);

    // The NAL unit in the buffer: header byte and emulation-prevented payload. Owned by the engine,
    // valid until reset_nal_buffer().
    unsigned char* get_nal_buffer() const { return g_nal_buf; }
    int get_nal_size() const { return static_cast<int>((g_nal_bitpos + 7) / 8); }
    // Copies min(get_nal_size(), max) bytes to dst and returns their number.
    int copy_nal_unit(void* dst, int max) const;
    void reset_nal_buffer() { ResetNALUnit(); }

    // Copies the deblocked reconstruction of the last picture (g_width16 x g_height16 luma samples,
    // then Cb and Cr, no padding) to dst.
    void copy_reconstruction(unsigned char* dst) const;

    // ---- frame: pictures and slices ----
    void doFrameI();
    void doFrameP();
    void code_picture();
    bool code_slice_data();
    void load_row(int mb_y);
    void setSliceHeader();
    void writeSliceHeader();
    void initFrameParams();
    void manageRefBuffers();

    // ---- bits: bit writer, NAL units, parameter sets ----
    // Writes the low `length` (1..kMaxWrite) bits of value, most significant first; the other bits
    // of value must be 0. Clears at least the bit that follows and the rest of its byte, which is
    // what the next write builds on.
    static constexpr int kMaxWrite = 56;
    void write_bits(std::uint64_t value, int length) {
        std::uint8_t* byte = g_nal_buf + (g_nal_bitpos >> 3);
        const std::uint64_t window =
            static_cast<std::uint64_t>(*byte) << 56 | value << (64 - (g_nal_bitpos & 7) - length);
        for (int i = 0; i < 8; ++i) {
            byte[i] = static_cast<std::uint8_t>(window >> (56 - 8 * i));
        }
        g_nal_bitpos += static_cast<unsigned>(length);
    }
    void ResetNALUnit();
    unsigned char* GetNALUnit(int* bits) const;
    void writeNALbyte(unsigned forbidden_zero_bit, unsigned nal_ref_idc, unsigned nal_unit_type);
    void write_uvlc_unsigned(unsigned v);
    void write_uvlc_signed(int v);
    void writeSPS();
    void writePPS();
    // Ends the RBSP with its stop bit and inserts the emulation prevention bytes. Returns false,
    // with the buffer's content to be discarded, when they do not fit the buffer or the list.
    bool writeNALUnit();

    // ---- rate_control ----
    void InitRateControl();
    void check_level_limit() const;
    void UpdateRateControlFrameRate(double fps);
    void FrameLevelRateControl();
    void UpdateFrameLevelRateControl();
    void SetMADParameter();
    void SetRDQParameter();
    void start_rate_control();
    unsigned pictures_left() const;
    int bit_budget(unsigned pictures) const;
    void choose_qp_I();
    void choose_qp_P();
    void fit_rate_model(int first, int window, const bool* rejected, int n);
    static double QP2Qstep(int qp);
    static int Qstep2QP(double q);

    // ---- mem_alloc ----
    void allocate_memory();
    void free_memory();
    void allocBitBuff();
    void freeBitBuff();
    void allocGlobal();
    void freeGlobal();
    void allocGlobal2();
    void freeGlobal2();
    void allocImageBuffers();
    void freeImageBuffers();
    void allocFramePred();
    void freeFramePred();

    // ---- macroblock ----
    void processCurrentMB_I();
    void processCurrentMB_P();
    void setMBOffsets();
    void prefetch_reference() const;
    std::ptrdiff_t first_block() const;
    void code_intra();
    void code_intra4x4();
    void set_block_availability();
    void generatePredError16x16();
    void predict_inter_chroma();
    void setMBType_CBP();
    void set_pred_MVD();
    void setMBValues_P();

    // ---- transform ----
    void quantTransform_luma_4x4(int k, const std::uint8_t* pred);
    void quantTransform_luma_16x16();
    void quantTransform_luma_16x16P();
    void quantTransform_chroma();
    std::uint32_t quantize_chroma_dc(int component, const std::int16_t* c,
                                     const zolt::Quantizer& quantizer, std::int16_t* coefs);

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
    void compute_block_features();

    // ---- cavlc: macroblock_layer(), clauses 7.3.5 and 9.2 ----
    void writeMBSyntax();
    void writeMBSyntax_P();
    bool encode_mb_skip();
    void encode_I4Modes();
    void encode_MB_Pred_P();
    void encode_CBP();
    void encode_coded_blocks();
    void encodeBlock();
    void encode_luma_blocks();
    void encode_chroma_ac_blocks(int component);
    std::uint8_t encodeCAVLCBlock4x4(const std::int16_t* levels, unsigned nonzero, int count,
                                     int table);

    // ---- diamond: motion search ----
    void initDiamond(std::uint8_t range, std::uint8_t method, std::uint8_t subpel);
    void framePredInitP();
    void make_half_pixel_sds(int end);
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
    void filter_mb_row(int mb_y);
    void filter_mb(int mb_x, int mb_y);
    void find_edge_strengths(int mb_x, int mb_y);
    bool vectors_differ(int mb, int other) const;

    // Writes msg and a line break to standard error and ends the process with status.
    [[noreturn]] static void exitOnError(const char* msg, int status);
    // Reports a failed allocation and ends the process with status 106.
    [[noreturn]] static void memError(const char* what);

    // The member functions above work on the state below; it is public so that tests and
    // benchmarks can reach every unit.

    const zolt::Kernels* g_kernels;  // sample loops, chosen at construction, not owned

    // ---- Geometry, fixed at construction ----
    int g_width, g_height;          // luma samples as given
    int g_mb_width, g_mb_height;    // macroblocks
    int g_width16, g_height16;      // luma samples, rounded down to multiples of 16
    int g_cwidth, g_cheight;        // chroma samples of the rounded-down size
    int g_num_mbs;                  // macroblocks of a picture
    int g_blk_width, g_blk_height;  // 4x4 blocks per row and column

    // ---- Coding parameters, written by the setters ----
    int g_qp = 10;                 // QP of set_qp
    int g_bit_rate = 200000;       // bit/s
    bool g_rc_enable = false;      // the last bit rate was above 0
    double g_frame_rate = 25.0;    // frames/s
    unsigned g_intra_period = 25;  // frames
    unsigned g_inter_period = 1;   // frames

    // ---- Picture state, written per frame by encode_frame and the picture coder ----
    unsigned g_frame_counter = 0;           // input frames since initialize_encoder
    std::uint8_t g_pic_type = 0;            // I_SLICE or P_SLICE
    std::uint8_t g_idr_flag = 0;            // 1: IDR picture
    const std::uint8_t* g_frame = nullptr;  // the caller's frame, borrowed while it is coded
    int g_gop_pos = 0;                      // frame counter mod intra period
    int g_frame_num = -1;                   // frame_num, 16 bits
    int g_poc = 0;                          // pictures since the last IDR picture, 16 bits
    int g_coded_frames = 0;                 // pictures coded since initialize_encoder
    int g_mbQp = 10;                        // QP of the current picture, 0..51
    int g_mapMBNumber = 0;                  // address of the current macroblock, raster order
    std::uint8_t g_prev_idr = 0;            // the previous picture was an IDR picture
    std::uint8_t g_num_ref_active = 1;      // active list-0 references
    int g_skip_run = 0;         // mb_skip_run: skipped macroblocks since the last coded one
    unsigned g_slice_bits = 0;  // NAL header, slice header and slice data of the last picture

    // ---- Records ----
    zolt::AlignedBuffer<seq_par_set_t> g_sps;
    zolt::AlignedBuffer<pic_par_set_t> g_pps;
    zolt::AlignedBuffer<slice_par_t> g_slp;

    // ---- NAL buffer ----
    zolt::AlignedBuffer<std::uint8_t> g_nal_buf;  // g_nal_buf_size bytes, room for one write_bits
    zolt::AlignedBuffer<int> g_nal_emul_pos;      // positions before which a byte 3 is inserted
    int g_nal_buf_size = 0;                       // bytes
    int g_nal_emul_size = 0;                      // entries
    unsigned g_nal_bitpos = 0;                    // bits written

    // ---- Pictures ----
    // Two pictures with borders, in one block; the planes' strides are g_stride_luma and
    // g_stride_chroma, the pointers address sample (0, 0). The current picture holds the input
    // frame and is overwritten by its reconstruction as coding proceeds; the two change places
    // when it becomes the reference.
    zolt::AlignedBuffer<std::uint8_t> g_alloc_images;
    std::uint8_t *g_cur_y = nullptr, *g_cur_u = nullptr, *g_cur_v = nullptr;
    std::uint8_t *g_ref_y = nullptr, *g_ref_u = nullptr, *g_ref_v = nullptr;
    // Half-sample planes of the reference (sample (0, 0)): half a pel below, right, and both.
    zolt::AlignedBuffer<std::uint8_t> g_half_planes;
    std::uint8_t *g_half_v_L0 = nullptr, *g_half_h_L0 = nullptr, *g_half_hv_L0 = nullptr;

    // ---- Per-macroblock maps of the picture ----
    zolt::AlignedBuffer<std::uint8_t> g_mb_mode;  // MbMode
    zolt::AlignedBuffer<std::uint8_t> g_mb_qp;    // luma QP
    zolt::AlignedBuffer<lfdata> g_lf_data;
    // Inter: 4x4 luma blocks with levels, raster order.
    zolt::AlignedBuffer<std::uint16_t> g_coded_blocks;
    zolt::AlignedBuffer<_mv> g_mv_array;  // 16x16 search results
    zolt::AlignedBuffer<_mv> g_me_mb_L0;  // their integer stage: the neighbours of later searches

    // ---- Per-4x4-block maps of the picture, g_blk_width entries per row ----
    // Intra 4x4 modes with a border row above and a border column on either side, g_blk_width + 2
    // entries per row; -1: no such block, 2: no intra 4x4 block.
    zolt::AlignedBuffer<std::int8_t> g_i4mode;
    zolt::AlignedBuffer<std::int8_t> g_blk_ref;              // reference index, -1: intra
    zolt::AlignedBuffer<std::int16_t> g_blk_mvx, g_blk_mvy;  // quarter pels
    zolt::AlignedBuffer<std::uint8_t> g_cnum_l;              // TotalCoeff of luma blocks
    zolt::AlignedBuffer<std::uint8_t> g_cnum_u, g_cnum_v;  // of Cb and Cr, g_blk_width / 2 per row

    // ---- Current macroblock ----
    int g_mb_x = 0, g_mb_y = 0;               // position in macroblocks
    std::uint8_t g_mb_up = 0, g_mb_left = 0;  // 1: the macroblock above / to the left exists
    std::uint8_t* g_mb_src_y = nullptr;       // its samples in the current picture
    std::uint8_t* g_mb_src_u = nullptr;
    std::uint8_t* g_mb_src_v = nullptr;
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

    // Prediction samples: luma 16x16, Cb 8x8, Cr 8x8.
    alignas(64) std::uint8_t g_mb_pred[384] = {};
    // Scaled coefficients (level * dequant) of luma blocks 0..15 in decoding order and of the four
    // blocks of Cb and of Cr; inside a block column by column. Those of a block without levels are
    // left over from others, or 0 where the DC coefficients have a transform of their own.
    alignas(64) std::int16_t g_mb_coefs[24 * 16] = {};
    // Levels of the same blocks in zig-zag order, left over from others where a block has none, and
    // masks of the levels that are not 0.
    alignas(64) std::int16_t g_scan_levels[24 * 16] = {};
    std::uint16_t g_nonzero[24] = {};
    // DC levels: intra 16x16 in zig-zag order, chroma in raster order.
    std::int16_t g_luma_dc[16] = {};
    std::int16_t g_chroma_dc[2][4] = {};
    // Coded-block masks: bit per block with levels (without the DC levels above).
    unsigned g_luma_mask = 0, g_chroma_ac_mask = 0;
    unsigned g_chroma_dc_mask = 0;  // bit 0 Cb, bit 1 Cr

    // Block-sum features of the learned decisions: sums of the 4x4 blocks in raster order, and
    // energy of their Hadamard transform (Kernels::hadamard_energy).
    std::int32_t g_block_sums[16] = {};
    std::int32_t g_block_energy[4] = {};

    // ---- Motion search ----
    int g_search_range = 0;                // pels
    int g_search_method = 0;               // 1: subsampled diamond
    int g_subpel_enable = 0;               // 1: refine to quarter pels
    int g_pad_luma = 0, g_pad_chroma = 0;  // borders of the planes, samples
    int g_stride_luma = 0, g_stride_chroma = 0;
    int g_origin_luma = 0, g_origin_chroma = 0;  // offset of sample (0, 0) in a plane
    int g_size_Y = 0, g_size_U = 0;              // samples of a plane with its borders
    int g_visit_dim = 0;                         // rows and columns of the table of visited vectors
    // Samples that quarter-pel candidates average with the result's own: plane (0 reference, then
    // the half-sample planes below, right, both) and offset in samples, by the kind of the result's
    // sample: integer, right, below, both.
    struct plane_offset_t {
        std::ptrdiff_t plane, offset;
    };
    plane_offset_t g_quarter_samples[4][8];
    // Stamp of the last search that evaluated each vector, [x + offset][y + offset].
    zolt::AlignedBuffer<std::uint32_t> g_visit_L0;
    int g_half_rows_end = 0;          // picture row where the half-sample planes end that are built
    std::uint32_t g_visit_stamp = 0;  // stamp of the running search

    // ---- Deblocking: boundary strengths of the current macroblock ----
    // Four segments of 8 bits each, the first lowest; edge 0 is the left or the top one.
    std::uint32_t bs_ver[4] = {};
    std::uint32_t bs_hor[4] = {};

    // ---- Rate control ----
    bool g_rc_initialized = false;  // InitRateControl has run since initialize_encoder
    // Intra period of the previous picture in frames; 0: it was not coded under rate control.
    unsigned g_rc_period = 0;
    unsigned g_rc_target_rate = 200000;       // bit/s
    double g_rc_frame_rate = 25.0;            // frames/s of the per-picture budget
    double g_rc_bpp = 0;                      // bits per pixel
    double g_rc_bpp_l1 = 0, g_rc_bpp_l2 = 0;  // thresholds of g_rc_bpp for the first QP
    int g_rc_max_br = 0;                      // kbit/s, Table A-1
    int g_rc_max_cpb = 0;                     // bits, Table A-1
    int g_rc_buffer = 0;                      // virtual buffer fullness, bits
    int g_rc_target_level = 0;                // buffer level after the last I picture, bits
    int g_rc_remaining_bits = 0;              // bits left for the intra period
    int g_rc_gop_len = 0;                    // pictures since the last I picture, that one included
    int g_rc_np = 0, g_rc_nb = 0;            // P and B pictures of the intra period
    int g_rc_coded_p = 0, g_rc_coded_b = 0;  // P and B pictures coded in it
    bool g_rc_first_p = true;                // no P picture since InitRateControl
    int g_rc_prev_qp = 0;                    // QP of the previous picture
    std::int16_t g_rc_i_qp = 0;              // QP of the intra period's I picture
    std::int16_t g_rc_qp_range = 0;          // allowed drift from g_rc_i_qp
    int g_rc_prev_bits = 0;                  // bits of the previous picture
    double g_rc_xp = 0, g_rc_xb = 0;         // smoothed bits x QP of P and B pictures
    double g_rc_gamma = 0.5, g_rc_beta = 0.5;
    int g_rc_target_bits = 0;            // target of the P picture
    int g_rc_upper = 0, g_rc_lower = 0;  // bounds of the target
    double g_rc_cur_mad = 0, g_rc_pred_mad = 0;
    double g_rc_mad_c1 = 1, g_rc_mad_c2 = 0;  // MAD prediction: c1 * MAD + c2
    double g_rc_x1 = 0, g_rc_x2 = 0;          // rate model: R = x1 / Q + x2 / Q^2
    double g_rc_mad_hist[16] = {};            // MAD of the last P pictures
    double g_rc_rate_hist[16] = {};           // their bits / MAD
    double g_rc_qstep_hist[16] = {};          // their Qstep
    std::uint8_t g_rc_hist_idx = 0;           // next slot of the histories
    std::uint8_t g_rc_hist_count = 0;         // filled slots
};
