// Streams coded by several workers against those of one, whatever the host does meanwhile. The
// thread sanitizer watches the same sessions.

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "common/BitReader.h"
#include "common/Encoding.h"
#include "common/Random.h"
#include "common/Workers.h"

namespace {

using zolt_test::BitReader;
using zolt_test::Encoding;
using zolt_test::generated;
using zolt_test::Order;
using zolt_test::Random;
using zolt_test::Sequence;
using zolt_test::Settings;
using zolt_test::SliceHeader;
using zolt_test::Workers;
using Bytes = std::vector<std::uint8_t>;

// The sanitizers make everything slower: fewer sessions there.
#ifdef ZOLT_SANITIZED
constexpr int kShare = 3;
#else
constexpr int kShare = 1;
#endif

constexpr Order kOrders[] = {Order::kAtOnce, Order::kSerial, Order::kReversed, Order::kDelayed};

template <typename T, std::size_t count>
T one_of(Random& random, const T (&values)[count]) {
    return values[random.between(0, static_cast<int>(count) - 1)];
}

// Every second side is at most four macroblocks long; not all are whole macroblocks.
int random_side(Random& random, int longest) {
    return random.between(16, random.between(0, 1) ? 64 + 15 : longest);
}

Sequence random_sequence(Random& random, int pictures) {
    const std::vector<std::string>& kinds = zolt_test::generated_kinds();
    const std::string& kind =
        kinds[static_cast<std::size_t>(random.between(0, static_cast<int>(kinds.size()) - 1))];
    const int width = random_side(random, 400);
    return generated(kind, width, random_side(random, 300), pictures);
}

int slice_qp(const Bytes& nal) {
    BitReader reader = BitReader::of_nal(nal.data(), nal.size());
    return SliceHeader(nal[0], reader).qp;
}

// Makes one random change to both engines, or none.
void change_settings(Random& random, Encoding& a, Encoding& b) {
    constexpr int kBitRates[] = {0, 0, 64000, 500000, 4000000};
    constexpr double kFrameRates[] = {10, 25, 29.97, 60};
    const int what = random.between(0, 5);
    const int bit_rate = one_of(random, kBitRates);
    const double frame_rate = one_of(random, kFrameRates);
    const int intra_period = random.between(1, 9);
    for (CEncoder* engine : {&a.engine(), &b.engine()}) {
        if (what == 0) {
            engine->set_bit_rate(bit_rate);
        } else if (what == 1) {
            engine->set_frame_rate(frame_rate);
        } else if (what == 2) {
            engine->set_intra_period(intra_period);
        }
    }
}

// Random sessions: shape, content, table and first settings differ between them; settings, number
// of workers and their order from picture to picture. A NAL buffer that has shrunk to less than a
// picture took makes workers give up in any row.
TEST(Threads, AnyWorkersGiveTheStreamOfOne) {
    constexpr int kSessions = 90 / kShare;
    constexpr int kPictures = 8;
    int coded_again = 0;
    for (int session = 0; session < kSessions; ++session) {
        Random random(static_cast<std::uint64_t>(session));
        const Sequence sequence = random_sequence(random, kPictures);
        constexpr int kQps[] = {0, 1, 10, 22, 28, 36, 51};
        constexpr int kBitRates[] = {0, 0, 0, 200000, 2000000};
        const Settings settings = {one_of(random, kQps), one_of(random, kBitRates),
                                   random.between(1, 9)};
        SCOPED_TRACE("session " + std::to_string(session) + ": " + sequence.name + ", " +
                     settings.name());
        const auto tables = zolt::kernel_tables();
        const zolt::Kernels& kernels =
            tables.begin()[random.between(0, static_cast<int>(tables.end() - tables.begin()) - 1)];
        Encoding alone(sequence.width, sequence.height, settings, &kernels);
        Encoding together(sequence.width, sequence.height, settings, &kernels);
        Workers pools[] = {Workers(1, kOrders[0]), Workers(1, kOrders[1]), Workers(1, kOrders[2]),
                           Workers(1, kOrders[3])};
        Bytes picture(sequence.picture_size());
        for (int n = 0; n < kPictures; ++n) {
            change_settings(random, alone, together);
            Workers& pool = pools[random.between(0, 3)];
            pool.set_count(random.between(2, 9));
            together.engine().set_worker_pool(random.between(0, 7) == 0 ? nullptr : &pool);
            sequence.draw(n, picture.data());
            const Bytes expected = alone.encode(picture.data());
            ASSERT_EQ(together.encode(picture.data()), expected) << "picture " << n;
            ASSERT_EQ(together.reconstruction(), alone.reconstruction()) << "picture " << n;
            if (together.engine().g_rc_enable) {
                continue;
            }
            // The engine has gone back to the QP that the picture was to have.
            const int qp = together.engine().picture.g_mbQp;
            coded_again += slice_qp(expected) > qp ? 1 : 0;
            // A picture like this one still fits at a higher QP.
            const bool idr = (expected[0] & 31) == 5;
            if (idr && qp <= 10 && expected.size() > 4000) {
                const int bytes = static_cast<int>(expected.size()) * random.between(7, 10) / 10;
                alone.engine().g_nal_buf_size = together.engine().g_nal_buf_size = bytes;
            }
        }
    }
    EXPECT_GT(coded_again, 5);
}

// A P picture's slice data behind `before` other bits, from an engine whose reference and QP stay
// as they are. Returns the bits that were written, or nothing when the picture was given up.
class SliceData {
public:
    explicit SliceData(CEncoder& engine, const std::uint8_t* frame) : m_engine(engine) {
        engine.picture.g_frame = frame;
        engine.picture.g_slp->sliceType = P_SLICE;
    }
    ~SliceData() {
        m_engine.picture.g_frame = nullptr;
        m_engine.reset_nal_buffer();
    }

