#pragma once

#include <cstdint>

// The stream's parameters as they stand when a picture is coded.
struct rc_stream_t {
    int bit_rate;           // bit/s
    double frame_rate;      // frames/s
    unsigned intra_period;  // frames
    int qp;                 // of the first picture; 0: chosen by the bits per pixel
    int level_idc;
};

// A picture, before it is coded.
struct rc_picture_t {
    bool inter;        // a P picture
    int gop_pos;       // position in the intra period
    int coded_frames;  // pictures coded before it since initialize_encoder
    int qp;            // of the picture before
};

// Chooses the QP of every picture, so that the stream keeps to its bit rate: a budget of bits for
// the intra period, a virtual buffer, and a model of bits by QP that every P picture is learned
// from. Lives as long as the stream; touched between pictures only.
class RateControl {
public:
    // width, height: of the pictures in luma samples, as given.
    RateControl(int width, int height);

    // Puts the controller into its first state.
    void InitRateControl(const rc_stream_t& stream);
    // Ends the process (status 109) when the bit rate is above the level's limit.
    void check_level_limit() const;
    void UpdateRateControlFrameRate(double fps);
    // The QP of the picture about to be coded.
    int FrameLevelRateControl(const rc_stream_t& stream, const rc_picture_t& picture);
    // Learns from the picture just coded with `qp`: its bits, and the sum of the distortions that
    // its macroblocks' searches found; num_mbs: their number.
    void UpdateFrameLevelRateControl(const rc_stream_t& stream, const rc_picture_t& picture, int qp,
                                     int bits, std::int64_t sad, int num_mbs);

    void SetMADParameter();
    void SetRDQParameter();
    static double QP2Qstep(int qp);
    static int Qstep2QP(double q);

    // The members are public so that tests can reach them.

    int g_width, g_height;          // luma samples
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

private:
    void start_rate_control(const rc_stream_t& stream, const rc_picture_t& picture);
    int bit_budget(unsigned pictures) const;
    int choose_qp_I(const rc_stream_t& stream, const rc_picture_t& picture);
    int choose_qp_P(const rc_stream_t& stream, const rc_picture_t& picture);
    void fit_rate_model(int first, int window, const bool* rejected, int n);
};
