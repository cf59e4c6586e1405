// The engine's setters, its life, and the states it does not go on from.

#include <gtest/gtest.h>

#include <vector>

#include "common/Encoding.h"
#include "encoder/errors.h"

namespace {

using zolt_test::Encoding;
using zolt_test::generated;
using zolt_test::Sequence;
using Bytes = std::vector<std::uint8_t>;

TEST(Engine, SettersKeepTheirRanges) {
    CEncoder engine(40, 50);
    EXPECT_EQ(engine.picture.g_num_mbs, 6);
    EXPECT_EQ(engine.set_bit_rate(123), 200000);
    EXPECT_TRUE(engine.g_rc_enable);
    EXPECT_EQ(engine.set_bit_rate(-5), 123);
    EXPECT_FALSE(engine.g_rc_enable);
    EXPECT_EQ(engine.set_frame_rate(12.5), 25.0);
    EXPECT_EQ(engine.rate_control.g_rc_frame_rate, 12.5);
    EXPECT_EQ(engine.set_intra_period(-3), 25u);
    EXPECT_EQ(engine.set_intra_period(60), 1u);
    EXPECT_EQ(engine.set_inter_period(0), 1u);
    EXPECT_EQ(engine.set_inter_period(3), 0u);
    EXPECT_EQ(engine.set_inter_period(0), 1u);
    engine.initialize_encoder();
    EXPECT_EQ(engine.g_inter_period, 1u);
    EXPECT_EQ(engine.g_intra_period, 60u);
    for (const auto& [set, qp] : {std::pair{-1, 0}, {52, 51}, {33, 33}}) {
        engine.set_qp(set);
        EXPECT_EQ(engine.g_qp, qp);
        EXPECT_EQ(engine.picture.g_mbQp, qp);
    }
}

Bytes encode_picture(Encoding& encoding, const Sequence& sequence, int n) {
    Bytes picture(sequence.picture_size());
    sequence.draw(n, picture.data());
    return encoding.encode(picture.data());
}

// Engines share nothing, and initialize_encoder starts anew.
TEST(Engine, StreamsDoNotDependOnWhatWasCodedBefore) {
    const Sequence sequence = generated("pan", 48, 48, 8), other = generated("noise", 48, 48, 8);
    const zolt_test::Settings settings = {28, 150000, 5};
    Encoding alone(48, 48, settings), beside(48, 48, settings), disturbing(48, 48, {20, 0, 3});
    std::vector<Bytes> stream;
    for (int n = 0; n < sequence.pictures; ++n) {
        stream.push_back(encode_picture(alone, sequence, n));
        encode_picture(disturbing, other, n);
        EXPECT_EQ(encode_picture(beside, sequence, n), stream.back()) << "picture " << n;
    }
    alone.engine().set_qp(28);
    alone.engine().initialize_encoder();
    for (int n = 0; n < sequence.pictures; ++n) {
        EXPECT_EQ(encode_picture(alone, sequence, n), stream[static_cast<std::size_t>(n)])
            << "picture " << n << " after initialize_encoder";
    }
}

TEST(EngineDeath, StatesThatEndTheProcess) {
    // POSIX keeps eight bits of a status, Windows all.
    const auto exits = [](int status) {
        return [status](int ended) {
            return testing::ExitedWithCode(status & 255)(ended) ||
                   testing::ExitedWithCode(status)(ended);
        };
    };
    EXPECT_EXIT(CEncoder(15, 16), exits(-1), "^Picture size must be at least 16x16\n$");
    EXPECT_EXIT(CEncoder(16, 15), exits(-1), "^Picture size must be at least 16x16\n$");
    const char* too_large =
        "^Picture size must be at most 139264 macroblocks and 16880 samples a side\n$";
    EXPECT_EXIT(CEncoder(16, 53687040), exits(-1), too_large);
    EXPECT_EXIT(CEncoder(16881, 16), exits(-1), too_large);
    EXPECT_EXIT(CEncoder(5984, 5968), exits(-1), too_large);  // 374 x 373 macroblocks
    EXPECT_EXIT(memError("a plane"), exits(106), "^Memory allocation failed for: a plane\n$");

    CEncoder engine(16, 16);
    engine.set_bit_rate(4000000);
    engine.initialize_encoder();
    engine.set_bit_rate(4000001);  // not checked before the next initialize_encoder
    EXPECT_EXIT(engine.initialize_encoder(), exits(109),
                "^bit rate exceeds the maximum allowed bit rate for the given level, check the "
                "standard\n$");
    engine.rows.coders[0]->g_cur_mb_mode = 3;
    EXPECT_EXIT(engine.rows.coders[0]->setMBType_CBP(), exits(-1),
                "^setMBType_CBP. Unsupported mode\n");
    engine.picture.g_num_ref_active = 2;
    engine.rows.coders[0]->g_cur_mb_mode = MB_P16x16;
    engine.rows.coders[0]->bits = &engine.nal;
    EXPECT_EXIT(engine.rows.coders[0]->encode_header(), exits(107),
                "^Unsupported Macroblock type in encode_MB_Pred_P\n");
}

}  // namespace
