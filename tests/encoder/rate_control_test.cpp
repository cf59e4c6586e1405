#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "common/Random.h"
#include "encoder/CEncoder.h"

namespace {

using zolt_test::Random;

TEST(RateControl, QuantiserSteps) {
    for (int qp = 0; qp <= 51; ++qp) {
        EXPECT_EQ(CEncoder::Qstep2QP(CEncoder::QP2Qstep(qp)), qp);
        // 2^(1/6) a QP, as the standard's steps nearly are.
        EXPECT_NEAR(CEncoder::QP2Qstep(qp) / (0.625 * std::exp2(qp / 6.0)), 1, 0.04);
    }
    const double infinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(CEncoder::Qstep2QP(0.5), 0);
    EXPECT_EQ(CEncoder::Qstep2QP(-infinity), 0);
    EXPECT_EQ(CEncoder::Qstep2QP(300), 51);
    EXPECT_EQ(CEncoder::Qstep2QP(infinity), 51);
    EXPECT_EQ(CEncoder::Qstep2QP(0.65625), 0);
    EXPECT_EQ(CEncoder::Qstep2QP(std::nextafter(0.65625, 1)), 1);
    EXPECT_EQ(CEncoder::Qstep2QP(NAN), 5) << "falls through every comparison";
}

TEST(RateControl, QpOfTheFirstPictures) {
    const struct {
        int width, height, bit_rate;
        double frame_rate;
        int set_qp, qp;
    } cases[] = {
        {176, 144, 200000, 15, 28, 28}, {176, 144, 200000, 15, 0, 20},
        {352, 288, 1000000, 25, 0, 25}, {176, 144, 64000, 15, 0, 25},
        {176, 144, 20000, 15, 0, 35},   {640, 480, 4000000, 30, 0, 35},
        {640, 480, 4000000, 10, 0, 25}, {176, 144, 200000, 15, 51, 51},  // not clamped
    };
    for (const auto& c : cases) {
        CEncoder engine(c.width, c.height);
        engine.set_qp(c.set_qp);
        engine.set_bit_rate(c.bit_rate);
        engine.set_frame_rate(c.frame_rate);
        engine.initialize_encoder();
        const std::vector<std::uint8_t> picture(
            static_cast<std::size_t>(c.width * c.height * 3 / 2), 90);
        for (int n = 0; n < 2; ++n) {
            engine.encode_frame(picture.data());
            engine.reset_nal_buffer();
            EXPECT_EQ(engine.g_mb_qp[0], c.qp) << "picture " << n << " at " << c.bit_rate;
        }
    }
}

// The limits hold whatever the pictures cost and however still or restless they are.
TEST(RateControl, KeepsItsLimits) {
    Random random(1);
    for (int run = 0; run < 60; ++run) {
        CEncoder engine(32, 32);
        engine.set_qp(random.between(18, 45));
        engine.set_bit_rate(1000 * random.between(1, 4000));
        engine.set_frame_rate(random.between(1, 60));
        const int period = random.between(1, 60);
        engine.set_intra_period(period);
        engine.initialize_encoder();
        EXPECT_EQ(engine.g_rc_qp_range, std::max(3, period / 10 + 2));
        const int scale = 1 << random.between(4, 24);
        int previous = 0, intra = 0;
        for (int n = 0; n < 200; ++n) {
            engine.g_pic_type = n % period == 0 ? I_SLICE : P_SLICE;
            engine.FrameLevelRateControl();
            const int qp = engine.g_mbQp;
            EXPECT_GE(qp, 18);
            EXPECT_LE(qp, 45);
            if (engine.g_pic_type == I_SLICE) {
                EXPECT_LE(std::abs(qp - previous), n == 0 ? 51 : 1);
                intra = qp;
            } else {
                EXPECT_LE(std::abs(qp - previous), 2);
                EXPECT_LE(qp, std::max(intra + engine.g_rc_qp_range, 18));
                EXPECT_GE(qp, std::min(intra - 2 * engine.g_rc_qp_range, 45));
            }
            previous = qp;
            engine.g_slice_bits = static_cast<unsigned>(random.between(0, scale));
            for (int mb = 0; mb < engine.g_num_mbs; ++mb) {
                engine.g_mv_array[mb].sad =
                    static_cast<std::uint32_t>(random.between(0, n % 50 == 9 ? 0 : 65280));
            }
            engine.UpdateFrameLevelRateControl();
            ++engine.g_coded_frames;
            EXPECT_GE(engine.g_rc_buffer, 0);
            EXPECT_LE(engine.g_rc_buffer, engine.g_rc_max_cpb);
        }
    }
}

// ---- Model fits ----

struct Line {
    long double slope, offset;
};

// Least squares of y on x by deviations from the means.
Line fit(const std::vector<double>& x, const std::vector<double>& y) {
    const long double n = static_cast<long double>(x.size());
    long double mean_x = 0, mean_y = 0, sxx = 0, sxy = 0;
    for (std::size_t i = 0; i < x.size(); ++i) {
        mean_x += x[i] / n;
        mean_y += y[i] / n;
    }
    for (std::size_t i = 0; i < x.size(); ++i) {
        sxx += (x[i] - mean_x) * (x[i] - mean_x);
        sxy += (x[i] - mean_x) * (y[i] - mean_y);
    }
    return {sxy / sxx, mean_y - sxy / sxx * mean_x};
}

TEST(RateModel, MadLineIsALeastSquaresFit) {
    Random random(2);
    CEncoder engine(16, 16);
    engine.g_rc_first_p = false;
    for (int iteration = 0; iteration < 300; ++iteration) {
        for (double& mad : engine.g_rc_mad_hist) {
            mad = random.between(1, 4000) / 256.0;
        }
        // The newest MAD stands in slot idx, which does not count yet.
        const int count = random.between(2, 16);
        const int newest = count < 16 ? count : random.between(0, 15);
        engine.g_rc_hist_count = static_cast<std::uint8_t>(count);
        engine.g_rc_hist_idx = static_cast<std::uint8_t>(newest);
        std::vector<double> older, newer;
        for (int age = count < 16 ? count : 15; age > 0; --age) {
            older.push_back(engine.g_rc_mad_hist[(newest + 16 - age) % 16]);
            newer.push_back(engine.g_rc_mad_hist[(newest + 17 - age) % 16]);
        }
        engine.SetMADParameter();
        const Line line = fit(newer, older);
        EXPECT_NEAR(engine.g_rc_mad_c1, line.slope, 1e-6 * (1 + std::fabs(line.slope)));
        EXPECT_NEAR(engine.g_rc_mad_c2, line.offset, 1e-6 * (1 + std::fabs(line.offset)));
    }
    // Equal MADs have no line.
    std::fill(engine.g_rc_mad_hist, engine.g_rc_mad_hist + 16, 3.0);
    engine.SetMADParameter();
    EXPECT_EQ(engine.g_rc_mad_c1, 1);
    EXPECT_EQ(engine.g_rc_mad_c2, 0);
}

struct Sample {
    double q, r;
    bool newest;
};

// R = x1 / Q + x2 / Q^2 as the line of Q * R on 1 / Q; the mean of Q * R where all Q are equal.
Line fit_rate(const std::vector<Sample>& samples, int n) {
    std::vector<double> x, y;
    bool differ = false;
    for (const Sample& s : samples) {
        x.push_back(1 / s.q);
        y.push_back(s.q * s.r);
        differ = differ || s.q != samples[0].q;
    }
    if (differ && n > 0) {
        return fit(x, y);
    }
    long double sum = 0;
    for (const double value : y) {
        sum += value;
    }
    return {0, sum / n};
}

TEST(RateModel, RateCurveIsALeastSquaresFitWithoutOutliers) {
    Random random(3);
    CEncoder engine(16, 16);
    for (int iteration = 0; iteration < 500; ++iteration) {
        const int span = iteration % 5;  // of QPs, 0: all equal
        const int qp = random.between(20, 38);
        for (int slot = 0; slot < 16; ++slot) {
            engine.g_rc_qstep_hist[slot] = CEncoder::QP2Qstep(qp + random.between(0, 2 * span));
            engine.g_rc_rate_hist[slot] = random.between(100, 90000) / 16.0;
        }
        const int count = std::max(random.between(-4, 16), 3);
        const int next = count < 16 ? count : random.between(0, 15);
        engine.g_rc_hist_count = static_cast<std::uint8_t>(count);
        engine.g_rc_hist_idx = static_cast<std::uint8_t>(next);
        std::vector<Sample> window;
        for (int age = std::min(count, 15); age > 0; --age) {
            const int slot = (next + 16 - age) % 16;
            window.push_back({engine.g_rc_qstep_hist[slot], engine.g_rc_rate_hist[slot], age == 1});
        }
        engine.SetRDQParameter();

        Line line = fit_rate(window, static_cast<int>(window.size()));
        const auto error = [&](const Sample& s) {
            return std::fabs(
                static_cast<double>(line.slope / (s.q * s.q) + line.offset / s.q - s.r));
        };
        double squares = 0;
        for (const Sample& s : window) {
            squares += error(s) * error(s);
        }
        const double threshold = std::sqrt(squares / count);
        std::vector<Sample> kept;
        int n = 0;
        for (const Sample& s : window) {
            const bool fits = error(s) <= threshold;
            n += fits;
            if (fits || s.newest) {
                kept.push_back(s);
            }
        }
        line = fit_rate(kept, n);
        EXPECT_NEAR(engine.g_rc_x2, line.slope, 1e-6 * (1 + std::fabs(line.slope)));
        EXPECT_NEAR(engine.g_rc_x1, line.offset, 1e-6 * (1 + std::fabs(line.offset)));
    }
}

}  // namespace
