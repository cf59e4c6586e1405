#include "zoltenc/Progress.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <string>

#include "io/os.h"

namespace zolt {
namespace {

constexpr std::chrono::milliseconds kDrawInterval(250);

// "1:05" or "1:02:05".
std::string clock_text(double seconds) {
    const auto whole = std::llround(seconds);
    char text[32];
    if (whole < 3600) {
        std::snprintf(text, sizeof text, "%lld:%02lld", whole / 60, whole % 60);
    } else {
        std::snprintf(text, sizeof text, "%lld:%02lld:%02lld", whole / 3600, whole / 60 % 60,
                      whole % 60);
    }
    return text;
}

}  // namespace

Progress::Progress(std::optional<std::int64_t> total, const FrameRate& frame_rate, bool visible)
    : total_(total),
      frame_rate_(frame_rate.per_second()),
      on_terminal_(visible && os_has_terminal()) {}

void Progress::update(std::int64_t frames, std::int64_t bytes) {
    const Clock::time_point now = Clock::now();
    if (!on_terminal_ || now - last_drawn_ < kDrawInterval) {
        return;
    }
    last_drawn_ = now;
    drawn_ = true;
    const double rate = static_cast<double>(frames) / seconds();
    std::string count = std::to_string(frames);
    std::string rest;
    if (total_ && *total_ >= frames) {
        count += "/" + std::to_string(*total_);
        rest = ", " + clock_text(static_cast<double>(*total_ - frames) / rate) + " left";
    }
    std::fprintf(stderr, "\r\033[K%s frames, %.1f frames/s, %.1f kbit/s%s", count.c_str(), rate,
                 kilobits_per_second(frames, bytes), rest.c_str());
    std::fflush(stderr);
}

void Progress::clear() {
    if (drawn_) {
        std::fputs("\r\033[K", stderr);
        drawn_ = false;
    }
}

std::string Progress::summary(std::int64_t frames, std::int64_t bytes) const {
    const double elapsed = seconds();
    char text[160];
    std::snprintf(text, sizeof text,
                  "%lld frames in %.2f s (%.1f frames/s), %lld bytes, %.1f kbit/s",
                  static_cast<long long>(frames), elapsed, static_cast<double>(frames) / elapsed,
                  static_cast<long long>(bytes), kilobits_per_second(frames, bytes));
    return text;
}

double Progress::seconds() const {
    constexpr double kShortest = 1e-6;
    return std::max(kShortest, std::chrono::duration<double>(Clock::now() - start_).count());
}

double Progress::kilobits_per_second(std::int64_t frames, std::int64_t bytes) const {
    if (frames == 0) {
        return 0.0;
    }
    return static_cast<double>(bytes) * 8.0 * frame_rate_ / static_cast<double>(frames) / 1000.0;
}

}  // namespace zolt
