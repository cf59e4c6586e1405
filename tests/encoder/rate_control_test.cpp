#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
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
        EXPECT_EQ(RateControl::Qstep2QP(RateControl::QP2Qstep(qp)), qp);
        // 2^(1/6) a QP, as the standard's steps nearly are.
        EXPECT_NEAR(RateControl::QP2Qstep(qp) / (0.625 * std::exp2(qp / 6.0)), 1, 0.04);
    }
    const double infinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(RateControl::Qstep2QP(0.5), 0);
    EXPECT_EQ(RateControl::Qstep2QP(-infinity), 0);
    EXPECT_EQ(RateControl::Qstep2QP(300), 51);
    EXPECT_EQ(RateControl::Qstep2QP(infinity), 51);
    EXPECT_EQ(RateControl::Qstep2QP(0.65625), 0);
    EXPECT_EQ(RateControl::Qstep2QP(std::nextafter(0.65625, 1)), 1);
    EXPECT_EQ(RateControl::Qstep2QP(NAN), 5) << "falls through every comparison";
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
            EXPECT_EQ(engine.picture.g_mb_qp[0], c.qp) << "picture " << n << " at " << c.bit_rate;
        }
    }
}

// ---- A second controller beside the engine's ----

// It knows the settings, and the bits and the SAD sum of every picture, and must hold the very
// numbers that the engine holds: sums run from the oldest picture to the newest.
struct Controller {
    struct Picture {
        double mad, rate, qstep;  // rate: bits / mad
    };
    int set_qp = 28, rate = 0;  // rate: bit/s, 0: off
    double frame_rate = 30;
    int period = 30, old_period = 0;  // old: of the picture before, 0 where it was not controlled
    bool initialized = false;
    int pictures = 0;  // since the start of the stream
    int first_length = 0;
    int range = 0, i_qp = 0, qp = 28, buffer = 0, level = 0, bits = 0, target = 0;
    double remaining = 0, xp = 0, mad = 0, predicted_mad = 0, c1 = 1, c2 = 0, x1 = 0, x2 = 0;
    std::vector<Picture> history;  // all P pictures

    static double qstep(int q) {
        constexpr double kSteps[] = {0.625, 0.6875, 0.8125, 0.875, 1.0, 1.125};
        return std::ldexp(kSteps[q % 6], q / 6);
    }
    // Up to halfway to the next step, but nothing above the last step of an octave.
    static int qp_of(double step) {
        int q = std::isnan(step) ? 5 : 0;
        while (q < 51 && step > (q % 6 == 5 ? qstep(q) : (qstep(q) + qstep(q + 1)) / 2)) {
            ++q;
        }
        return q;
    }
    static int in_int(double value) {
        constexpr double kMax = std::numeric_limits<int>::max();
        return std::isnan(value) ? 0 : static_cast<int>(std::clamp(value, -kMax - 1, kMax));
    }