    std::vector<bool> code(int before, unsigned capacity, Workers& workers) {
        m_engine.reset_nal_buffer();
        for (int n = 0; n < before; ++n) {
            m_engine.nal.write_bits(1, 1);
        }
        m_engine.picture.initFrameParams();
        m_engine.picture.framePredInitP();
        if (!m_engine.rows.code_slice_data(m_engine.nal, capacity, &workers, workers.threads())) {
            return {};
        }
        std::vector<bool> bits(m_engine.nal.g_nal_bitpos);
        for (std::size_t n = 0; n < bits.size(); ++n) {
            bits[n] = (m_engine.nal.g_nal_buf[n / 8] >> (7 - n % 8) & 1) != 0;
        }
        return bits;
    }

private:
    CEncoder& m_engine;
};

// Whether a picture has room is decided to the bit as by one worker, skipped macroblocks before the
// row's first coded one included, and a picture that was given up leaves nothing behind.
TEST(Threads, GiveUpWhereOneWorkerDoes) {
    constexpr int kPictures = 12 / kShare;
    Workers one(1);
    Random random(7);
    for (const char* kind : {"still", "zoom", "fade", "cut"}) {
        const Sequence sequence = generated(kind, 80, 112, kPictures);
        Encoding encoding(sequence.width, sequence.height, {34, 0, 300});
        Bytes picture(sequence.picture_size());
        for (int n = 0; n < kPictures; ++n) {
            SCOPED_TRACE(std::string(kind) + ", picture " + std::to_string(n));
            sequence.draw(n, picture.data());
            if (n > 0) {
                SliceData slice(encoding.engine(), picture.data());
                const int before = random.between(1, 70);
                const std::vector<bool> bits = slice.code(before, ~0u, one);
                // The least capacity that is enough.
                unsigned low = 0;
                unsigned high =
                    static_cast<unsigned>(bits.size()) + MacroblockCoder::kMaxMacroblockBits;
                ASSERT_FALSE(slice.code(before, high, one).empty());
                while (high - low > 1) {
                    const unsigned middle = (low + high) / 2;
                    (slice.code(before, middle, one).empty() ? low : high) = middle;
                }
                for (const Order order : kOrders) {
                    SCOPED_TRACE(order_name(order));
                    Workers workers(random.between(2, 6), order);
                    EXPECT_TRUE(slice.code(before, low, workers).empty());
                    EXPECT_EQ(slice.code(before, high, workers), bits);
                    const unsigned less =
                        static_cast<unsigned>(random.between(0, static_cast<int>(low)));
                    EXPECT_TRUE(slice.code(before, less, workers).empty());
                    EXPECT_EQ(slice.code(before, ~0u, workers), bits);
                }
            }
            encoding.encode(picture.data());
        }
    }
}

}  // namespace
