#include <algorithm>
#include <initializer_list>
#include <limits>

#include "encoder/MacroblockCoder.h"
#include "encoder/tables.h"

namespace {

// Factors of the mean cost at which a candidate of the 16x16 mode search is dropped, by step, in
// quarters. A cost compares with factor * sum / count in double precision as it does in integers
// when everything is multiplied by four times the count. With factor 1 at least one of several
// candidates goes, as not all are below the mean: after the last of these steps one is left at
// most.
constexpr int kLastStep16 = 6;
constexpr int thresh_16[kLastStep16 + 1] = {9, 7, 6, 5, 4, 4, 4};

// Factors of the mean cost above which a candidate of the chroma mode search is dropped, by step.
// They are fifths, which doubles do not hold: where a cost times five times the count equals the
// sum times five times the factor, rounding decides.
constexpr double thresh_chroma[16] = {2.5, 2.5, 2.0, 2.0, 1.6, 1.6, 1.2, 1.2,
                                      1.0, 1.0, 1.0, 1.0, 1.0, 1.0, 1.0, 1.0};

// Factors of the predicted mode's share at which another 4x4 mode is dropped, by step.
constexpr double thresh_4[3] = {2.0, 1.25, 1.0};

// The predicted 4x4 mode is kept up to this distortion.
constexpr int kept_distortion(int lambda) {
    return 8 * lambda + 64;
}

// What another 4x4 mode pays at each phase.
constexpr int other_mode_rate(int lambda) {
    return 2 * lambda;
}

// 4x4 modes that a block lacks the neighbours for (1), by whether there are samples above and to
// the left; what follows the nine modes is padding.
constexpr std::int16_t kUnavailable4[2][2][16] = {
    {{1, 1, 0, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1},
     {1, 0, 0, 1, 1, 1, 1, 1, 0, 1, 1, 1, 1, 1, 1, 1}},
    {{0, 1, 0, 0, 1, 1, 1, 0, 1, 1, 1, 1, 1, 1, 1, 1},
     {0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 1, 1, 1, 1, 1, 1}}};

// Thresholds of the inter/intra tree as cubic polynomials of QP, in groups of four thresholds: four
// cubic coefficients, four quadratic, four linear, four constant.
constexpr float _treepoly_p_l35[48] = {
    0.396436f,   -0.116441f,  -0.012461f, -0.074217f,  //
    -30.936129f, 10.282344f,  1.307947f,  6.329199f,   //
    802.40155f,  -278.76315f, -37.39575f, -167.7116f,  //
    -6452.5205f, 2582.634f,   351.42606f, 1483.402f,   //
    0.292684f,   0.0f,        0.0f,       0.0f,        //
    -24.174469f, 0.0f,        0.0f,       0.0f,        //
    661.51605f,  0.0f,        0.0f,       0.0f,        //
    -5810.929f,  0.0f,        0.0f,       0.0f,        //
    0.780864f,   0.793735f,   0.0f,       0.0f,        //
    -61.603695f, -60.94964f,  0.0f,       0.0f,        //
    1612.2955f,  1538.3248f,  0.0f,       0.0f,        //
    -13234.332f, -12397.91f,  0.0f,       0.0f,
};
constexpr float _treepoly_p_g35[48] = {
    1.751089f,   0.947046f,   0.298134f,   0.408572f,    //
    -206.04788f, -109.98172f, -33.901867f, -48.610813f,  //
    8079.7856f,  4260.11f,    1312.5981f,  1926.6243f,   //
    -104869.03f, -54870.13f,  -17001.115f, -25251.97f,   //
    0.271355f,   0.016247f,   2.677083f,   0.0f,         //
    -30.558363f, -2.014197f,  -320.24258f, 0.0f,         //
    1151.8096f,  86.05494f,   12779.068f,  0.0f,         //
    -14434.155f, -1178.2196f, -169667.84f, 0.0f,         //
    2.273295f,   1.367035f,   0.0f,        0.0f,         //
    -266.52777f, -164.73254f, 0.0f,        0.0f,         //
    10416.214f,  6595.0903f,  0.0f,        0.0f,         //
    -134595.38f, -87233.516f, 0.0f,        0.0f,
};

constexpr int kHighQp = 35;    // from here on the inter/intra tree has its other form
constexpr int kFittedQp = 18;  // lowest QP that the 16x16/4x4 thresholds were fitted for
constexpr int kLargeQp = 32;   // three of those thresholds are 0 up to here

struct Thresholds16_4 {
    int t[7];
};

constexpr Thresholds16_4 compute16_4_thresh(int qp) {
    const double q = qp < kFittedQp ? kFittedQp : qp;
    const bool large = q > kLargeQp;
    Thresholds16_4 thresholds = {{
        static_cast<int>(0.236 * (q * q) - 6.487 * q + 76.65),
        static_cast<int>(0.299 * (q * q) - 12.817 * q + 167.42),
        large ? static_cast<int>(0.208 * (q * q) - 2.476 * q + 36.18) : 0,
        static_cast<int>(0.164 * (q * q * q) - 13.728 * (q * q) + 387.89 * q - 3568.3),
        static_cast<int>(1.009 * (q * q) - 46.551 * q + 584.13),
        large ? static_cast<int>(1.918 * (q * q) - 123.678 * q + 2044.2) : 0,
        large ? static_cast<int>(2.907 * (q * q) - 187.278 * q + 3147.0) : 0,
    }};
    if (qp < kFittedQp) {
        for (int& t : thresholds.t) {
            t = t * qp / kFittedQp;
        }
    }
    return thresholds;
}

// True: intra 16x16. horizontal, vertical, mixed: texture of the block sums.
bool decision_tree16_4(const Thresholds16_4& thresholds, int horizontal, int vertical, int mixed) {
    const int* t = thresholds.t;
    if (t[0] > mixed) {
        return t[1] > mixed || (t[3] > vertical && t[4] > horizontal);
    }
    return t[2] > mixed && t[5] > horizontal && t[6] > vertical;
}

struct ThresholdsPI {
    int t[12];
};

constexpr ThresholdsPI compute_PI_thresh(int qp) {
    const float* table = qp < kHighQp ? _treepoly_p_l35 : _treepoly_p_g35;
    const double q = qp;
    ThresholdsPI thresholds = {};
    for (int k = 0; k < 12; ++k) {
        const float* c = table + 16 * (k / 4) + k % 4;
        const double cubic = c[0], quadratic = c[4], linear = c[8], constant = c[12];
        thresholds.t[k] =
            static_cast<int>(quadratic * (q * q) + cubic * (q * q * q) + linear * q + constant);
    }
    return thresholds;
}

// The thresholds of every QP.
struct ThresholdTables {
    Thresholds16_4 intra16_4[52];
    ThresholdsPI inter_intra[52];
};

constexpr ThresholdTables make_threshold_tables() {
    ThresholdTables tables = {};
    for (int qp = 0; qp < 52; ++qp) {
        tables.intra16_4[qp] = compute16_4_thresh(qp);
        tables.inter_intra[qp] = compute_PI_thresh(qp);
    }
    return tables;
}

constexpr ThresholdTables kThresholds = make_threshold_tables();

// True: inter. x: mixed texture of the source, y: energy of the inter prediction error.
bool decision_treePI(int qp, const ThresholdsPI& thresholds, int x, int y) {
    const int* t = thresholds.t;
    const bool low_energy = t[0] > y;
    if (qp < kHighQp) {
        bool intra;
        if (low_energy) {
            intra = t[1] <= y ? t[4] > x : t[3] <= y && t[2] > x;
        } else {
            intra = t[8] <= y || t[9] > x;
        }
        return !intra;
    }
    if (low_energy) {
        if (t[1] <= x) {
            return true;
        }
        if (t[2] > y) {
            return t[3] > y || t[5] <= x;
        }
        return t[4] <= x && t[6] > y;
    }
    return t[8] > y && t[9] <= x;
}

// The four candidates of a progressive elimination and their running costs, by mode number. Those
// that are dropped go on adding costs, which no longer count.
class Candidates {
public:
    explicit Candidates(std::initializer_list<bool> possible) {
        std::transform(possible.begin(), possible.end(), m_enabled,
                       [](bool is_possible) { return is_possible ? -1 : 0; });
    }

