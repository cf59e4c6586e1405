#include <algorithm>
#include <cmath>
#include <limits>

#include "encoder/RateControl.h"
#include "encoder/errors.h"

namespace {

constexpr int kHistory = 16;
constexpr int kMinQp = 18;
constexpr int kMaxQp = 45;
constexpr double kSingular = 1e-6;  // determinants up to here have no solution

constexpr double QP2QSTEP[6] = {0.625, 0.6875, 0.8125, 0.875, 1.0, 1.125};

// MaxBR (kbit/s) and MaxCPB (bits) of a level, Table A-1.
struct LevelLimit {
    int level_idc;
    int max_br;
    int max_cpb;
};

constexpr LevelLimit kLevelLimits[] = {
    {10, 64, 175000},        {11, 192, 500000},      {12, 384, 1000000},    {13, 768, 2000000},
    {20, 2000, 2000000},     {21, 4000, 4000000},    {22, 4000, 4000000},   {30, 10000, 10000000},
    {31, 14000, 14000000},   {40, 20000, 25000000},  {41, 50000, 62500000}, {42, 50000, 62500000},
    {50, 135000, 135000000}, {51, 240000, 240000000}};
constexpr LevelLimit kOtherLevel = {0, 20000, 20000000};

LevelLimit level_limit(int level_idc) {
    for (const LevelLimit& limit : kLevelLimits) {
        if (limit.level_idc == level_idc) {
            return limit;
        }
    }
    return kOtherLevel;
}

// Truncates toward zero and saturates; not-a-number gives 0.
int truncate(double value) {
    if (std::isnan(value)) {
        return 0;
    }
    if (value >= std::numeric_limits<int>::max()) {
        return std::numeric_limits<int>::max();
    }
    if (value <= std::numeric_limits<int>::min()) {
        return std::numeric_limits<int>::min();
    }
    return static_cast<int>(value);
}

int saturate(std::int64_t value) {
    return static_cast<int>(std::clamp<std::int64_t>(value, std::numeric_limits<int>::min(),
                                                     std::numeric_limits<int>::max()));
}

void increment(int& count) {
    count = saturate(std::int64_t{count} + 1);
}

// How far QPs may drift from the I picture's in intra periods of so many frames.
std::int16_t qp_range(unsigned intra_period) {
    return static_cast<std::int16_t>(
        std::clamp(intra_period / 10 + 2, 3u, unsigned{std::numeric_limits<std::int16_t>::max()}));
}

// Pictures of the intra period that are not coded yet, the coming one included.
unsigned pictures_left(const rc_stream_t& stream, const rc_picture_t& picture) {
    return stream.intra_period - static_cast<unsigned>(picture.gop_pos);
}

}  // namespace

RateControl::RateControl(int width, int height) : g_width(width), g_height(height) {}

void RateControl::InitRateControl(const rc_stream_t& stream) {
    g_rc_initialized = true;
    g_rc_first_p = true;
    std::fill(g_rc_mad_hist, g_rc_mad_hist + kHistory, 0.0);
    std::fill(g_rc_rate_hist, g_rc_rate_hist + kHistory, 0.0);
    std::fill(g_rc_qstep_hist, g_rc_qstep_hist + kHistory, 0.0);
    g_rc_hist_idx = 0;
    g_rc_hist_count = 0;
    g_rc_frame_rate = stream.frame_rate;
    if (g_width <= 176) {
        g_rc_bpp_l1 = 0.1;
        g_rc_bpp_l2 = 0.3;
    } else if (g_width <= 352) {
        g_rc_bpp_l1 = 0.2;
        g_rc_bpp_l2 = 0.6;
    } else {
        g_rc_bpp_l1 = 0.6;
        g_rc_bpp_l2 = 1.4;
    }
    g_rc_target_rate = static_cast<unsigned>(stream.bit_rate);
    g_rc_bpp = g_rc_target_rate / stream.frame_rate / g_width / g_height;

    const LevelLimit limit = level_limit(stream.level_idc);
    g_rc_max_br = limit.max_br;
    g_rc_max_cpb = limit.max_cpb;

    g_rc_gop_len = saturate(stream.intra_period);
    g_rc_np = g_rc_gop_len;  // one anchor per frame: the inter period is 1
    g_rc_nb = 0;
    g_rc_coded_p = g_rc_coded_b = 0;
    g_rc_xp = g_rc_xb = 0;
    g_rc_gamma = 0.5;
    g_rc_beta = 0.5;
    g_rc_mad_c1 = 1.0;
    g_rc_mad_c2 = 0;
    g_rc_cur_mad = g_rc_pred_mad = 0;
    g_rc_x1 = g_rc_x2 = 0;
    g_rc_upper = g_rc_max_cpb;
    g_rc_lower = 0;
    g_rc_target_level = g_rc_max_cpb / 2;
    g_rc_qp_range = qp_range(stream.intra_period);
    g_rc_buffer = 0;
    g_rc_remaining_bits = 0;
    g_rc_prev_bits = 0;
    g_rc_target_bits = 0;
    g_rc_prev_qp = 0;
    g_rc_i_qp = 0;
}

