#pragma once

#include <cstdint>
#include <optional>

#include "io/FrameRate.h"

namespace zolt {

// The times of an encoder's pictures, which only ever increase, made from those of the buffers,
// which may be missing, stand still or jump back.
class SessionClock {
public:
    // Pictures without a usable time come at this rate.
    void set_frame_rate(const FrameRate& rate);

    // The next picture does not follow the last one: its distance means nothing.
    void interrupt() { last_.reset(); }

    // The next picture's time in microseconds, given that of its buffer in nanoseconds.
    std::int64_t next(std::optional<std::uint64_t> buffer_time);

    // When the last picture ends if the next one comes at the frame rate, microseconds.
    std::int64_t end() const { return time_ + interval_; }

private:
    std::int64_t interval_ = 0;  // microseconds, at least 1
    std::int64_t time_ = 0;
    bool started_ = false;
    std::optional<std::uint64_t> last_;  // the last buffer's time, in microseconds
};

}  // namespace zolt