    void add(const std::int32_t* distortion) {
        for (int mode = 0; mode < kModes; ++mode) {
            m_cost[mode] += distortion[mode];
        }
    }

    int number() const { return -(m_enabled[0] + m_enabled[1] + m_enabled[2] + m_enabled[3]); }

    int sum() const {
        int total = 0;
        for (int mode = 0; mode < kModes; ++mode) {
            total += m_cost[mode] & m_enabled[mode];
        }
        return total;
    }

    double mean_cost() const { return static_cast<double>(sum()) / number(); }

    // Whether factor times a candidate's cost equals the value, or one's that was dropped.
    bool any_equals(int factor, int value) const {
        int equal = 0;
        for (int mode = 0; mode < kModes; ++mode) {
            equal |= factor * m_cost[mode] == value ? 1 : 0;
        }
        return equal != 0;
    }

    // Drops those of which factor times the cost exceeds the limit.
    void drop_above(int factor, int limit) {
        for (int mode = 0; mode < kModes; ++mode) {
            m_before[mode] = m_enabled[mode];
            m_enabled[mode] &= factor * m_cost[mode] > limit ? 0 : -1;
        }
    }

    // The candidate of lowest cost among those before the last drop, the first of equal ones.
    int best() const {
        constexpr int kWorst = std::numeric_limits<int>::max();
        int best_mode = 0;
        int best_cost = kWorst;
        for (int mode = 0; mode < kModes; ++mode) {
            const int cost = m_before[mode] ? m_cost[mode] : kWorst;
            best_mode = cost < best_cost ? mode : best_mode;
            best_cost = std::min(cost, best_cost);
        }
        return best_mode;
    }

private:
    static constexpr int kModes = 4;
    int m_enabled[kModes];  // all bits set: enabled
    int m_before[kModes] = {};
    int m_cost[kModes] = {};
};

}  // namespace

