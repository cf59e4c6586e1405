#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <optional>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "zoltenc/EncodeRun.h"
#include "zoltenc/Options.h"

namespace {

constexpr int kFailure = 1;
constexpr int kWrongUsage = 2;

// A standard stream that the caller closed must not become the descriptor of a file that is opened
// later. It is replaced by one on which reading (standard input) or writing (the others) fails.
void occupy_standard_streams() {
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        if (fcntl(stream, F_GETFD) == -1) {
            const int mode = stream == STDIN_FILENO ? O_WRONLY : O_RDONLY;
            if (open("/dev/null", mode) != stream) {
                std::exit(kFailure);
            }
        }
    }
}

// Returns the exit status of a run that went well; that of a stopped one is the one of a process
// that the signal has ended.
int run(const zolt::Options& options) {
    constexpr int kSignalBase = 128;
    zolt::StopSignal::install();
    try {
        zolt::EncodeRun(options).run();
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
    occupy_standard_streams();
    // A closed pipe is an error of the write, which names the output.
    signal(SIGPIPE, SIG_IGN);
    try {
        const std::optional<zolt::Options> options = zolt::Options::parse(argc, argv);
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
