#pragma once

namespace zolt {

// Asks for the cache line at p, which may be any address.
inline void prefetch(const void* p) {
#if defined(__GNUC__)
    __builtin_prefetch(p);
    // GCC takes a function that does nothing else for one without effect and drops its calls.
    __asm__ volatile("");
#else
    static_cast<void>(p);
#endif
}

}  // namespace zolt