void RateControl::check_level_limit() const {
    if (g_rc_target_rate > static_cast<unsigned>(g_rc_max_br) * 1000) {
        exitOnError(
            "bit rate exceeds the maximum allowed bit rate for the given level, check the standard",
            109);
    }
}

void RateControl::UpdateRateControlFrameRate(double fps) {
    g_rc_frame_rate = fps;
}

int RateControl::FrameLevelRateControl(const rc_stream_t& stream, const rc_picture_t& picture) {
    if (g_rc_period == 0) {
        start_rate_control(stream, picture);
    } else if (g_rc_period != stream.intra_period) {
        g_rc_qp_range = qp_range(stream.intra_period);
        if (picture.inter) {
            g_rc_i_qp = static_cast<std::int16_t>(g_rc_prev_qp);
        }
    }
    return picture.inter ? choose_qp_P(stream, picture) : choose_qp_I(stream, picture);
}

// Puts the controller into its first state where the picture before was not coded under it.
void RateControl::start_rate_control(const rc_stream_t& stream, const rc_picture_t& picture) {
    if (picture.coded_frames == 0) {
        if (!g_rc_initialized) {
            InitRateControl(stream);
        }
        return;
    }
    InitRateControl(stream);
    g_rc_buffer = g_rc_target_level;
    g_rc_prev_qp = picture.qp;
    g_rc_i_qp = static_cast<std::int16_t>(picture.qp);
}

// The bits of so many pictures, less what the buffer holds above its target.
int RateControl::bit_budget(unsigned pictures) const {
    return truncate(g_rc_target_rate / g_rc_frame_rate * pictures -
                    (g_rc_buffer - g_rc_target_level));
}

int RateControl::choose_qp_I(const rc_stream_t& stream, const rc_picture_t& picture) {
    // The first intra period is as long as it was when the controller was initialised.
    unsigned pictures = pictures_left(stream, picture);
    int qp;
    if (picture.coded_frames == 0) {
        g_rc_buffer = g_rc_target_level;
        pictures = static_cast<unsigned>(g_rc_gop_len);
        if (stream.qp >= 1) {
            qp = stream.qp;
        } else {
            qp = g_rc_bpp <= g_rc_bpp_l1 ? 35 : g_rc_bpp <= g_rc_bpp_l2 ? 25 : 20;
        }
    } else {
        qp = g_rc_prev_qp;
        if (g_rc_buffer < g_rc_max_cpb * 3 / 5) {
            --qp;
        } else if (g_rc_buffer > g_rc_max_cpb * 4 / 5) {
            ++qp;
        }
        qp = std::clamp(qp, kMinQp, kMaxQp);
    }
    g_rc_remaining_bits = bit_budget(pictures);
    g_rc_prev_qp = qp;
    g_rc_i_qp = static_cast<std::int16_t>(qp);
    g_rc_coded_p = g_rc_coded_b = 0;
    g_rc_nb = g_rc_gop_len - g_rc_np;
    g_rc_np = 1;
    g_rc_gop_len = 1;
    return qp;
}

