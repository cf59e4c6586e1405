#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "io/FrameRate.h"

namespace zolt {

// Frames and bytes so far, as a line on a terminal that is written over and over, and as a summary.
class Progress {
public:
    // `total` frames are expected, if known. Shows nothing when not `visible` or when standard
    // error is no terminal.
    Progress(std::optional<std::int64_t> total, const FrameRate& frame_rate, bool visible);

    // To be called after every frame; draws the line a few times a second.
    void update(std::int64_t frames, std::int64_t bytes);

    // Wipes the line away, so that other text can follow.
    void clear();

    // "FRAMES frames in S s (F frames/s), B bytes, K kbit/s"; kbit/s at the stream's frame rate.
    std::string summary(std::int64_t frames, std::int64_t bytes) const;

private:
    using Clock = std::chrono::steady_clock;

    double seconds() const;
    double kilobits_per_second(std::int64_t frames, std::int64_t bytes) const;

    std::optional<std::int64_t> total_;
    double frame_rate_;
    bool on_terminal_;
    Clock::time_point start_ = Clock::now();
    Clock::time_point last_drawn_ = start_;
    bool drawn_ = false;
};

}  // namespace zolt
