#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "common/Encoding.h"
#include "common/Random.h"

namespace {

using zolt_test::Encoding;
using zolt_test::generated;
using zolt_test::Random;
using zolt_test::Sequence;

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

// ---- Settings that change ----

// A second controller beside the engine's: what it must hold after every picture, worked out from
// the settings and from the coded pictures. The fitted models are the engine's own.
struct Controller {
    int rate = 0;  // bit/s, 0: off
    double frame_rate = 30;
    int period = 30, old_period = 0;  // old: of the picture before, 0 where it was not controlled
    bool initialized = false;
    int pictures = 0;  // since the start of the stream
    int first_length = 0;
    int range = 0, i_qp = 0, qp = 28, buffer = 0, level = 0, bits = 0, target = 0;
    double remaining = 0, xp = 0;
    bool first_p = true;

    void initialize() {
        initialized = true;
        first_length = period;
        range = std::min(std::max(3, period / 10 + 2), 32767);
        i_qp = buffer = bits = target = 0;
        level = 2000000;
        remaining = xp = 0;
        first_p = true;
    }
    static double in_int(double value) {
        return std::min(std::max(std::trunc(value), -2147483648.0), 2147483647.0);
    }
    double budget(int count) const { return in_int(rate / frame_rate * count - (buffer - level)); }
    // The QP of the coming picture; x1, x2, mad: the engine's models before it.
    void choose(bool intra, double x1, double x2, double mad) {
        const int left = period - pictures % period;
        const bool starts = old_period == 0, changes = !starts && old_period != period;
        if (starts && (pictures > 0 || !initialized)) {
            initialize();
            buffer = level;
            i_qp = qp;
        }
        if (changes) {
            range = std::min(std::max(3, period / 10 + 2), 32767);
        }
        if (intra) {
            if (pictures == 0) {
                buffer = level;
                remaining = budget(first_length);
            } else {
                const int step = buffer < 2400000 ? -1 : buffer > 3200000 ? 1 : 0;
                qp = std::min(std::max(qp + step, 18), 45);
                remaining = budget(left);
            }
            i_qp = qp;
            return;
        }
        if (changes) {
            i_qp = qp;
        }
        remaining = starts || changes ? budget(left) : in_int(remaining - bits);
        if (first_p) {
            return;
        }
        const double t1 = std::trunc((level - buffer) * 0.5 + rate / frame_rate + 0.5);
        const double t2 = in_int(remaining * xp / (xp * left + 1.0));
        target = static_cast<int>(std::min(std::max(std::trunc(0.5 * t2 + 0.5 * t1), 0.0), 4e6));
        int next = 51;
        if (target >= 1) {
            const double d = x1 * x1 * (mad * mad) + 4 * x2 * mad * target;
            const bool linear = d < 0 || x1 * mad + d <= 0;
            next = CEncoder::Qstep2QP(linear ? x1 * mad / target
                                             : (x1 * mad + std::sqrt(d)) / (2.0 * target));
        }
        next = std::min(std::max(next, qp - 2), qp + 2);
        next = std::min(std::max(next, i_qp - 2 * range), i_qp + range);
        qp = std::min(std::max(next, 18), 45);
    }
    void coded(bool intra, int picture_bits) {
        ++pictures;
        old_period = rate > 0 ? period : 0;
        if (rate == 0) {
            return;
        }
        bits = picture_bits;
        buffer = static_cast<int>(
            std::min(std::max(std::trunc(buffer + bits - rate / frame_rate), 0.0), 4e6));
        if (intra) {
            level = buffer;
        } else {
            xp = 7 * xp * 0.125 + static_cast<double>(bits) * qp * 0.125;
            first_p = false;
        }
    }
};

// An engine whose settings change, and the controller that follows it.
class ChangingStream {
public:
    ChangingStream(int bit_rate, int period)
        : sequence_(generated("cut", 64, 64, 400)),
          encoding_(64, 64, {28, bit_rate, period, 30}),
          picture_(sequence_.picture_size()) {
        expected_.rate = bit_rate;
        expected_.period = period;
        if (bit_rate > 0) {
            expected_.initialize();
        }
    }
    CEncoder& engine() { return encoding_.engine(); }
    void set_bit_rate(int rate) {
        engine().set_bit_rate(rate);
        expected_.rate = rate;
    }
    void set_frame_rate(double rate) {
        engine().set_frame_rate(rate);
        expected_.frame_rate = rate;
    }
    void set_period(int period) {
        engine().set_intra_period(period);
        expected_.period = period;
    }
    // Codes pictures and checks the controller's numbers at each; returns their bits.
    std::int64_t code(int pictures) {
        std::int64_t sum = 0;
        for (int k = 0; k < pictures; ++k) {
            const int n = expected_.pictures;
            const bool intra = n % expected_.period == 0;
            if (expected_.rate > 0) {
                const double mad =
                    engine().g_rc_mad_c1 * engine().g_rc_cur_mad + engine().g_rc_mad_c2;
                expected_.choose(intra, engine().g_rc_x1, engine().g_rc_x2, mad);
            }
            sequence_.draw(n % sequence_.pictures, picture_.data());
            sum += 8 * static_cast<std::int64_t>(encoding_.encode(picture_.data()).size());
            check(n);
            expected_.coded(intra, static_cast<int>(engine().g_slice_bits));
            if (testing::Test::HasFailure()) {
                break;
            }
        }
        return sum;
    }

private:
    void check(int n) {
        EXPECT_EQ(engine().g_mb_qp[0], expected_.qp) << "picture " << n;
        if (expected_.rate > 0) {
            EXPECT_EQ(engine().g_rc_remaining_bits, expected_.remaining) << "picture " << n;
            EXPECT_EQ(engine().g_rc_i_qp, expected_.i_qp) << "picture " << n;
            EXPECT_EQ(engine().g_rc_qp_range, expected_.range) << "picture " << n;
            EXPECT_EQ(engine().g_rc_target_bits, expected_.target) << "picture " << n;
        }
    }