int RateControl::choose_qp_P(const rc_stream_t& stream, const rc_picture_t& picture) {
    // A start and a change of the intra period make a new budget; at a start the buffer is at its
    // target.
    const unsigned left = pictures_left(stream, picture);
    g_rc_remaining_bits = g_rc_period == stream.intra_period
                              ? saturate(std::int64_t{g_rc_remaining_bits} - g_rc_prev_bits)
                              : bit_budget(left);
    increment(g_rc_coded_p);
    increment(g_rc_np);
    increment(g_rc_gop_len);
    if (g_rc_first_p) {
        return picture.qp;  // the I picture's
    }

    const int from_buffer = truncate((g_rc_target_level - g_rc_buffer) * g_rc_gamma +
                                     g_rc_target_rate / g_rc_frame_rate + 0.5);
    const int from_budget = truncate(g_rc_remaining_bits * g_rc_xp /
                                     ((g_rc_nb - g_rc_coded_b) * g_rc_xb + g_rc_xp * left + 1.0));
    int target = truncate(g_rc_beta * from_budget + (1 - g_rc_beta) * from_buffer);
    target = std::max(std::min(target, g_rc_upper), g_rc_lower);
    g_rc_target_bits = target;

    g_rc_pred_mad = g_rc_mad_c1 * g_rc_cur_mad + g_rc_mad_c2;

    int qp;
    if (target < 1) {
        qp = 51;
    } else {
        // The positive root of target = x1 * M / Q + x2 * M / Q^2.
        const double mad = g_rc_pred_mad;
        const double discriminant = (g_rc_x1 * g_rc_x1) * (mad * mad) + 4 * g_rc_x2 * mad * target;
        double qstep;
        if (discriminant < 0 || g_rc_x1 * mad + discriminant <= 0) {
            qstep = g_rc_x1 * mad / target;
        } else {
            qstep = (g_rc_x1 * mad + std::sqrt(discriminant)) / (2.0 * target);
        }
        qp = Qstep2QP(qstep);
    }
    qp = std::max(qp, g_rc_prev_qp - 2);
    qp = std::min(qp, g_rc_prev_qp + 2);
    if (qp - g_rc_i_qp > g_rc_qp_range) {
        qp = g_rc_i_qp + g_rc_qp_range;
    } else if (qp - g_rc_i_qp < -2 * g_rc_qp_range) {
        qp = g_rc_i_qp - 2 * g_rc_qp_range;
    }
    return std::clamp(qp, kMinQp, kMaxQp);
}

void RateControl::UpdateFrameLevelRateControl(const rc_stream_t& stream,
                                              const rc_picture_t& picture, int qp, int bits,
                                              std::int64_t sad, int num_mbs) {
    g_rc_period = stream.intra_period;
    g_rc_prev_bits = bits;
    g_rc_buffer = truncate(std::int64_t{g_rc_buffer} + bits - g_rc_target_rate / g_rc_frame_rate);
    g_rc_buffer = std::min(std::max(g_rc_buffer, 0), g_rc_max_cpb);
    g_rc_prev_qp = qp;
    if (!picture.inter) {
        g_rc_i_qp = static_cast<std::int16_t>(qp);
        g_rc_target_level = g_rc_buffer;
        return;
    }

    g_rc_xp = 7 * g_rc_xp * 0.125 + std::int64_t{bits} * qp * 0.125;

    const double mad =
        static_cast<double>(std::max<std::int64_t>(sad, 1)) / (std::int64_t{num_mbs} * 256);
    g_rc_mad_hist[g_rc_hist_idx] = mad;
    g_rc_cur_mad = mad;
    SetMADParameter();

    g_rc_rate_hist[g_rc_hist_idx] = bits / mad;
    g_rc_qstep_hist[g_rc_hist_idx] = QP2Qstep(qp);
    g_rc_hist_idx = static_cast<std::uint8_t>((g_rc_hist_idx + 1) % kHistory);
    g_rc_hist_count = static_cast<std::uint8_t>(std::min(g_rc_hist_count + 1, kHistory));
    SetRDQParameter();
    g_rc_first_p = false;
}

