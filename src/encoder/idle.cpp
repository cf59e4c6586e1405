#include "encoder/idle.h"

namespace zolt {
namespace {

constexpr int kSpins = 200;
constexpr int kPauses = 8;
constexpr int kYields = 1000;

// Tells the processor that this is a waiting loop.
void pause() {
#if defined(__i386__) || defined(__x86_64__)
    __builtin_ia32_pause();
#elif defined(__aarch64__)
    __asm__ volatile("yield");
#endif
}

}  // namespace

void Idle::wait() {
    if (m_calls < kSpins) {
        for (int n = 0; n < kPauses; ++n) {
            pause();
        }
    } else if (m_calls < kSpins + kYields) {
        give_way();
    } else {
        sleep_shortly();
        return;
    }
    ++m_calls;
}

}  // namespace zolt