// Inter (non-zero) or intra (0) for a macroblock of a P picture, from its source samples and the
// prediction error of its inter prediction in g_mb_pred.
int MacroblockCoder::setLearnPIMode() {
    compute_block_features();
    std::int32_t residual[16];
    g_kernels->block_sums(g_mb_pred, 16, residual);
    for (int b = 0; b < 16; ++b) {
        residual[b] = g_block_sums[b] - residual[b];
    }
    std::int32_t energy[4];
    g_kernels->hadamard_energy(residual, energy);
    const int y = energy[0] + energy[1] + energy[2] + energy[3];
    return decision_treePI(picture.g_mbQp, kThresholds.inter_intra[picture.g_mbQp],
                           g_block_energy[3], y)
               ? 1
               : 0;
}

// Intra 16x16 (16) or intra 4x4 (4). In P pictures the features are those of setLearnPIMode.
int MacroblockCoder::learn16_4() {
    if (picture.g_slp->sliceType == I_SLICE) {
        compute_block_features();
    }
    return decision_tree16_4(kThresholds.intra16_4[picture.g_mbQp], g_block_energy[1],
                             g_block_energy[2], g_block_energy[3])
               ? 16
               : 4;
}

void MacroblockCoder::compute_block_features() {
    g_kernels->block_sums(g_mb_src_y, picture.g_width, g_block_sums);
    g_kernels->hadamard_energy(g_block_sums, g_block_energy);
}

// Intra 16x16 mode of the macroblock; leaves the predictions in g_intra_pred_16x16.
int MacroblockCoder::learn16_mode() {
    alignas(16) std::int32_t distortion[8][4];
    g_kernels->intra_16x16_modes(g_mb_rec_y, picture.g_stride_luma, g_mb_up != 0, g_mb_left != 0,
                                 g_intra_pred_16x16[0], distortion[0]);
    Candidates candidates({g_mb_up != 0, g_mb_left != 0, true, g_mb_up && g_mb_left});
    for (int step = 0; step <= kLastStep16; ++step) {
        candidates.add(distortion[step]);
        const int limit = thresh_16[step] * candidates.sum();
        const int factor = 4 * candidates.number();
        candidates.drop_above(factor, limit - 1);
        if (candidates.number() < 2) {
            break;
        }
    }
    return candidates.best();
}

// Chroma mode of the macroblock; leaves the predictions in g_intra_pred_chroma.
int MacroblockCoder::learn_chroma_mode() {
    constexpr int kLastStep = 11;
    alignas(32) std::int32_t distortion[kLastStep + 1][4];
    g_kernels->intra_chroma_modes(g_mb_rec_u, g_mb_rec_v, picture.g_stride_chroma, g_mb_up != 0,
                                  g_mb_left != 0, g_intra_pred_chroma[0], distortion[0]);
    Candidates candidates({true, g_mb_left != 0, g_mb_up != 0, g_mb_up && g_mb_left});
    const auto add = [&](int step) {
        distortion[step][0] -= g_intra_lambda;
        candidates.add(distortion[step]);
    };
    add(0);
    add(1);
    for (int step = 3; step <= kLastStep; step += 2) {
        add(step - 1);
        add(step);
        // A cost exceeds an integer limit when it exceeds the real one that was rounded down.
        const int number = 5 * candidates.number();
        const int product = static_cast<int>(5 * thresh_chroma[step]) * candidates.sum();
        if (product >= 0 && !candidates.any_equals(number, product)) {
            candidates.drop_above(number, product);
        } else {
            candidates.drop_above(1,
                                  static_cast<int>(thresh_chroma[step] * candidates.mean_cost()));
        }
        // A single one wins, whether it would be dropped later or not.
        if (candidates.number() < 2) {
            break;
        }
    }
    return candidates.best();
}