    Sequence sequence_;
    Encoding encoding_;
    std::vector<std::uint8_t> picture_;
    Controller expected_;
};

// That so many pictures at 30 a second came near the rate.
void expect_rate(std::int64_t bits, int pictures, int bit_rate) {
    const double rate = static_cast<double>(bits) / pictures * 30;
    EXPECT_GT(rate, 0.6 * bit_rate);
    EXPECT_LT(rate, 1.6 * bit_rate);
}

TEST(ChangingSettings, IntraPeriodLoweredBelowThePositionInIt) {
    ChangingStream stream(200000, 300);
    stream.code(100);
    stream.set_period(30);
    expect_rate(stream.code(240), 240, 200000);
}

TEST(ChangingSettings, RateControlOffAndOnAgain) {
    ChangingStream stream(200000, 30);
    stream.set_bit_rate(0);
    stream.set_bit_rate(200000);  // as it was initialised, but for the interval
    stream.set_period(90);
    stream.code(45);
    stream.set_bit_rate(0);  // no picture without it
    stream.set_bit_rate(150000);
    stream.code(20);
    stream.set_bit_rate(0);
    stream.code(50);
    stream.set_bit_rate(200000);
    stream.code(100);
}

TEST(ChangingSettings, RateControlSwitchedOnInMidStream) {
    for (const int pictures : {0, 1, 17, 30}) {  // 0 and 30: at an I picture
        ChangingStream stream(0, 30);
        stream.code(pictures);
        stream.set_bit_rate(200000);
        stream.code(15);
        expect_rate(stream.code(150), 150, 200000);
    }
}

TEST(ChangingSettings, AtRandom) {
    Random random(4);
    for (int run = 0; run < 8; ++run) {
        ChangingStream stream(run % 3 == 0 ? 0 : 100000, random.between(1, 40));
        for (int change = 0; change < 40 && !HasFailure(); ++change) {
            switch (random.between(0, 5)) {
                case 0:
                    stream.set_bit_rate(0);
                    break;
                case 1:
                case 2:
                    stream.set_bit_rate(1000 * random.between(20, 900));
                    break;
                case 3:
                    stream.set_frame_rate(random.between(1, 240) / 4.0);
                    break;
                default:
                    stream.set_period(random.between(1, 50));
            }
            if (random.between(0, 3) != 0) {
                stream.code(random.between(1, 12));
            }
        }
    }
}

TEST(ChangingSettings, LongestIntraPeriods) {
    constexpr int kLongest = std::numeric_limits<int>::max();
    for (const int period : {327659, 327660, 1000000, kLongest}) {
        ChangingStream stream(100000, period);
        stream.code(60);
        EXPECT_EQ(stream.engine().g_rc_qp_range, std::min(period / 10 + 2, 32767));
    }
    // Counters and budget stay at their ends.
    ChangingStream stream(100000, kLongest);
    stream.code(2);
    CEncoder& engine = stream.engine();
    engine.g_pic_type = P_SLICE;
    engine.g_gop_pos = kLongest - 1;
    engine.g_rc_coded_p = engine.g_rc_np = engine.g_rc_gop_len = kLongest;
    engine.g_rc_remaining_bits = std::numeric_limits<int>::min() + 1;
    engine.g_rc_prev_bits = 2;
    engine.FrameLevelRateControl();
    EXPECT_EQ(engine.g_rc_coded_p, kLongest);
    EXPECT_EQ(engine.g_rc_np, kLongest);
    EXPECT_EQ(engine.g_rc_gop_len, kLongest);
    EXPECT_EQ(engine.g_rc_remaining_bits, std::numeric_limits<int>::min());
}

// A model that is not a number anywhere gives the Qstep that falls through every comparison, QP 5,
// which the limits bring to the last QP less 2.
TEST(ChangingSettings, NotANumberStaysInsideTheLimits) {
    ChangingStream stream(100000, 300);
    stream.code(5);
    CEncoder& engine = stream.engine();
    engine.g_pic_type = P_SLICE;
    engine.g_gop_pos = 5;
    for (double* number : {&engine.g_rc_x1, &engine.g_rc_cur_mad, &engine.g_rc_x2}) {
        engine.g_rc_prev_qp = 30;
        engine.g_rc_i_qp = 30;
        engine.g_rc_buffer = engine.g_rc_target_level;  // a target of some bits
        const double kept = *number;
        *number = NAN;
        engine.FrameLevelRateControl();
        EXPECT_EQ(engine.g_mbQp, 28);
        *number = kept;
    }
    // A number of bits that is none is 0.
    engine.g_rc_frame_rate = NAN;
    engine.g_pic_type = I_SLICE;
    engine.FrameLevelRateControl();
    EXPECT_EQ(engine.g_rc_remaining_bits, 0);
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