    void initialize() {
        initialized = true;
        first_length = period;
        range = std::min(std::max(3, period / 10 + 2), 32767);
        i_qp = buffer = bits = target = 0;
        level = 2000000;
        remaining = xp = mad = predicted_mad = c2 = x1 = x2 = 0;
        c1 = 1;
        history.clear();
    }
    double budget(int count) const { return in_int(rate / frame_rate * count - (buffer - level)); }
    bool intra() const { return pictures % period == 0; }
    // The QP of the coming picture.
    void choose() {
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
        if (intra()) {
            if (pictures == 0) {
                qp = set_qp;
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
        if (history.empty()) {
            return;
        }
        const double t1 = in_int((level - buffer) * 0.5 + rate / frame_rate + 0.5);
        const double t2 = in_int(remaining * xp / (xp * left + 1.0));
        target = std::min(std::max(in_int(0.5 * t2 + 0.5 * t1), 0), 4000000);
        predicted_mad = c1 * mad + c2;
        int next = 51;
        if (target >= 1) {
            const double m = predicted_mad;
            const double d = x1 * x1 * (m * m) + 4 * x2 * m * target;
            const bool linear = d < 0 || x1 * m + d <= 0;
            next = qp_of(linear ? x1 * m / target : (x1 * m + std::sqrt(d)) / (2.0 * target));
        }
        next = std::min(std::max(next, qp - 2), qp + 2);
        next = std::min(std::max(next, i_qp - 2 * range), i_qp + range);
        qp = std::min(std::max(next, 18), 45);
    }
    // raise: how much coarser than chosen the picture had to be coded.
    void coded(int picture_bits, std::int64_t sad, int macroblocks, int raise = 0) {
        const bool was_intra = intra();
        ++pictures;
        old_period = rate > 0 ? period : 0;
        if (rate == 0) {
            return;
        }
        qp = std::min(qp + raise, 51);
        bits = picture_bits;
        buffer = std::min(std::max(in_int(buffer + bits - rate / frame_rate), 0), 4000000);
        if (was_intra) {
            i_qp = qp;
            level = buffer;
            return;
        }
        xp = 7 * xp * 0.125 + static_cast<double>(bits) * qp * 0.125;
        mad = static_cast<double>(sad == 0 ? 1 : sad) / (macroblocks * 256);
        history.push_back({mad, bits / mad, qstep(qp)});
        fit_mads();
        fit_rates();
    }
    int newest(int most) const { return std::min(static_cast<int>(history.size()), most); }
    // The line of each of the last 16 MADs on the one after it.
    void fit_mads() {
        const int n = newest(16) - 1;
        if (n == 0) {
            return;
        }
        double x = 0, y = 0, yy = 0, xy = 0;
        for (auto newer = history.end() - n; newer != history.end(); ++newer) {
            x += newer[-1].mad;
            y += newer->mad;
            yy += newer->mad * newer->mad;
            xy += newer[-1].mad * newer->mad;
        }
        const double det = n * yy - y * y;
        const bool singular = std::fabs(det) <= 1e-6;
        c1 = singular ? x / y : (xy * n - x * y) / det;
        c2 = singular ? 0 : (yy * x - y * xy) / det;
    }
    // rate = x1 / qstep + x2 / qstep^2 over the last 15, then without those far off it; but the
    // newest stays, though n does not count it any more.
    void fit_rates() {
        int n = newest(15);
        const std::vector<Picture> window(history.end() - n, history.end());
        fit_rates(window, n);
        double squares = 0;
        for (const Picture& p : window) {
            squares += error(p) * error(p);
        }
        const double threshold = newest(3) == 2 ? 0 : std::sqrt(squares / newest(16));
        std::vector<Picture> kept;
        for (const Picture& p : window) {
            const bool outlier = std::fabs(error(p)) > threshold;
            n -= outlier;
            if (!outlier || &p == &window.back()) {
                kept.push_back(p);
            }
        }
        fit_rates(kept, n);
    }
    double error(const Picture& p) const {
        return x2 / (p.qstep * p.qstep) + x1 / p.qstep - p.rate;
    }
    void fit_rates(const std::vector<Picture>& samples, int n) {
        const double m = static_cast<double>(samples.size());
        double a = 0, b = 0, c = 0, d = 0;
        bool differ = false;
        x1 = x2 = 0;
        for (const Picture& p : samples) {
            x1 += p.qstep * p.rate / n;
            a += 1 / p.qstep;
            b += 1 / (p.qstep * p.qstep);
            c += p.rate;
            d += p.qstep * p.rate;
            differ = differ || p.qstep != samples[0].qstep;
        }
        if (differ && n > 0) {
            const double det = b * m - a * a;
            const bool singular = std::fabs(det) <= 1e-6;
            x1 = singular ? d / m : (d * b - c * a) / det;
            x2 = singular ? 0 : (c * m - d * a) / det;
        }
    }
};

// What pictures that nobody codes cost.
struct Costs {
    Random& random;
    int max_bits = 1 << random.between(4, 30);
    int sad_bits = random.between(0, 32);
    bool constant = random.between(0, 3) == 0;  // every SAD is the largest

    std::uint32_t sad() {
        return static_cast<std::uint32_t>(std::uint64_t{constant ? ~0u : random.next()} >>
                                          (32 - sad_bits));
    }
};

// What the engine does before it codes a picture.
void choose_qp(CEncoder& engine) {
    engine.picture.g_mbQp = engine.rate_control.FrameLevelRateControl(
        engine.rate_control_stream(), engine.rate_control_picture());
}

// An engine, its settings changing, and the controller that follows it.
class Stream {
public:
    Stream(int bit_rate, int period, int size = 64, int qp = 28)
        : sequence_(generated("cut", size, size, 400)),
          encoding_(size, size, {qp, bit_rate, period, 30}),
          picture_(sequence_.picture_size()) {
        expected_.set_qp = expected_.qp = qp;
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
    void restart() {
        engine().initialize_encoder();
        expected_.pictures = expected_.old_period = 0;
        expected_.initialized = false;
        if (expected_.rate > 0) {
            expected_.initialize();
        }
    }
    // Codes pictures and checks the controller's numbers at each; returns their bits.
    std::int64_t code(int pictures) {
        std::int64_t sum = 0;
        for (int k = 0; k < pictures && !testing::Test::HasFailure(); ++k) {
            const int n = expected_.pictures;
            if (expected_.rate > 0) {
                expected_.choose();
            }
            sequence_.draw(n % sequence_.pictures, picture_.data());
            sum += 8 * static_cast<std::int64_t>(encoding_.encode(picture_.data()).size());
            EXPECT_EQ(engine().picture.g_mb_qp[0], expected_.qp) << "picture " << n;
            std::int64_t sad = 0;
            for (int mb = 0; mb < engine().picture.g_num_mbs; ++mb) {
                sad += engine().picture.g_mv_array[mb].sad;
            }
            expected_.coded(static_cast<int>(engine().g_slice_bits), sad,
                            engine().picture.g_num_mbs);
            check(n);
        }
        return sum;
    }
    // The same around pictures that only cost something.
    void pretend(int pictures, Costs& costs) {
        Random& random = costs.random;
        for (int k = 0; k < pictures && !testing::Test::HasFailure(); ++k) {
            const int n = expected_.pictures;
            engine().g_gop_pos = n % expected_.period;
            engine().g_pic_type = expected_.intra() ? I_SLICE : P_SLICE;
            int bits = random.between(0, costs.max_bits), raise = 0;
            const bool still = random.between(0, 30) == 0;
            std::int64_t sad = 0;
            for (int mb = 0; mb < engine().picture.g_num_mbs; ++mb) {
                engine().picture.g_mv_array[mb].sad = still ? 0 : costs.sad();
                sad += engine().picture.g_mv_array[mb].sad;
            }
            if (expected_.rate > 0) {
                expected_.choose();
                choose_qp(engine());
                if (random.between(0, 3) == 0) {  // to, or just past, a limit of the I pictures
                    const int limit = 800000 * random.between(3, 4) + random.between(-1, 1);
                    const double budget = std::ceil(expected_.rate / expected_.frame_rate);
                    bits = static_cast<int>(std::clamp(limit - expected_.buffer + budget, 0., 1e9));
                }
                raise = random.between(0, 15) == 0 ? 4 : 0;
                engine().picture.g_mbQp = std::min(engine().picture.g_mbQp + raise, 51);
                engine().g_slice_bits = static_cast<unsigned>(bits);
                engine().rate_control.UpdateFrameLevelRateControl(
                    engine().rate_control_stream(), engine().rate_control_picture(),
                    engine().picture.g_mbQp, bits, sad, engine().picture.g_num_mbs);
            } else {
                engine().rate_control.g_rc_period = 0;
            }
            ++engine().g_coded_frames;
            ++engine().g_frame_counter;
            expected_.coded(bits, sad, engine().picture.g_num_mbs, raise);
            check(n);
        }
    }

private:
    void check(int n) {
        const CEncoder& e = engine();
        const Controller& c = expected_;
        EXPECT_EQ(e.picture.g_mbQp, c.qp) << "picture " << n;
        if (c.rate == 0) {
            return;
        }
        const auto expect = [n](const char* name, double is, double expected) {
            EXPECT_TRUE(is == expected || (std::isnan(is) && std::isnan(expected)))
                << name << " of picture " << n << ": " << is << ", not " << expected;
        };
        expect("last QP", e.rate_control.g_rc_prev_qp, c.qp);
        expect("I picture's QP", e.rate_control.g_rc_i_qp, c.i_qp);
        expect("QP range", e.rate_control.g_rc_qp_range, c.range);
        expect("buffer", e.rate_control.g_rc_buffer, c.buffer);
        expect("target level", e.rate_control.g_rc_target_level, c.level);
        expect("bits", e.rate_control.g_rc_prev_bits, c.bits);
        expect("budget", e.rate_control.g_rc_remaining_bits, c.remaining);
        expect("target", e.rate_control.g_rc_target_bits, c.target);
        expect("complexity", e.rate_control.g_rc_xp, c.xp);
        expect("MAD", e.rate_control.g_rc_cur_mad, c.mad);
        expect("predicted MAD", e.rate_control.g_rc_pred_mad, c.predicted_mad);
        expect("c1", e.rate_control.g_rc_mad_c1, c.c1);
        expect("c2", e.rate_control.g_rc_mad_c2, c.c2);
        expect("x1", e.rate_control.g_rc_x1, c.x1);
        expect("x2", e.rate_control.g_rc_x2, c.x2);
        expect("first P", e.rate_control.g_rc_first_p, c.history.empty());
        const std::size_t end = c.history.size();
        expect("index", e.rate_control.g_rc_hist_idx, end % 16);
        expect("count", e.rate_control.g_rc_hist_count, c.newest(16));
        Controller::Picture slots[16] = {};
        for (std::size_t i = end - static_cast<std::size_t>(c.newest(16)); i < end; ++i) {
            slots[i % 16] = c.history[i];
        }
        for (int i = 0; i < 16; ++i) {
            EXPECT_TRUE(e.rate_control.g_rc_mad_hist[i] == slots[i].mad &&
                        e.rate_control.g_rc_rate_hist[i] == slots[i].rate &&
                        e.rate_control.g_rc_qstep_hist[i] == slots[i].qstep)
                << "slot " << i << " after picture " << n;
        }
    }

    Sequence sequence_;
    Encoding encoding_;
    std::vector<std::uint8_t> picture_;
    Controller expected_;
};

TEST(RateControl, FollowsTheModels) {
    Random random(1);
    for (int run = 0; run < 500 && !HasFailure(); ++run) {
        Stream stream(4000000 >> random.between(0, 21), random.between(1, 60), 32,
                      random.between(1, 51));
        stream.set_frame_rate(random.between(1, 240) / 4.0);
        Costs costs{random};
        stream.pretend(150, costs);
    }
}

// ---- Settings that change ----

// That so many pictures at 30 a second came near the rate.
void expect_rate(std::int64_t bits, int pictures, int bit_rate) {
    const double rate = static_cast<double>(bits) / pictures * 30;
    EXPECT_GT(rate, 0.6 * bit_rate);
    EXPECT_LT(rate, 1.6 * bit_rate);
}

TEST(ChangingSettings, IntraPeriodLoweredBelowThePositionInIt) {
    Stream stream(200000, 300);
    stream.code(100);
    stream.set_period(30);
    expect_rate(stream.code(240), 240, 200000);
}

TEST(ChangingSettings, RateControlOffAndOnAgain) {
    Stream stream(200000, 30);
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
        Stream stream(0, 30);
        stream.code(pictures);
        stream.set_bit_rate(200000);
        stream.code(15);
        expect_rate(stream.code(150), 150, 200000);
    }
}

TEST(ChangingSettings, AtRandom) {
    Random random(4);
    for (int run = 0; run < 200 && !HasFailure(); ++run) {
        const bool coded = run % 50 == 0;
        Stream stream(run % 3 == 0 ? 0 : 100000, random.between(1, 40), coded ? 64 : 32);
        Costs costs{random};
        for (int change = 0; change < 40; ++change) {
            switch (random.between(0, 6)) {
                case 0:
                    stream.set_bit_rate(0);
                    break;
                case 1:
                case 2:
                    stream.set_bit_rate(1000 * random.between(20, 900));
                    break;
                case 3:
                    stream.set_frame_rate(change % 4 == 0 ? std::ldexp(1, random.between(-40, 40))
                                                          : random.between(1, 240) / 4.0);
                    break;
                case 4:
                    if (change % 4 == 0) {
                        stream.restart();
                    }
                    break;
                default:
                    stream.set_period(random.between(1, 50));
            }
            if (random.between(0, 3) == 0) {
                continue;
            }
            if (coded) {
                stream.code(random.between(1, 12));
            } else {
                stream.pretend(random.between(1, 12), costs);
            }
        }
    }
}

TEST(ChangingSettings, LongestIntraPeriods) {
    constexpr int kLongest = std::numeric_limits<int>::max();
    for (const int period : {327659, 327660, 1000000, kLongest}) {
        Stream stream(100000, period);
        stream.code(60);
        EXPECT_EQ(stream.engine().rate_control.g_rc_qp_range, std::min(period / 10 + 2, 32767));
    }
    // Counters and budget stay at their ends.
    Stream stream(100000, kLongest);
    stream.code(2);
    CEncoder& engine = stream.engine();
    engine.g_pic_type = P_SLICE;
    engine.g_gop_pos = kLongest - 1;
    engine.rate_control.g_rc_coded_p = engine.rate_control.g_rc_np =
        engine.rate_control.g_rc_gop_len = kLongest;
    engine.rate_control.g_rc_remaining_bits = std::numeric_limits<int>::min() + 1;
    engine.rate_control.g_rc_prev_bits = 2;
    choose_qp(engine);
    EXPECT_EQ(engine.rate_control.g_rc_coded_p, kLongest);
    EXPECT_EQ(engine.rate_control.g_rc_np, kLongest);
    EXPECT_EQ(engine.rate_control.g_rc_gop_len, kLongest);
    EXPECT_EQ(engine.rate_control.g_rc_remaining_bits, std::numeric_limits<int>::min());
}

// A model that is not a number anywhere gives the Qstep that falls through every comparison, QP 5,
// which the limits bring to the last QP less 2.
TEST(ChangingSettings, NotANumberStaysInsideTheLimits) {
    Stream stream(100000, 300);
    stream.code(5);
    CEncoder& engine = stream.engine();
    engine.g_pic_type = P_SLICE;
    engine.g_gop_pos = 5;
    for (double* number : {&engine.rate_control.g_rc_x1, &engine.rate_control.g_rc_cur_mad,
                           &engine.rate_control.g_rc_x2}) {
        engine.rate_control.g_rc_prev_qp = 30;
        engine.rate_control.g_rc_i_qp = 30;
        engine.rate_control.g_rc_buffer =
            engine.rate_control.g_rc_target_level;  // a target of some bits
        const double kept = *number;
        *number = NAN;
        choose_qp(engine);
        EXPECT_EQ(engine.picture.g_mbQp, 28);
        *number = kept;
    }
    // A number of bits that is none is 0.
    engine.rate_control.g_rc_frame_rate = NAN;
    engine.g_pic_type = I_SLICE;
    choose_qp(engine);
    EXPECT_EQ(engine.rate_control.g_rc_remaining_bits, 0);
}

}  // namespace
