#include "avc/VideoAvcParser.h"

#include <gtest/gtest.h>

#include <cfenv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <limits>
#include <stdexcept>
#include <vector>

#include "RecordingConsumer.h"

namespace {

using zolt::RecordedSample;
using zolt::RecordingConsumer;
using Bytes = std::vector<unsigned char>;

// A Main profile set of 22 x 18 macroblocks and a CAVLC picture parameter set.
const Bytes kSps = {0, 0, 0, 1, 0x67, 0x4d, 0x40, 0x16, 0xf4, 0x0b, 0x04, 0xb2};
const Bytes kPps = {0, 0, 0, 1, 0x68, 0xce, 0x38, 0x80};
const Bytes kIdr = {0, 0, 1, 0x65, 0x88, 0x84, 0x21};
const Bytes kSlice = {0, 0, 1, 0x41, 0x9a, 0x02, 0x55};
const Bytes kAud = {0, 0, 1, 0x09, 0x10};

Bytes operator+(Bytes left, const Bytes& right) {
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

void put(VideoAvcParser& parser, const Bytes& bytes) {
    parser.PutNextAvcData(bytes.data(), static_cast<int>(bytes.size()));
}

TEST(VideoAvcParser, FindsStartCodes) {
    struct Case {
        Bytes bytes;
        int offset;
        int length;
        int length_at_front;
    };
    for (const Case& c :
         {Case{{}, 0, 0, 0}, Case{{0, 0}, 2, 0, 0}, Case{{1, 1, 1, 1}, 4, 0, 0},
          Case{{0, 1, 0, 1, 0, 1}, 6, 0, 0}, Case{{0, 0, 1, 0}, 0, 3, 3},
          Case{{0, 0, 0, 1}, 0, 4, 4}, Case{{0, 0, 0, 0, 1}, 1, 4, 0},
          Case{{0, 0, 0, 0, 0, 0, 1}, 3, 4, 0}, Case{{0, 0, 2, 0, 0, 1}, 3, 3, 0},
          Case{{5, 0, 0, 1, 0, 0, 1}, 1, 3, 0}, Case{{1, 1, 0, 0, 1, 1}, 2, 3, 0},
          Case{{0, 1, 0, 0, 0, 1}, 2, 4, 0}, Case{{9, 9, 9, 0, 0, 3, 1, 0, 0}, 9, 0, 0}}) {
        int length = -1;
        const int size = static_cast<int>(c.bytes.size());
        EXPECT_EQ(VideoAvcParser::FindStartCode(c.bytes.data(), size, &length), c.offset);
        EXPECT_EQ(length, c.length);
        EXPECT_EQ(VideoAvcParser::FindStartCode(c.bytes.data(), size, nullptr), c.offset);
        if (size >= VideoAvcParser::StartCode4Length) {
            EXPECT_EQ(VideoAvcParser::GetStartCodeLength(c.bytes.data()), c.length_at_front);
        }
    }
    EXPECT_EQ(VideoAvcParser::GetNaluType(kSlice.data() + 3), 1);
    EXPECT_FALSE(VideoAvcParser::IsSyncNalu(kSlice.data() + 3));
    EXPECT_TRUE(VideoAvcParser::IsSyncNalu(kIdr.data() + 3));
}

TEST(VideoAvcParser, DeliversUnitsBehindTheFirstParameterSets) {
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 25);
    put(parser, kSps + kPps + kIdr);
    EXPECT_TRUE(consumer.samples.empty());
    EXPECT_EQ(parser.GetFirstSampleOffset(), static_cast<int>(kSps.size() + kPps.size()));
    ASSERT_EQ(consumer.configs.size(), 1U);
    EXPECT_EQ(consumer.configs[0], parser.GetSampleStreamConfig());
    EXPECT_EQ(consumer.configs[0]->GetMediaType(), 0x61766331);
    auto* const config = static_cast<IConfigVideoAvc*>(consumer.configs[0]->GetMediaConfig());
    EXPECT_EQ(config->GetWidth(), 352);
    EXPECT_EQ(config->GetHeight(), 288);
    EXPECT_EQ(config->GetFrameRate(), 25);
    EXPECT_EQ(
        Bytes(config->GetSeqParSetData(), config->GetSeqParSetData() + config->GetSeqParSetSize()),
        Bytes(kSps.begin() + 4, kSps.end()));
    EXPECT_EQ(
        Bytes(config->GetPicParSetData(), config->GetPicParSetData() + config->GetPicParSetSize()),
        Bytes(kPps.begin() + 4, kPps.end()));

    put(parser, kSlice + kSps + kAud);
    const std::vector<RecordedSample> expected = {
        {kIdr, 0, true}, {kSlice, 40000, false}, {kSps, 80000, false}};
    EXPECT_EQ(consumer.samples, expected);
    EXPECT_EQ(parser.GetFirstSampleOffset(), static_cast<int>(kSps.size() + kPps.size()));
    EXPECT_EQ(parser.GetSliceHeader().slice_type, 5U);
    EXPECT_EQ(parser.GetSliceHeader().frame_num, 0U);
}

TEST(VideoAvcParser, DropsUnitsBeforeBothParameterSets) {
    const Bytes other_sps = {0, 0, 1, 0x67, 0x42, 0x00, 0x0a, 0xf8, 0x41, 0xa2};
    const Bytes lead = kAud + kPps + kIdr + kPps + kSps;
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 25);
    put(parser, lead);
    EXPECT_EQ(parser.GetFirstSampleOffset(), -1);
    EXPECT_EQ(parser.GetSeqParSetData(), nullptr);
    EXPECT_EQ(parser.GetSeqParSetSize(), 0);
    EXPECT_NE(parser.GetPicParSetData(), nullptr);
    EXPECT_EQ(parser.GetWidth(), 0);
    put(parser, other_sps + kIdr);
    EXPECT_EQ(parser.GetFirstSampleOffset(), static_cast<int>(lead.size()));
    EXPECT_EQ(parser.GetWidth(), 352);
    const std::vector<RecordedSample> expected = {{other_sps, 0, false}};
    EXPECT_EQ(consumer.samples, expected);

