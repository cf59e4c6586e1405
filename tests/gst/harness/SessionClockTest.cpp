#include "SessionClock.h"

#include <gtest/gtest.h>

#include <limits>

namespace zolt {
namespace {

TEST(SessionClock, TimesOnlyIncrease) {
    SessionClock clock;
    clock.set_frame_rate({25, 1});
    EXPECT_EQ(clock.next(7'000'000'000), 0);
    EXPECT_EQ(clock.end(), 40'000);
    EXPECT_EQ(clock.next(7'050'000'000), 50'000);   // as the buffers say
    EXPECT_EQ(clock.next(7'050'000'000), 90'000);   // stands still
    EXPECT_EQ(clock.next(1'000'000'000), 130'000);  // jumps back
    EXPECT_EQ(clock.next(1'033'000'000), 163'000);  // and goes on
    EXPECT_EQ(clock.next(std::nullopt), 203'000);   // is missing
    EXPECT_EQ(clock.next(1'113'000'000), 243'000);  // counted from where that would have been
    clock.interrupt();
    EXPECT_EQ(clock.next(900'000'000'000), 283'000);  // does not follow
    clock.set_frame_rate({50, 1});
    EXPECT_EQ(clock.next(std::nullopt), 303'000);
}

TEST(SessionClock, NoPauseIsTooLong) {
    SessionClock clock;
    clock.set_frame_rate({1, std::numeric_limits<std::int32_t>::max()});
    std::int64_t last = clock.next(0);
    for (int n = 0; n < 1000; ++n) {
        const std::int64_t time =
            clock.next(n % 2 == 0 ? std::numeric_limits<std::uint64_t>::max() - 1 : 0);
        ASSERT_GT(time, last);
        last = time;
    }
}

}  // namespace
}  // namespace zolt
