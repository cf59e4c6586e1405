#include "zoltenc/Progress.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "io/os.h"
#include "zoltenc/JsonLines.h"
#include "zoltenc/StreamTally.h"

namespace zolt {
namespace {

constexpr std::chrono::milliseconds kDrawInterval(250);
constexpr std::chrono::milliseconds kJsonInterval(500);
constexpr std::chrono::seconds kLineInterval(5);

// A line that is longer than the terminal is wide is cut, not wrapped: it could not be wiped away.
constexpr const char* kBeginLine = "\r\033[K\033[?7l";
constexpr const char* kEndLine = "\033[?7h";
constexpr const char* kWipeLine = "\r\033[K";

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

Progress::Progress(const Settings& settings, const StreamTally& tally)
    : settings_(settings),
      tally_(tally),
      on_terminal_(os_has_terminal()),
      interval_(settings.json != nullptr ? kJsonInterval
                : on_terminal_           ? kDrawInterval
                                         : kLineInterval) {}

void Progress::update() {
    const Clock::time_point now = Clock::now();
    if (now - last_shown_ < interval_) {
        return;
    }
    last_shown_ = now;
    if (settings_.json != nullptr) {
        write_json();
    } else if (settings_.visible && on_terminal_) {
        drawn_ = true;
        std::fprintf(stderr, "%s%s%s", kBeginLine, line().c_str(), kEndLine);
        std::fflush(stderr);
    } else if (settings_.visible) {
        std::fprintf(stderr, "%s\n", line().c_str());
    }
}

void Progress::clear() {
    if (drawn_) {
        std::fputs(kWipeLine, stderr);
        drawn_ = false;
    }
}

double Progress::seconds() const {
    constexpr double kShortest = 1e-6;
    return std::max(kShortest, std::chrono::duration<double>(Clock::now() - start_).count());
}

// "run 2 of 4: 42 %, 126/300 frames, 85.3 frames/s (2.8x), 212.4 kbit/s now, 198.1 of 200 over all,
// 0:02 left".
std::string Progress::line() const {
    const double elapsed = seconds();
    const auto frames = static_cast<double>(tally_.frames());
    std::string text;
    if (settings_.passes > 1) {
        text = "run " + std::to_string(settings_.pass) + " of " + std::to_string(settings_.passes) +
               ": ";
    }
    std::string count = std::to_string(tally_.frames());
    std::string left;
    if (settings_.frames && *settings_.frames >= tally_.frames()) {
        const auto total = static_cast<double>(*settings_.frames);
        char percent[16];
        std::snprintf(percent, sizeof percent, "%.0f %%, ", 100 * frames / total);
        text += percent;
        count += "/" + std::to_string(*settings_.frames);
        left = ", " + clock_text((total - frames) * elapsed / frames) + " left";
    }
    const std::string target =
        settings_.target_kbs == 0 ? "" : " of " + std::to_string(settings_.target_kbs);
    char rates[160];
    std::snprintf(rates, sizeof rates,
                  " frames, %.1f frames/s (%.1fx), %.1f kbit/s now, %.1f%s over all",
                  frames / elapsed, tally_.stream_seconds() / elapsed, tally_.last_second_kbs(),
                  tally_.kilobits_per_second(), target.c_str());
    return text + count + rates + left;
}

void Progress::write_json() const {
    const double elapsed = seconds();
    const auto frames = static_cast<double>(tally_.frames());
    JsonObject object;
    object.add("type", "progress").add("run", settings_.pass).add("frames", tally_.frames());
    if (settings_.frames && *settings_.frames >= tally_.frames()) {
        const auto total = static_cast<double>(*settings_.frames);
        object.add("frames_expected", *settings_.frames)
            .add("percent", 100 * frames / total)
            .add("seconds_left", (total - frames) * elapsed / frames);
    }
    object.add("seconds", elapsed)
        .add("fps", frames / elapsed)
        .add("speed", tally_.stream_seconds() / elapsed)
        .add("kbps_now", tally_.last_second_kbs())
        .add("kbps", tally_.kilobits_per_second());
    if (settings_.target_kbs != 0) {
        object.add("target_kbps", settings_.target_kbs);
    }
    settings_.json->write(object);
}

}  // namespace zolt