    VideoAvcParser sps_twice(nullptr, 25);
    put(sps_twice, kSps + other_sps + kPps + kIdr);
    EXPECT_EQ(sps_twice.GetWidth(), 352);
    EXPECT_EQ(sps_twice.GetSeqParSetSize(), static_cast<int>(kSps.size()) - 4);
}

TEST(VideoAvcParser, TakesUnitsOfAnyShape) {
    // No start code at the front, more zeros than a start code has, and a unit without bytes.
    const Bytes stream = Bytes(kSps.begin() + 4, kSps.end()) + kPps + Bytes{0, 0, 1} + kIdr +
                         Bytes{0, 0} + Bytes{0, 0, 0, 1, 0x41, 0, 0, 3};
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 0);
    put(parser, stream + kAud);
    EXPECT_EQ(parser.GetWidth(), 352);
    const std::vector<RecordedSample> expected = {{{0, 0, 1}, 0, false},
                                                  {kIdr + Bytes{0, 0}, 0, true},
                                                  {{0, 0, 0, 1, 0x41, 0, 0, 3}, 0, false}};
    EXPECT_EQ(consumer.samples, expected);
}

TEST(VideoAvcParser, WaitsForEightBytes) {
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 0);
    put(parser, kSps + kPps + kAud);
    parser.Flush();
    consumer.samples.clear();

    const Bytes two_units = {0, 0, 1, 9, 0, 0, 1};
    put(parser, two_units);
    EXPECT_TRUE(consumer.samples.empty());
    parser.AddDataToBuffer(kIdr.data(), static_cast<int>(kIdr.size()));
    EXPECT_TRUE(consumer.samples.empty());
    parser.PutNextAvcData(nullptr, 0);
    const std::vector<RecordedSample> expected = {{{0, 0, 1, 9}, 0, false}, {{0, 0, 1}, 0, false}};
    EXPECT_EQ(consumer.samples, expected);
    parser.PutNextAvcData(kIdr.data(), -5);
    EXPECT_EQ(consumer.samples, expected);
}

