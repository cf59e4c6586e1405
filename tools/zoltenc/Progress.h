#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

namespace zolt {

class JsonLines;
class StreamTally;

// How far a run is: a line on a terminal that is written over and over, a line every few seconds
// where standard error is none, or JSON for programs.
class Progress {
public:
    struct Settings {
        std::optional<std::int64_t> frames;  // that are expected, if known
        int target_kbs = 0;                  // 0: no rate control
        int pass = 1;
        int passes = 1;             // at most; 1: not worth telling
        JsonLines* json = nullptr;  // borrowed; takes the place of lines for people
        bool visible = true;
    };

    // `tally` is borrowed.
    Progress(const Settings& settings, const StreamTally& tally);

    // To be called after every picture; shows something a few times a second at most.
    void update();

    // Wipes the line away, so that other text can follow.
    void clear();

    // Since the run began.
    double seconds() const;

private:
    using Clock = std::chrono::steady_clock;

    std::string line() const;
    void write_json() const;

    Settings settings_;
    const StreamTally& tally_;
    bool on_terminal_;
    Clock::duration interval_;
    Clock::time_point start_ = Clock::now();
    Clock::time_point last_shown_ = start_;
    bool drawn_ = false;
};

}  // namespace zolt
