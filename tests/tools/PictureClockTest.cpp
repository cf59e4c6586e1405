#include "io/PictureClock.h"

#include <gtest/gtest.h>

#include <limits>
#include <vector>

namespace zolt {
namespace {

constexpr std::optional<std::int64_t> kNone = std::nullopt;
constexpr std::int64_t kFar = std::numeric_limits<std::int64_t>::max();

TEST(PictureClock, MakesTimesGrow) {
    struct Case {
        const char* what;
        std::vector<std::optional<std::int64_t>> stated;
        std::vector<std::int64_t> expected;
        int repairs;
    };
    const Case cases[] = {
        {"as they are", {-20, 0, 7, 1000000}, {-20, 0, 7, 1000000}, 0},
        {"none", {kNone, kNone, kNone}, {0, 10, 20}, 3},
        {"some missing", {5, kNone, 25, kNone}, {5, 15, 25, 35}, 2},
        {"one too early, then as stated", {0, 10, 10, 30, 25, 40}, {0, 10, 11, 30, 31, 40}, 2},
        {"a clock that begins anew", {900, 910, 0, 10, 20}, {900, 910, 920, 930, 940}, 1},
        {"twice anew", {900, 0, 500, 0, 10}, {900, 910, 1410, 1420, 1430}, 2},
        {"absurd ones", {0, kFar, -kFar, 30}, {0, 10, 20, 30}, 2},
    };
    for (const Case& test : cases) {
        SCOPED_TRACE(test.what);
        PictureClock clock(10);
        std::vector<std::int64_t> starts;
        for (const auto& stated : test.stated) {
            const PictureTime time = clock.next(stated, 0);
            starts.push_back(time.start);
            EXPECT_EQ(time.duration, 10);
        }
        EXPECT_EQ(starts, test.expected);
        EXPECT_EQ(clock.repairs(), test.repairs);
    }
}

TEST(PictureClock, KeepsDurationsThatMakeSense) {
    PictureClock clock(10);
    EXPECT_EQ(clock.next(0, 33).duration, 33);
    EXPECT_EQ(clock.next(kNone, 0).start, 33);
    EXPECT_EQ(clock.next(100, -5).duration, 10);
    EXPECT_EQ(clock.next(200, kFar).duration, 10);
}

}  // namespace
}  // namespace zolt
