#pragma once

#include <cstddef>
#include <cstdint>

#include "encoder/AlignedBuffer.h"
#include "encoder/BitWriter.h"
#include "encoder/Picture.h"
#include "encoder/RateControl.h"
#include "encoder/Wavefront.h"
#include "encoder/WorkerPool.h"
#include "kernels/Kernels.h"

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

    // Threads for the pictures to come, borrowed; null, the default, for none. The bytes do not
    // depend on them.
    void set_worker_pool(WorkerPool* pool) { g_worker_pool = pool; }

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
    unsigned char* get_nal_buffer() const { return nal.g_nal_buf; }
    int get_nal_size() const { return static_cast<int>((nal.g_nal_bitpos + 7) / 8); }
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
    void setSliceHeader();
    void writeSliceHeader();

    // ---- bits: NAL units, parameter sets ----
    void ResetNALUnit();
    unsigned char* GetNALUnit(int* bits) const;
    void writeNALbyte(unsigned forbidden_zero_bit, unsigned nal_ref_idc, unsigned nal_unit_type);
    void writeSPS();
    void writePPS();
    // Ends the RBSP with its stop bit and inserts the emulation prevention bytes. Returns false,
    // with the buffer's content to be discarded, when they do not fit the buffer or the list.
    bool writeNALUnit();

    // ---- rate_control ----
    rc_stream_t rate_control_stream() const;
    rc_picture_t rate_control_picture() const;
    std::int64_t sum_of_distortions() const;

    // ---- mem_alloc ----
    void allocate_memory();
    void free_memory();
    void allocBitBuff();
    void freeBitBuff();

    // The members are public so that tests and benchmarks can reach every unit.

    // ---- Coding parameters, written by the setters ----
    int g_qp = 10;                 // QP of set_qp
    int g_bit_rate = 200000;       // bit/s
    bool g_rc_enable = false;      // the last bit rate was above 0
    double g_frame_rate = 25.0;    // frames/s
    unsigned g_intra_period = 25;  // frames
    unsigned g_inter_period = 1;   // frames
    WorkerPool* g_worker_pool = nullptr;

    // ---- Picture state, written per frame by encode_frame and the picture coder ----
    unsigned g_frame_counter = 0;  // input frames since initialize_encoder
    std::uint8_t g_pic_type = 0;   // I_SLICE or P_SLICE
    std::uint8_t g_idr_flag = 0;   // 1: IDR picture
    int g_gop_pos = 0;             // frame counter mod intra period
    int g_frame_num = -1;          // frame_num, 16 bits
    int g_poc = 0;                 // pictures since the last IDR picture, 16 bits
    int g_coded_frames = 0;        // pictures coded since initialize_encoder
    std::uint8_t g_prev_idr = 0;   // the previous picture was an IDR picture
    unsigned g_slice_bits = 0;     // NAL header, slice header and slice data of the last picture

    // ---- Records ----
    zolt::AlignedBuffer<seq_par_set_t> g_sps;
    zolt::AlignedBuffer<pic_par_set_t> g_pps;

    // ---- The NAL unit under construction ----
    BitWriter nal;                            // with room for one row more than its size
    zolt::AlignedBuffer<int> g_nal_emul_pos;  // positions before which a byte 3 is inserted
    int g_nal_buf_size = 0;                   // bytes that a NAL unit may have
    int g_nal_emul_size = 0;                  // entries

    // ---- Rooms ----
    Picture picture;
    Wavefront rows;
    RateControl rate_control;
};
