#pragma once

#include <cstdio>
#include <cstdlib>

namespace zolt {

// Ends the process, which the fuzzer reports as a finding, when a property does not hold.
inline void check(bool holds, const char* property) {
    if (!holds) {
        std::fprintf(stderr, "does not hold: %s\n", property);
        std::abort();
    }
}

}  // namespace zolt
