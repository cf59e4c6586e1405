#include "SessionClock.h"

#include <algorithm>

namespace zolt {

void SessionClock::set_frame_rate(const FrameRate& rate) {
    interval_ = std::max<std::int64_t>(rate.sample_time(1), 1);
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
        time_ += follows ? static_cast<std::int64_t>(*buffer_time - *last_) : interval_;
    }
    started_ = true;
    last_ = buffer_time;
    return time_;
}

}  // namespace zolt
