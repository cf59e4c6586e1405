#include "io/StopSignal.h"

#include <signal.h>

#include <atomic>

namespace zolt {
namespace {

// Lock-free, so that a handler may set it.
std::atomic<int> received_signal{0};

void note_signal(int number) {
    received_signal = number;
}

}  // namespace

void StopSignal::install() {
    struct sigaction action = {};
    action.sa_handler = note_signal;
    // No SA_RESTART: a read that waits for input must return.
    action.sa_flags = SA_RESETHAND;
    sigemptyset(&action.sa_mask);
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

int StopSignal::received() {
    return received_signal;
}

}  // namespace zolt
