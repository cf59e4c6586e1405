#pragma once

#include <optional>
#include <vector>

#include "zoltenc/EncodeRun.h"
#include "zoltenc/Options.h"

namespace zolt {

// Codes an input again and again, each time with a target for the encoder's rate control that
// corrects for what it gave before, until the average is near enough to what the options ask, and
// leaves the best of these runs.
class RateMatch {
public:
    static constexpr int kMostRuns = 4;
    static constexpr double kTolerance = 0.03;  // of the target

    // The options and `json` (null for none) are the caller's.
    RateMatch(const Options& options, JsonLines* json) : options_(options), json_(json) {}

    // Throws as EncodeRun::run does, and a UsageError where the input cannot be read again or the
    // output not be written again.
    void run();

private:
    struct Trial {
        int asked;   // of the encoder, kbit/s
        double got;  // kbit/s
    };

    std::string shortfall(const EncodeRun& best) const;
    double error(const Trial& trial) const;
    bool is_met(const Trial& trial) const;
    bool is_at_limit(const Trial& trial) const;
    std::optional<int> next_target() const;

    const Options& options_;
    JsonLines* json_;
    std::vector<Trial> trials_;
};

}  // namespace zolt
