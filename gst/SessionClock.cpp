#include "SessionClock.h"

#include <algorithm>

namespace zolt {

namespace {

// No pause is longer, so that the sum stays in range however many there are.
constexpr std::int64_t kLongest = 3600LL * 1000 * 1000;

}  // namespace

void SessionClock::set_frame_rate(const FrameRate& rate) {
    interval_ = std::clamp<std::int64_t>(rate.sample_time(1), 1, kLongest);
}

std::int64_t SessionClock::next(std::optional<std::uint64_t> buffer_time) {
    constexpr std::uint64_t kPerMicrosecond = 1000;
    if (buffer_time) {
        *buffer_time /= kPerMicrosecond;
    } else if (last_) {
        buffer_time = *last_ + static_cast<std::uint64_t>(interval_);
    }
    const bool follows = buffer_time && last_ && *buffer_time > *last_;
    if (started_) {
        time_ += follows ? static_cast<std::int64_t>(
                               std::min<std::uint64_t>(*buffer_time - *last_, kLongest))
                         : interval_;
    }
    started_ = true;
    last_ = buffer_time;
    return time_;
}

}  // namespace zolt