// Fits the line of each MAD on the one after it; the newest MAD is stored, the index not advanced.
void RateControl::SetMADParameter() {
    if (g_rc_first_p) {
        g_rc_mad_c1 = 1;
        g_rc_mad_c2 = 0;
        return;
    }
    const bool full = g_rc_hist_count == kHistory;
    const int first = full ? g_rc_hist_idx + 1 : 0;
    const int n = full ? kHistory - 1 : g_rc_hist_count;
    double sx = 0, sy = 0, syy = 0, sxy = 0;
    for (int k = 0; k < n; ++k) {
        const double x = g_rc_mad_hist[(first + k) % kHistory];
        const double y = g_rc_mad_hist[(first + k + 1) % kHistory];
        sy += y;
        syy += y * y;
        sx += x;
        sxy += x * y;
    }
    const double det = n * syy - sy * sy;
    if (std::fabs(det) <= kSingular) {
        g_rc_mad_c2 = 0;
        g_rc_mad_c1 = sx / sy;
    } else {
        g_rc_mad_c2 = (syy * sx - sy * sxy) / det;
        g_rc_mad_c1 = (sxy * n - sx * sy) / det;
    }
}

// Fits R = x1 / Q + x2 / Q^2 to the history, once, and again without the outliers.
void RateControl::SetRDQParameter() {
    const bool full = g_rc_hist_count == kHistory;
    const int first = full ? g_rc_hist_idx + 1 : 0;
    const int window = full ? kHistory - 1 : g_rc_hist_count;
    bool rejected[kHistory] = {};
    int n = window;
    fit_rate_model(first, window, rejected, n);

    double errors[kHistory];
    double sum = 0;
    for (int k = 0; k < window; ++k) {
        const double q = g_rc_qstep_hist[(first + k) % kHistory];
        const double e = g_rc_x2 / (q * q) + g_rc_x1 / q - g_rc_rate_hist[(first + k) % kHistory];
        errors[k] = std::fabs(e);
        sum += e * e;
    }
    const double threshold = g_rc_hist_count == 2 ? 0 : std::sqrt(sum / g_rc_hist_count);
    for (int k = 0; k < window; ++k) {
        if (errors[k] > threshold) {
            rejected[k] = true;
            --n;
        }
    }
    // The newest picture always counts; n is not raised again, so that it may be below the number
    // of pictures that the second fit runs over, even 0, which makes x1 infinite.
    rejected[window - 1] = false;
    fit_rate_model(first, window, rejected, n);
}

// One fit over the pictures not rejected; n divides the mean.
void RateControl::fit_rate_model(int first, int window, const bool* rejected, int n) {
    double mean = 0;
    double a = 0, b = 0, c = 0, d = 0;
    int m = 0;
    double first_q = 0;
    bool differ = false;
    for (int k = 0; k < window; ++k) {
        if (rejected[k]) {
            continue;
        }
        const double q = g_rc_qstep_hist[(first + k) % kHistory];
        const double r = g_rc_rate_hist[(first + k) % kHistory];
        if (m == 0) {
            first_q = q;
        }
        differ = differ || q != first_q;
        mean += q * r / n;
        a += 1 / q;
        b += 1 / (q * q);
        c += r;
        d += q * r;
        ++m;
    }
    g_rc_x1 = mean;
    g_rc_x2 = 0;
    if (differ && n > 0) {
        const double det = b * m - a * a;
        if (std::fabs(det) <= kSingular) {
            g_rc_x1 = d / m;
        } else {
            g_rc_x1 = (d * b - c * a) / det;
            g_rc_x2 = (c * m - d * a) / det;
        }
    }
}

double RateControl::QP2Qstep(int qp) {
    double qstep = QP2QSTEP[qp % 6];
    for (int i = 0; i < qp / 6; ++i) {
        qstep *= 2;
    }
    return qstep;
}

int RateControl::Qstep2QP(double q) {
    if (q < QP2QSTEP[0]) {
        return 0;
    }
    if (q > 0.875 * 256) {
        return 51;
    }
    int doublings = 0;
    while (q > QP2QSTEP[5]) {
        q /= 2;
        ++doublings;
    }
    const int rem = q <= 0.65625   ? 0
                    : q <= 0.75    ? 1
                    : q <= 0.84375 ? 2
                    : q <= 0.9375  ? 3
                    : q <= 1.0625  ? 4
                                   : 5;
    return rem + 6 * doublings;
}
