#include <cstdio>
#include <exception>
#include <optional>
#include <string>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "io/os.h"
#include "zoltenc/EncodeRun.h"
#include "zoltenc/JsonLines.h"
#include "zoltenc/Options.h"
#include "zoltenc/RateMatch.h"

namespace {

constexpr int kFailure = 1;
constexpr int kWrongUsage = 2;

bool goes_to_standard_output(const std::string& output) {
    const auto ours = zolt::os_status(zolt::kStandardOutput);
    const auto theirs = zolt::os_status(output);
    return output == "-" || (ours && theirs && ours->is_same_file(*theirs));
}

// Returns the exit status of a run that went well; that of a stopped one is the one of a process
// that the signal has ended.
int run(const zolt::Options& options) {
    constexpr int kSignalBase = 128;
    zolt::StopSignal::install();
    std::optional<zolt::JsonLines> json;
    if (options.json) {
        json.emplace(goes_to_standard_output(options.output));
    }
    try {
        if (options.match_rate) {
            zolt::RateMatch(options, json ? &*json : nullptr).run();
        } else {
            zolt::EncodeRun(options, json ? &*json : nullptr).run();
        }
    } catch (const zolt::TruncatedInput&) {
        // A stop signal cuts off the input too.
        if (zolt::StopSignal::received() == 0) {
            throw;
        }
    }
    const int stopped_by = zolt::StopSignal::received();
    return stopped_by == 0 ? 0 : kSignalBase + stopped_by;
}

int report(const std::exception& error, int status) {
    std::fprintf(stderr, "zoltenc: %s\n", error.what());
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    zolt::os_prepare_streams();
    try {
        const char* const* const arguments = zolt::os_command_line(&argc, argv);
        const std::optional<zolt::Options> options = zolt::Options::parse(argc, arguments);
        if (!options) {
            return 0;
        }
        return run(*options);
    } catch (const zolt::UsageError& error) {
        return report(error, kWrongUsage);
    } catch (const std::exception& error) {
        return report(error, kFailure);
    }
}
