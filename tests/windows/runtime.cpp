#include "system.h"

extern "C" {

int _fltused = 0;  // asked for by code with floating point

void* memcpy(void* to, const void* from, Size bytes) {
    auto* const target = static_cast<unsigned char*>(to);
    const auto* const source = static_cast<const unsigned char*>(from);
    for (Size i = 0; i < bytes; ++i) {
        target[i] = source[i];
    }
    return to;
}

void* memset(void* to, int value, Size bytes) {
    auto* const target = static_cast<unsigned char*>(to);
    for (Size i = 0; i < bytes; ++i) {
        target[i] = static_cast<unsigned char>(value);
    }
    return to;
}

}  // extern "C"

// Nothing is allocated here, and what the library allocates is the library's to free.
void operator delete(void*) noexcept {
    ExitProcess(91);
}
void operator delete(void*, Size) noexcept {
    ExitProcess(92);
}
