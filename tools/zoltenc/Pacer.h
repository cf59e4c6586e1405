#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

namespace zolt {

// Holds pictures back until their times, as if a camera gave them.
class Pacer {
public:
    // Returns when as much time has gone by since the first call as `time` (microseconds) is after
    // that call's; at once after a stop signal.
    void wait_for(std::int64_t time);

private:
    using Clock = std::chrono::steady_clock;

    std::optional<Clock::time_point> zero_;  // when the time 0 was
};

}  // namespace zolt