// Mode of intra 4x4 block k, whose predicted mode is predicted_mode; leaves its prediction in pred.
// The elimination takes every step for all modes at once: a mode that was dropped cannot win.
int MacroblockCoder::learn4_mode(int k, int predicted_mode, std::uint8_t* pred) {
    const std::uint8_t* src =
        g_mb_rec_y + 4 * zolt::luma_scan_j[k] * picture.g_stride_luma + 4 * zolt::luma_scan_i[k];
    const bool up = g_blk_up[k] != 0;
    const bool left = g_blk_left[k] != 0;
    std::uint8_t neighbours[16] = {};  // 13, and room for kernels to read
    gather_neighbours4(neighbours, src, picture.g_stride_luma, up, left, g_blk_up_right[k],
                       g_blk_up_left[k]);

    std::int32_t d[4];
    ipred4(pred, neighbours, up, left, predicted_mode);
    g_kernels->phase_satd_4x4(src, picture.g_stride_luma, pred, d);
    const int predicted_cost = d[0] + d[1] + d[2] + d[3];
    if ((!up && !left) || predicted_cost <= kept_distortion(g_intra_lambda)) {
        return predicted_mode;
    }

    alignas(32) std::uint8_t modes[9][16];
    alignas(32) std::int16_t distortion[4][16];
    g_kernels->intra_4x4_modes(src, picture.g_stride_luma, neighbours,
                               ipred4_dc(neighbours, up, left), modes[0], distortion[0]);
    const int share = predicted_cost >> 2;
    const std::int16_t rate = static_cast<std::int16_t>(other_mode_rate(g_intra_lambda));
    // Sixteen lanes that the compiler can put into vectors; a cost is at most 4 * (2040 + 182).
    std::int16_t cost[16] = {};
    std::int16_t dropped[16];  // 0: still a candidate
    std::copy(kUnavailable4[up][left], kUnavailable4[up][left] + 16, dropped);
    dropped[predicted_mode] = 1;
    for (int step = 0; step < 4; ++step) {
        for (int mode = 0; mode < 16; ++mode) {
            cost[mode] = static_cast<std::int16_t>(cost[mode] + distortion[step][mode] + rate);
        }
        if (step == 3) {
            break;
        }
        // Costs are integers, so that the fraction of a limit does not matter.
        const std::int16_t limit = static_cast<std::int16_t>((step + 1) * share * thresh_4[step]);
        for (int mode = 0; mode < 16; ++mode) {
            dropped[mode] = static_cast<std::int16_t>(dropped[mode] | (cost[mode] > limit ? 1 : 0));
        }
    }
    int best = predicted_mode;
    int best_cost = 4 * share;
    for (int mode = 0; mode < 9; ++mode) {
        if (dropped[mode] == 0 && cost[mode] < best_cost) {
            best = mode;
            best_cost = cost[mode];
        }
    }
    if (best != predicted_mode) {
        std::copy(modes[best], modes[best] + 16, pred);
    }
    return best;
}

// The same for all blocks of the macroblock, as Kernels::code_intra_4x4 takes it. modes: the
// macroblock's entries in the map of modes, with `stride` entries a row; the predicted modes go to
// predicted.
zolt::Intra4x4 MacroblockCoder::intra4x4_rule(std::int8_t* modes, std::ptrdiff_t stride,
                                              std::uint8_t* predicted) {
    zolt::Intra4x4 mb = {};
    mb.samples = g_mb_rec_y;
    mb.stride = picture.g_stride_luma;
    mb.up = g_mb_up != 0;
    mb.left = g_mb_left != 0;
    mb.up_right = has_up_right() != 0;
    mb.modes = modes;
    mb.modes_stride = stride;
    mb.quantizer = &luma_quantizer();
    mb.rate = other_mode_rate(g_intra_lambda);
    mb.kept = kept_distortion(g_intra_lambda);
    for (int step = 0; step < 3; ++step) {
        mb.drop[step] = static_cast<std::int16_t>(4 * (step + 1) * thresh_4[step]);
    }
    mb.predicted = predicted;
    mb.chosen = g_ipMBPred;
    mb.scan = g_scan_levels;
    mb.nonzero = g_nonzero;
    return mb;
}