TEST(VideoAvcParser, FlushDeliversWhatIsHeld) {
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 50);
    const Bytes long_slice = kSlice + Bytes(100, 0xff);
    put(parser, kSps + kPps + kIdr + long_slice);
    parser.Flush();
    // The sync flag is that of the unit before.
    std::vector<RecordedSample> expected = {{kIdr, 0, true}, {long_slice, 20000, true}};
    EXPECT_EQ(consumer.samples, expected);
    EXPECT_EQ(consumer.ends, 1);
    parser.Flush();
    EXPECT_EQ(consumer.samples, expected);
    EXPECT_EQ(consumer.ends, 2);

    put(parser, kAud + kAud);
    expected.push_back({kAud, 40000, false});
    EXPECT_EQ(consumer.samples, expected);

    parser.Disconnect(&consumer);
    parser.Flush();
    EXPECT_EQ(consumer.ends, 2);
    parser.Connect(&consumer);
    parser.Flush();
    EXPECT_EQ(consumer.samples, expected);

    RecordingConsumer early;
    VideoAvcParser without_sets(&early, 25);
    put(without_sets, Bytes{7});
    without_sets.Flush();
    expected = {{{7}, 0, false}};
    EXPECT_EQ(early.samples, expected);
}

TEST(VideoAvcParser, CountsTimeInFramePeriods) {
    constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
    constexpr double kInfinity = std::numeric_limits<double>::infinity();
    struct Case {
        double rate;
        std::vector<long long> times;
    };
    for (const Case& c :
         {Case{25, {0, 40000, 80000, 120000, 160000}}, Case{30, {0, 33333, 66666, 99999, 133333}},
          Case{30000.0 / 1001, {0, 33366, 66733, 100100, 133466}}, Case{0, {0, 0, 0, 0, 0}},
          Case{-0.0, {0, 0, 0, 0, 0}}, Case{-25, {0, -40000, -80000, -120000, -160000}},
          Case{kNan, {0, 0, 0, 0, 0}}, Case{kInfinity, {0, 0, 0, 0, 0}},
          Case{1e-300, {0, LLONG_MAX, LLONG_MAX, LLONG_MAX, LLONG_MAX}},
          Case{-5e-324, {0, LLONG_MIN, LLONG_MIN, LLONG_MIN, LLONG_MIN}}}) {
        RecordingConsumer consumer;
        VideoAvcParser parser(&consumer, c.rate);
        put(parser, kSps + kPps + kIdr + kSlice + kSlice + kSlice + kSlice + kAud);
        std::vector<long long> times;
        for (const RecordedSample& sample : consumer.samples) {
            times.push_back(sample.time);
        }
        EXPECT_EQ(times, c.times) << c.rate;
    }
}

// The floating-point unit of a host may round otherwise, and to fewer digits.
TEST(VideoAvcParser, CountsTimeWhateverTheFloatingPointUnitIsSetTo) {
    for (const int rounding : {FE_DOWNWARD, FE_UPWARD, FE_TOWARDZERO, FE_TONEAREST}) {
        for (const bool x87_doubles : {false, true}) {
            RecordingConsumer consumer;
            VideoAvcParser parser(&consumer, 30);
            std::fenv_t before;
            std::fegetenv(&before);
            std::fesetround(rounding);
#if defined(__i386__) || defined(__x86_64__)
            if (x87_doubles) {
                std::uint16_t control;
                asm volatile("fnstcw %0" : "=m"(control));
                control = static_cast<std::uint16_t>((control & ~0x300) | 0x200);  // 53 bits
                asm volatile("fldcw %0" : : "m"(control));
            }
#endif
            put(parser, kSps + kPps + kIdr + kSlice + kSlice + kSlice + kSlice + kAud);
            std::fesetenv(&before);
            std::fesetround(FE_TONEAREST);  // MinGW's fesetenv leaves the SSE unit as it is
            ASSERT_EQ(consumer.samples.size(), 5u);
            EXPECT_EQ(consumer.samples[3].time, 99999) << rounding << " " << x87_doubles;
        }
    }
}

