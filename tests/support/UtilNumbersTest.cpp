#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <climits>
#include <limits>
#include <memory>

#include "support/MemUtil.h"
#include "support/Util.h"

namespace {

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

TEST(UtilNumbers, ClosestElementIsTheFirstOfEquallyNearOnes) {
    const int ints[] = {10, 20, INT_MIN, INT_MAX};
    EXPECT_EQ(10, Util::GetClosest(15, ints, 2));
    EXPECT_EQ(20, Util::GetClosest(16, ints, 2));
    EXPECT_EQ(10, Util::GetClosest(-1000000000, ints, 4));  // the distances leave the range of int
    EXPECT_EQ(INT_MAX, Util::GetClosest(2000000000, ints, 4));
    EXPECT_EQ(0, Util::GetClosest(15, ints, 0));

    const double doubles[] = {1.5, 2.5, -1e308, 1e308};
    EXPECT_EQ(1.5, Util::GetClosest(2.0, doubles, 2));
    EXPECT_EQ(2.5, Util::GetClosest(2.01, doubles, 4));
    EXPECT_EQ(1e308, Util::GetClosest(1.7e308, doubles, 4));
    EXPECT_EQ(1.5, Util::GetClosest(kNan, doubles, 4));
    EXPECT_EQ(0.0, Util::GetClosest(2.0, doubles, -1));
}

TEST(UtilNumbers, PowersOfTwo) {
    struct {
        int n, next, closest, log;
    } const rows[] = {
        {INT_MIN, 1, 1, -1},
        {-1, 1, 1, -1},
        {0, 1, 1, -1},
        {1, 1, 1, 0},
        {2, 2, 2, 1},
        {3, 4, 4, 1},
        {5, 8, 4, 2},
        {6, 8, 8, 2},
        {11, 16, 8, 3},
        {12, 16, 16, 3},
        {(1 << 30) - 1, 1 << 30, 1 << 30, 29},
        {(1 << 30) + 1, 1 << 30, 1 << 30, 30},
        {INT_MAX, 1 << 30, 1 << 30, 30},
    };
    for (const auto& row : rows) {
        EXPECT_EQ(row.next, Util::NextPowerOf2(row.n)) << row.n;
        EXPECT_EQ(row.closest, Util::ClosestPowerOf2(row.n)) << row.n;
        EXPECT_EQ(row.log, Util::IntLog2(row.n)) << row.n;
    }
}

TEST(UtilNumbers, RoundDownIsIntegerDivision) {
    EXPECT_EQ(1072, Util::RoundDown(1080, 16));
    EXPECT_EQ(-16, Util::RoundDown(-17, 16));
    EXPECT_EQ(0, Util::RoundDown(15, 16));
    EXPECT_EQ(INT_MIN, Util::RoundDown(INT_MIN, -1));
}

TEST(UtilNumbers, StandardDeviationTruncatesEachStep) {
    const short spread[] = {2, 4, 4, 4, 5, 5, 7, 9};  // mean 5, mean square 29
    EXPECT_EQ(2, Util::StandardDevShort(spread, 8));
    const short uneven[] = {1, 2};  // mean 1, mean square 2: root of 1
    EXPECT_EQ(1, Util::StandardDevShort(uneven, 2));
    const short extremes[] = {-32768, 32767};
    EXPECT_EQ(32767, Util::StandardDevShort(extremes, 2));  // root of 1073709056 - 0
    EXPECT_EQ(0, Util::StandardDevShort(extremes, 1));
    EXPECT_EQ(0, Util::StandardDevShort(nullptr, 0));
}

TEST(UtilNumbers, FourCharacterCodes) {
    char text[5];
    EXPECT_STREQ("avc1", Util::FourccToString(0x61766331, text));
    EXPECT_STREQ("BGR ", Util::FourccToString(0x42475220, text));
    EXPECT_STREQ("\xff\xfe\xfd\xfc", Util::FourccToString(static_cast<int>(0xfffefdfc), text));

    EXPECT_TRUE(Util::IsAudio(0x2e6d7033));  // .mp3
    EXPECT_TRUE(Util::IsAudio(0x756e6361));  // unca
    EXPECT_FALSE(Util::IsAudio(0x756e6376));
    EXPECT_TRUE(Util::IsVideo(0x756e6376));  // uncv
    EXPECT_TRUE(Util::IsVideo(0x776d3976));  // wm9v
    EXPECT_FALSE(Util::IsVideo(0x23232323));
}

TEST(UtilRandom, FollowsTheMinimalStandardSequence) {
    EXPECT_EQ(16807, Util::Random(1));
    EXPECT_EQ(282475249, Util::Random(16807));
    // The generator's published check: the 10000th value from 1.
    long seed = 1;
    for (int i = 0; i < 10000; i++) {
        seed = Util::Random(seed);
    }
    EXPECT_EQ(1043618065, seed);

    for (const long unusual : {0L, -1L, LONG_MIN, LONG_MAX, Util::RandomMaxVal, -Util::RandomMaxVal,
                               LONG_MAX / Util::RandomMaxVal * Util::RandomMaxVal}) {
        const long value = Util::Random(unusual);
        EXPECT_GE(value, 1) << unusual;
        EXPECT_LT(value, Util::RandomMaxVal) << unusual;
    }
    EXPECT_EQ(Util::Random(5), Util::Random(5 - Util::RandomMaxVal));
}

TEST(UtilRandom, ScalesIntoTheRange) {
    EXPECT_EQ(13, Util::ScaleRandomValueToRange(9L, 10L, 15L));
    EXPECT_EQ(-5, Util::ScaleRandomValueToRange(11L, -5L, 5L));
    EXPECT_EQ(7, Util::ScaleRandomValueToRange(11L, 7L, 3L));
    EXPECT_EQ(LONG_MIN + 11, Util::ScaleRandomValueToRange(11L, LONG_MIN, LONG_MAX));
    EXPECT_EQ(-1, Util::ScaleRandomValueToRange(LONG_MAX, LONG_MIN, LONG_MAX - 1));
    EXPECT_DOUBLE_EQ(2.5, Util::ScaleRandomValueToRange(Util::RandomMaxVal, 1.0, 2.5));
    EXPECT_DOUBLE_EQ(1.0, Util::ScaleRandomValueToRange(0L, 1.0, 2.5));
    EXPECT_DOUBLE_EQ(7.0, Util::ScaleRandomValueToRange(5L, 7.0, 3.0));

    long seed = 1;
    EXPECT_EQ(10 + 16807 % 6, Util::GetNextScaledRandomValue(&seed, 10L, 15L));
    EXPECT_EQ(16807, seed);
    EXPECT_DOUBLE_EQ(282475249.0 / 2147483647.0, Util::GetNextScaledRandomValue(&seed, 0.0, 1.0));
    EXPECT_EQ(282475249, seed);
}

TEST(MemUtil, ArraysGrowAndNeverShrink) {
    unsigned char* bytes = nullptr;
    int size = 0;
    EXPECT_EQ(0, MemUtil::CheckSizeArrayByte(&bytes, &size, 0));
    EXPECT_EQ(nullptr, bytes);
    EXPECT_EQ(1, MemUtil::CheckSizeArrayByte(&bytes, &size, 4));
    EXPECT_EQ(4, size);
    bytes[3] = 9;
    EXPECT_EQ(0, MemUtil::CheckSizeArrayByte(&bytes, &size, 3));
    EXPECT_EQ(0, MemUtil::CheckSizeArrayByte(&bytes, &size, -1));
    EXPECT_EQ(4, size);
    EXPECT_EQ(9, bytes[3]);
    EXPECT_EQ(1, MemUtil::CheckSizeArrayByte(&bytes, &size, 5));
    EXPECT_EQ(5, size);
    bytes[4] = 1;
    delete[] bytes;

    double* doubles = nullptr;
    size = 0;
    EXPECT_EQ(1, MemUtil::CheckSizeArrayDouble(&doubles, &size, 2));
    doubles[1] = 1;
    delete[] doubles;
}

TEST(MemUtil, TwoDimArraysAreZeroAndReleased) {
    int** ints = MemUtil::CreateTwoDimArrayInt(3, 2);
    for (int row = 0; row < 3; row++) {
        EXPECT_EQ(0, ints[row][0]);
        EXPECT_EQ(0, ints[row][1]);
    }
    MemUtil::DeleteTwoDimArrayInt(&ints, 3);
    EXPECT_EQ(nullptr, ints);
    MemUtil::DeleteTwoDimArrayInt(&ints, 3);

    double** empty = MemUtil::CreateTwoDimArrayDouble(0, -1);
    ASSERT_NE(nullptr, empty);
    MemUtil::DeleteTwoDimArrayDouble(&empty, 0);
}

TEST(UtilArrays, CopiesBelongToTheCaller) {
    const int ints[] = {1, -2, 3};
    const std::unique_ptr<int[]> copy(Util::CopyArrayInt(ints, 3));
    EXPECT_TRUE(std::equal(ints, ints + 3, copy.get()));
    const std::unique_ptr<unsigned char[]> none(
        Util::CopyArrayByte(reinterpret_cast<const unsigned char*>(""), 0));
    EXPECT_NE(nullptr, none);
    EXPECT_EQ(nullptr, Util::CopyArrayByte(nullptr, 3));
    EXPECT_EQ(nullptr, Util::CopyArrayDouble(nullptr, 0));
}

class SleepMsecs : public testing::Test {
protected:
    long long elapsed_msecs() const {
        return std::chrono::duration_cast<std::chrono::milliseconds>(
                   std::chrono::steady_clock::now() - start)
            .count();
    }

    const std::chrono::steady_clock::time_point start = std::chrono::steady_clock::now();
};

TEST_F(SleepMsecs, SleepsTheWholeTime) {
    EXPECT_EQ(0, Util::SleepMsecs(0, nullptr));
    EXPECT_EQ(0, Util::SleepMsecs(-5, nullptr));
    EXPECT_LT(elapsed_msecs(), 50);
    errno = 77;
    EXPECT_EQ(0, Util::SleepMsecs(130, nullptr));
    EXPECT_EQ(77, errno);
    EXPECT_GE(elapsed_msecs(), 130);
}

TEST_F(SleepMsecs, LooksAtTheFlagBeforeEachSliceOnly) {
    const bool stop = true;
    EXPECT_EQ(1, Util::SleepMsecs(60000, &stop));
    EXPECT_LT(elapsed_msecs(), 5000);
    EXPECT_EQ(0, Util::SleepMsecs(99, &stop));
    EXPECT_GE(elapsed_msecs(), 99);
}

}  // namespace
