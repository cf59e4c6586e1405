#pragma once

namespace zolt {

// Asks for the cache line at p, which may be any address.
inline void prefetch(const void* p) {
#if defined(__GNUC__)
    __builtin_prefetch(p);
#else
    static_cast<void>(p);
#endif
}

}  // namespace zolt