TEST(VideoAvcParser, GrowsItsBufferInSteps) {
    VideoAvcParser parser(nullptr, 25);
    const Bytes bytes(100001, 0xff);
    const auto add = [&](int len) { parser.AddDataToBuffer(bytes.data(), len); };
    EXPECT_EQ(parser.GetBufferCapacity(), 100000);
    add(100000);
    EXPECT_EQ(parser.GetBufferCapacity(), 100000);
    add(60000);
    EXPECT_EQ(parser.GetBufferCapacity(), 160000);
    add(100);
    EXPECT_EQ(parser.GetBufferCapacity(), 210000);
    add(49900);
    EXPECT_EQ(parser.GetBufferCapacity(), 210000);
    add(50000);
    EXPECT_EQ(parser.GetBufferCapacity(), 260000);
    parser.AddDataToBuffer(nullptr, 100000);
    add(-1);
    EXPECT_EQ(parser.GetBufferCapacity(), 260000);
    parser.Flush();
    add(100001);
    EXPECT_EQ(parser.GetBufferCapacity(), 260000);
}

TEST(VideoAvcParser, ConnectsOneConsumer) {
    RecordingConsumer first;
    RecordingConsumer second;
    first.status = 7;
    VideoAvcParser parser(nullptr, 25);
    EXPECT_EQ(parser.Connect(&first), 7);
    EXPECT_EQ(first.configs.size(), 1U);
    parser.Disconnect(&second);
    put(parser, kSps + kPps + kIdr + kIdr);
    EXPECT_EQ(first.configs.size(), 2U);
    EXPECT_EQ(first.samples.size(), 1U);
    EXPECT_EQ(parser.Connect(&second), 0);
    put(parser, kIdr);
    EXPECT_EQ(first.samples.size(), 1U);
    EXPECT_EQ(second.samples.size(), 1U);
    EXPECT_EQ(parser.Connect(nullptr), 0);
    put(parser, kIdr);
    EXPECT_EQ(second.samples.size(), 1U);
}

TEST(VideoAvcParser, KeepsItsPlaceWhenAConsumerThrows) {
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 25);
    put(parser, kSps + kPps);
    consumer.throws = true;
    EXPECT_THROW(put(parser, kIdr + kAud + kSlice), std::runtime_error);
    consumer.throws = false;
    put(parser, kIdr);
    const std::vector<RecordedSample> expected = {{kAud, 40000, false}, {kSlice, 80000, false}};
    EXPECT_EQ(consumer.samples, expected);
}

TEST(VideoAvcParser, TellsTheListenerOfEveryUnit) {
    VideoAvcParser parser(nullptr, 25);
    std::vector<Bytes> units;
    parser.SetUnitListener(
        [&](const unsigned char* unit, int size) { units.emplace_back(unit, unit + size); });
    put(parser, kAud + kSps + kPps + kIdr + kSlice);
    parser.Flush();
    EXPECT_EQ(units, (std::vector<Bytes>{kAud, kSps, kPps, kIdr, kSlice}));
}

// Work that grows with the square of the bytes takes hours here.
TEST(VideoAvcParser, LooksAtAByteAConstantNumberOfTimes) {
    constexpr int kUnitBytes = 4 << 20;
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, 25);
    put(parser, kSps + kPps + kIdr);
    const unsigned char byte = 0x55;
    for (int i = 0; i < kUnitBytes; ++i) {
        parser.PutNextAvcData(&byte, 1);
    }
    put(parser, kAud);
    ASSERT_EQ(consumer.samples.size(), 1U);
    EXPECT_EQ(consumer.samples[0].bytes.size(), kIdr.size() + kUnitBytes);

    constexpr int kUnits = 2 << 20;
    Bytes many;
    for (int i = 0; i < kUnits; ++i) {
        many.insert(many.end(), kAud.begin(), kAud.end());
    }
    consumer.samples.clear();
    put(parser, many);
    EXPECT_EQ(consumer.samples.size(), static_cast<std::size_t>(kUnits));
}

}  // namespace
