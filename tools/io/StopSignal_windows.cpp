#include <windows.h>

#include <atomic>
#include <csignal>

#include "io/StopSignal.h"

namespace zolt {
namespace {

std::atomic<int> received_signal{0};
std::atomic<HANDLE> main_thread{nullptr};

// Called on a thread of its own.
BOOL WINAPI note_event(DWORD event) {
    const bool asked = event == CTRL_C_EVENT || event == CTRL_BREAK_EVENT;
    if (received_signal.exchange(asked ? SIGINT : SIGTERM) != 0 && asked) {
        return FALSE;
    }
    // A read that waits for input must return.
    CancelSynchronousIo(main_thread);
    if (!asked) {
        // The process is ended as soon as this returns, or when the system has waited long enough.
        Sleep(INFINITE);
    }
    return TRUE;
}

}  // namespace

void StopSignal::install() {
    HANDLE thread = nullptr;
    DuplicateHandle(GetCurrentProcess(), GetCurrentThread(), GetCurrentProcess(), &thread, 0, FALSE,
                    DUPLICATE_SAME_ACCESS);
    main_thread = thread;
    SetConsoleCtrlHandler(note_event, TRUE);
}

int StopSignal::received() {
    return received_signal;
}

}  // namespace zolt
