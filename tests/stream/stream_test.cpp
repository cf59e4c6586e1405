// Whole streams against a decoder that nobody here wrote.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <map>

#include "common/BitReader.h"
#include "common/Encoding.h"

namespace {

using zolt_test::BitReader;
using zolt_test::check_stream;
using zolt_test::Encoding;
using zolt_test::generated;
using zolt_test::Hooks;
using zolt_test::Sequence;
using zolt_test::Settings;
using zolt_test::SliceHeader;
using Bytes = std::vector<std::uint8_t>;

// The sanitizers make everything slower: fewer pictures there.
#ifdef ZOLT_SANITIZED
constexpr int kShare = 3;
#else
constexpr int kShare = 1;
#endif

int pictures(int count) {
    return std::max(count / kShare, 2);
}

SliceHeader slice_header(const Bytes& nal) {
    BitReader reader = BitReader::of_nal(nal.data(), nal.size());
    return SliceHeader(nal[0], reader);
}

// The QPs and bit rates that matter, each with one of the intra periods.
std::vector<Settings> all_settings() {
    constexpr int kPeriods[] = {7, 1, 300, 2, 30};
    std::vector<Settings> list;
    for (const int qp : {0, 6, 10, 18, 28, 40, 51}) {
        list.push_back({qp, 0, kPeriods[list.size() % 5]});
    }
    for (const int kilobits : {64, 200, 800, 2000, 4000}) {
        list.push_back({28, 1000 * kilobits, kPeriods[list.size() % 5]});
    }
    return list;
}

// ---- Generated sequences ----

struct Shape {
    const char* kind;
    int width, height, pictures;
};

std::string shape_name(const Shape& shape) {
    return generated(shape.kind, shape.width, shape.height, 1).name;
}

class GeneratedStream : public testing::TestWithParam<Shape> {};

TEST_P(GeneratedStream, DecodesToReconstruction) {
    const Shape& shape = GetParam();
    const Sequence sequence =
        generated(shape.kind, shape.width, shape.height, pictures(shape.pictures));
    for (const Settings& settings : all_settings()) {
        EXPECT_EQ(check_stream(sequence, settings), "") << settings.name();
    }
}

// Every kind, and every shape of picture: one macroblock, one column, one row, sides that are not
// multiples of 16, large.
constexpr Shape kShapes[] = {
    {"gradient", 48, 80, 12}, {"zoom", 48, 80, 12},  {"noise", 48, 80, 12},
    {"still", 48, 80, 12},    {"cut", 48, 80, 12},   {"flat", 48, 80, 12},
    {"fade", 48, 80, 24},     {"pan", 48, 80, 12},   {"checker", 48, 80, 12},
    {"zoom", 16, 16, 12},     {"noise", 16, 16, 12}, {"drop", 16, 208, 12},
    {"checker", 16, 144, 12}, {"pan", 176, 16, 12},  {"noise", 176, 16, 12},
    {"pan", 176, 144, 9},     {"cut", 178, 146, 9},  {"gradient", 31, 47, 9},
    {"drop", 48, 208, 12},    {"zoom", 352, 288, 4},
};
INSTANTIATE_TEST_SUITE_P(Shapes, GeneratedStream, testing::ValuesIn(kShapes),
                         [](const auto& test) { return shape_name(test.param); });

TEST(LargeStream, DecodesToReconstruction) {
    const Sequence sequence = generated("zoom", 1280, 720, pictures(6));
    EXPECT_EQ(check_stream(sequence, {24, 0, 30}), "");
    EXPECT_EQ(check_stream(sequence, {28, 2000000, 30}), "");
}

// ---- Clips ----

struct ClipPart {
    int clip;  // index in zolt_test::clips()
    int first, pictures;
};

class ClipStream : public testing::TestWithParam<ClipPart> {};

TEST_P(ClipStream, DecodesToReconstruction) {
    const char* folder = std::getenv("ZOLT_TEST_CLIPS");
    if (!folder) {
        GTEST_SKIP() << "ZOLT_TEST_CLIPS is not set: no clips to test with";
    }
    const ClipPart& part = GetParam();
    const Sequence sequence =
        zolt_test::load_clip(folder, zolt_test::clips()[static_cast<std::size_t>(part.clip)],
                             part.first, pictures(part.pictures));
    for (const Settings& settings : {Settings{6, 0, 30}, Settings{18, 0, 7}, Settings{32, 0, 300},
                                     Settings{28, 200000, 30}, Settings{28, 1500000, 30}}) {
        EXPECT_EQ(check_stream(sequence, settings), "") << settings.name();
    }
}

// Of the film the fade to black and the shot after it.
constexpr ClipPart kClipParts[] = {{0, 0, 120}, {1, 20, 40}, {2, 34, 36}, {3, 0, 8}};
INSTANTIATE_TEST_SUITE_P(Clips, ClipStream, testing::ValuesIn(kClipParts), [](const auto& test) {
    return zolt_test::clips()[static_cast<std::size_t>(test.param.clip)].name;
});

// ---- Streams whose content is known ----

TEST(StillStream, EveryPictureButTheFirstIsOneSkipRun) {
    for (const char* kind : {"still", "flat"}) {
        Sequence sequence = generated(kind, 64, 48, 4);  // "flat" changes every fourth picture
        const unsigned num_mbs = 12;
        const auto check = [&](CEncoder&, int n, const Bytes&, const Bytes& nal, const Bytes&) {
            if (n == 0) {
                return;
            }
            BitReader reader = BitReader::of_nal(nal.data(), nal.size());
            const SliceHeader header(nal[0], reader);
            EXPECT_EQ(header.slice_type, 0u);
            EXPECT_EQ(reader.ue(), num_mbs - 1) << "mb_skip_run";
            EXPECT_EQ(reader.ue(), 0u) << "mb_type";
            EXPECT_EQ(reader.se(), 0) << "mvd_l0 x";
            EXPECT_EQ(reader.se(), 0) << "mvd_l0 y";
            EXPECT_EQ(reader.ue(), 0u) << "coded_block_pattern 0";
            EXPECT_EQ(reader.u(1), 1u) << "rbsp_stop_one_bit";
            EXPECT_LT(reader.bits_left(), 8u);
        };
        EXPECT_EQ(check_stream(sequence, {20, 0, 30}, {nullptr, check}), "") << kind;
    }
}

TEST(SliceHeaders, CountPicturesOfTheIntraPeriod) {
    const Sequence sequence = generated("gradient", 16, 16, 70);
    for (const int period : {1, 2, 30}) {
        const auto check = [&](CEncoder& engine, int n, const Bytes&, const Bytes& nal,
                               const Bytes&) {
            const SliceHeader header = slice_header(nal);
            const unsigned position = static_cast<unsigned>(n % period);
            EXPECT_EQ(header.nal_byte, position == 0 ? 0x45u : 0x41u);
            EXPECT_EQ(header.slice_type, position == 0 ? 2u : 0u);
            EXPECT_EQ(header.frame_num, position);
            EXPECT_EQ(header.pic_order_cnt_lsb, position);
            EXPECT_EQ(header.idr_pic_id, period == 1 ? static_cast<unsigned>(n) : 0u);
            EXPECT_EQ(header.qp, 33);
            EXPECT_EQ(engine.g_gop_pos, n % period);
        };
        EXPECT_EQ(check_stream(sequence, {33, 0, period}, {nullptr, check}), "");
    }
}

// The counters are written in 16 bits and go round.
TEST(SliceHeaders, CountersGoRound) {
    Encoding encoding(16, 16, {28, 0, 70000});
    const Sequence sequence = generated("gradient", 16, 16, 1);
    Bytes picture(sequence.picture_size());
    sequence.draw(0, picture.data());
    encoding.encode(picture.data());
    CEncoder& engine = encoding.engine();
    engine.g_frame_num = engine.g_poc = 65534;
    for (const unsigned expected : {65535u, 0u, 1u}) {
        const SliceHeader header = slice_header(encoding.encode(picture.data()));
        EXPECT_EQ(header.frame_num, expected);
        EXPECT_EQ(header.pic_order_cnt_lsb, expected);
    }
}

// ---- Pictures that do not fit the NAL buffer ----

// Bits of a picture at a QP, coded by an engine whose buffer holds it.
std::size_t bits_in_a_large_buffer(const Sequence& sequence, const Bytes& picture, int qp) {
    Encoding encoding(sequence.width, sequence.height, {qp, 0, 3});
    const std::size_t bytes = 4 * sequence.picture_size();
    EXPECT_TRUE(encoding.engine().nal.g_nal_buf.allocate(bytes));
    encoding.engine().g_nal_buf_size = static_cast<int>(bytes) - 64;
    return 8 * encoding.encode(picture.data()).size();
}

TEST(Recoding, TakesTheFirstQpThatFits) {
    constexpr std::size_t kMacroblockBits =
        11265;  // most that one can take, kept free for the last
    const Sequence sequence = generated("noise", 176, 144, 1);
    for (const int start : {0, 1, 2, 3}) {
        const auto check = [&](CEncoder& engine, int, const Bytes& picture, const Bytes& nal,
                               const Bytes&) {
            const int qp = slice_header(nal).qp;
            const std::size_t capacity = 8 * static_cast<std::size_t>(engine.g_nal_buf_size);
            ASSERT_GT(qp, start);
            EXPECT_EQ((qp - start) % 4, 0);
            EXPECT_GT(bits_in_a_large_buffer(sequence, picture, qp - 4) + kMacroblockBits,
                      capacity);
            EXPECT_EQ(bits_in_a_large_buffer(sequence, picture, qp), 8 * nal.size());
        };
        EXPECT_EQ(check_stream(sequence, {start, 0, 3}, {nullptr, check}), "");
    }
}

TEST(Recoding, ReachesAQpThatFits) {
    const Sequence sequence = generated("noise", 176, 144, 4);
    for (const int bit_rate : {0, 4000000}) {
        // The first picture of rate control takes set_qp's QP, if that is not 0.
        const Settings settings = {bit_rate > 0 ? 1 : 0, bit_rate, 3};
        const auto check = [&](CEncoder& engine, int n, const Bytes&, const Bytes& nal,
                               const Bytes&) {
            const int qp = slice_header(nal).qp;
            EXPECT_EQ(qp, engine.picture.g_mb_qp[0]);
            if (bit_rate == 0) {
                EXPECT_GT(qp, 0);
                EXPECT_EQ(engine.picture.g_mbQp, 0)
                    << "the next picture starts from the QP that was set";
            } else if (n == 0) {
                EXPECT_GT(qp, 1);
                EXPECT_EQ(engine.rate_control.g_rc_prev_qp, qp);
                EXPECT_EQ(engine.rate_control.g_rc_i_qp, qp);
                EXPECT_EQ(engine.rate_control.g_rc_prev_bits,
                          static_cast<int>(engine.g_slice_bits));
            }
        };
        EXPECT_EQ(check_stream(sequence, settings, {nullptr, check}), "");
    }
}

// A picture that has been coded again leaves the same trace as one coded at that QP at once.
TEST(Recoding, LeavesNoTraceOfTheFirstTry) {
    const Sequence sequence = generated("noise", 176, 144, 5);
    Encoding recoding(176, 144, {0, 0, 3});
    Encoding direct(176, 144, {0, 0, 3});
    Bytes picture(sequence.picture_size());
    for (int n = 0; n < sequence.pictures; ++n) {
        sequence.draw(n, picture.data());
        const Bytes nal = recoding.encode(picture.data());
        direct.engine().set_qp(slice_header(nal).qp);
        EXPECT_EQ(nal, direct.encode(picture.data())) << "picture " << n;
        EXPECT_EQ(recoding.reconstruction(), direct.reconstruction()) << "picture " << n;
    }
}

// ---- Stamps of visited vectors ----

// A search after the stamps have gone round does not take old stamps for its own.
TEST(VisitStamps, GoRound) {
    const Sequence sequence = generated("still", 64, 64, 4);
    const Settings settings = {28, 0, 30};
    Encoding around(64, 64, settings), plain(64, 64, settings);
    Bytes picture(sequence.picture_size());
    for (int n = 0; n < sequence.pictures; ++n) {
        CEncoder& engine = around.engine();
        if (n == 2) {
            engine.rows.coders[0]->g_visit_stamp = 0xff;
            const std::size_t dimension = static_cast<std::size_t>(engine.picture.g_visit_dim);
            std::fill_n(engine.rows.coders[0]->g_visit_L0.data(), dimension * dimension,
                        std::uint8_t{1});
        }
        sequence.draw(n, picture.data());
        EXPECT_EQ(around.encode(picture.data()), plain.encode(picture.data())) << "picture " << n;
        if (n == 2) {
            EXPECT_EQ(engine.rows.coders[0]->g_visit_stamp, 16u)
                << "the first of 16 searches takes stamp 1";
        }
    }
}

// ---- Settings that change in mid-stream ----

TEST(ChangingSettings, StreamStaysDecodable) {
    const std::map<int, std::function<void(CEncoder&)>> changes = {
        {4, [](CEncoder& e) { e.set_bit_rate(300000); }},
        {8, [](CEncoder& e) { e.set_frame_rate(7.5); }},
        {11, [](CEncoder& e) { e.set_bit_rate(3000000); }},
        {14, [](CEncoder& e) { e.set_intra_period(4); }},
        {20, [](CEncoder& e) { e.set_bit_rate(0); }},
        {24, [](CEncoder& e) { e.set_bit_rate(100000); }},
        {27, [](CEncoder& e) { e.set_intra_period(50); }},
        {30, [](CEncoder& e) { e.set_frame_rate(1e9); }},
        {33, [](CEncoder& e) { e.set_intra_period(-1); }},
    };
    for (const char* kind : {"pan", "cut", "noise"}) {
        int qp = 0;
        const auto before = [&](CEncoder& engine, int n) {
            qp = engine.picture.g_mbQp;
            if (changes.count(n)) {
                changes.at(n)(engine);
            }
        };
        const auto after = [&](CEncoder&, int n, const Bytes&, const Bytes& nal, const Bytes&) {
            const SliceHeader header = slice_header(nal);
            if (n < 4 || (n >= 20 && n < 24)) {
                EXPECT_EQ(header.qp, qp) << "picture " << n << " without rate control";
            }
            EXPECT_EQ(header.slice_type,
                      (n >= 14 && n < 27 ? n % 4 == 0 : n >= 33 || n == 0) ? 2u : 0u)
                << "picture " << n;
        };
        const Sequence sequence = generated(kind, 48, 80, 36);
        EXPECT_EQ(check_stream(sequence, {30, 0, 100}, {before, after}), "") << kind;
    }
}

}  // namespace
