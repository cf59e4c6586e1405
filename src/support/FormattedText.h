#pragma once

#include <cstdarg>
#include <cstdio>

namespace zolt {

// A message formatted as by vprintf and cut to Size - 1 characters.
template <int Size>
struct FormattedText {
    FormattedText(const char* fmt, std::va_list args) {
        // An argument that cannot be formatted leaves what was formatted before it.
        std::vsnprintf(text, Size, fmt, args);
        text[Size - 1] = '\0';
    }

    char text[Size]{};
};

}  // namespace zolt
