#include "zoltenc/RateMatch.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>
#include <utility>

#include "io/StopSignal.h"

namespace zolt {

void RateMatch::run() {
    std::unique_ptr<EncodeRun> best;
    Trial best_trial{};
    std::optional<int> target = options_.bit_rate_kbs;
    while (target && static_cast<int>(trials_.size()) < kMostRuns) {
        const EncodeRun::Pass pass = {static_cast<int>(trials_.size()) + 1, kMostRuns, *target};
        auto current = std::make_unique<EncodeRun>(options_, json_, pass);
        current->require_repeatable();
        current->encode();
        if (StopSignal::received() != 0) {
            // A whole run is better than part of one.
            best = best ? std::move(best) : std::move(current);
            break;
        }
        const Trial trial = {*target, current->summary().tally.kilobits_per_second()};
        trials_.push_back(trial);
        if (!best || error(trial) < error(best_trial)) {
            best = std::move(current);
            best_trial = trial;
        }
        target = is_met(trial) ? std::nullopt : next_target();
    }
    best->finish(static_cast<int>(trials_.size()));
    if (!trials_.empty() && !is_met(best_trial)) {
        best->note(shortfall(*best));
    }
}

// Why the best run is not near enough.
std::string RateMatch::shortfall(const EncodeRun& best) const {
    const int asked = options_.bit_rate_kbs;
    char text[160];
    std::snprintf(text, sizeof text,
                  "%d kbit/s is not met within %.0f %%: %.1f kbit/s is the nearest of %zu runs",
                  asked, 100 * kTolerance, best.summary().tally.kilobits_per_second(),
                  trials_.size());
    const auto limit = std::find_if(trials_.begin(), trials_.end(),
                                    [this](const Trial& trial) { return is_at_limit(trial); });
    if (limit == trials_.end()) {
        return text;
    }
    return std::string(text) +
           (limit->got > asked
                ? "; the encoder's QP goes in small steps from 28 up to 45 and no further"
                : "; the encoder's QP goes in small steps from 28 down to 18 and no further, and "
                  "its target up to 4000 kbit/s");
}

// Distance from what is asked, the same for twice and half of it.
double RateMatch::error(const Trial& trial) const {
    return std::abs(std::log(trial.got / options_.bit_rate_kbs));
}

bool RateMatch::is_met(const Trial& trial) const {
    return std::abs(trial.got / options_.bit_rate_kbs - 1) <= kTolerance;
}

// Whether the encoder was asked for all that can be asked and gave too much, or too little.
bool RateMatch::is_at_limit(const Trial& trial) const {
    return (trial.asked == 1 && trial.got > options_.bit_rate_kbs) ||
           (trial.asked == Options::kMaxBitRateKbs && trial.got < options_.bit_rate_kbs);
}

// Nothing when no other target can be expected to do better. The answer of the rate control is
// taken for a power of what it is asked between the two nearest trials.
std::optional<int> RateMatch::next_target() const {
    constexpr double kFlat = 0.1;  // exponents below it: the limits of QP are in the way
    std::vector<Trial> nearest = trials_;
    std::sort(nearest.begin(), nearest.end(),
              [this](const Trial& a, const Trial& b) { return error(a) < error(b); });
    const Trial& best = nearest[0];
    if (is_at_limit(best)) {
        return std::nullopt;
    }
    const double wanted = options_.bit_rate_kbs / best.got;
    double exponent = 1;
    if (nearest.size() > 1) {
        exponent = std::log(best.got / nearest[1].got) /
                   std::log(static_cast<double>(best.asked) / nearest[1].asked);
    }
    int target = wanted > 1 ? Options::kMaxBitRateKbs : 1;
    if (exponent > kFlat) {
        const double corrected = best.asked * std::pow(wanted, 1 / exponent);
        target = static_cast<int>(
            std::lround(std::clamp(corrected, 1.0, double{Options::kMaxBitRateKbs})));
    }
    const bool tried = std::any_of(trials_.begin(), trials_.end(),
                                   [target](const Trial& trial) { return trial.asked == target; });
    return tried ? std::nullopt : std::optional<int>(target);
}

}  // namespace zolt
