#include "io/ReadAheadSource.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "ListSource.h"
#include "io/ToolError.h"

namespace zolt {
namespace {

constexpr PictureFormat kFormat{PictureFormat::kIyuv, 16, 16};

std::unique_ptr<ListSource> list_of(int count) {
    std::vector<ListSource::Picture> pictures;
    for (int i = 0; i < count; ++i) {
        pictures.emplace_back(kFormat.sample_bytes(), static_cast<unsigned char>(i));
    }
    return std::make_unique<ListSource>(kFormat, std::move(pictures));
}

TEST(ReadAheadSource, GivesWhatTheOtherSourceGivesWithItsTimes) {
    constexpr int kPictures = 200;
    auto list = list_of(kPictures);
    list->own_traits.rotation = 90;
    ReadAheadSource source(std::move(list), 3);
    EXPECT_EQ(source.traits().rotation, 90);
    ListSource::Picture picture(kFormat.sample_bytes());
    for (int i = 0; i < kPictures; ++i) {
        EXPECT_EQ(source.frames_left(), kPictures - i);
        ASSERT_TRUE(source.read(picture));
        EXPECT_EQ(picture,
                  ListSource::Picture(kFormat.sample_bytes(), static_cast<unsigned char>(i)));
        EXPECT_EQ(source.time().start, i * i);
        EXPECT_EQ(source.time().duration, 2 * i + 1);
        EXPECT_EQ(source.closing_remark(), std::to_string(i + 1) + " read");
    }
    EXPECT_FALSE(source.read(picture));
    EXPECT_FALSE(source.read(picture));
}

TEST(ReadAheadSource, ReadsNoFurtherAheadThanAsked) {
    std::atomic<int> reads{0};
    auto list = list_of(100);
    list->before_read = [&](int) { ++reads; };
    ReadAheadSource source(std::move(list), 2);
    EXPECT_EQ(reads, 0);
    ListSource::Picture picture(kFormat.sample_bytes());
    for (int taken = 1; taken <= 10; ++taken) {
        ASSERT_TRUE(source.read(picture));
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
        EXPECT_LE(reads, taken + 2);
        // While nobody takes anything, the next ones come.
        for (int wait = 0; wait < 1000 && reads < taken + 2; ++wait) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        EXPECT_EQ(reads, taken + 2);
    }
}

TEST(ReadAheadSource, DeliversAFailureInItsPlace) {
    auto list = list_of(5);
    list->before_read = [](int index) {
        if (index == 3) {
            throw TruncatedInput("cut off at 3");
        }
    };
    ReadAheadSource source(std::move(list), 4);
    ListSource::Picture picture(kFormat.sample_bytes());
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(source.read(picture));
    }
    try {
        source.read(picture);
        FAIL() << "no failure";
    } catch (const TruncatedInput& error) {
        EXPECT_STREQ(error.what(), "cut off at 3");
    }
    EXPECT_FALSE(source.read(picture));
}

TEST(ReadAheadSource, EndsAReadThatWaits) {
    std::atomic<bool> interrupted{false};
    auto list = list_of(5);
    list->before_read = [&](int index) {
        while (index == 2 && !interrupted) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    };
    list->on_interrupt = [&] { interrupted = true; };
    {
        ReadAheadSource source(std::move(list), 1);
        ListSource::Picture picture(kFormat.sample_bytes());
        ASSERT_TRUE(source.read(picture));
    }
    EXPECT_TRUE(interrupted);
    const ReadAheadSource never_read(list_of(5), 1);
}

}  // namespace
}  // namespace zolt
