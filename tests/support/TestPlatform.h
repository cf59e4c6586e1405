#pragma once

#include <string>

#include "support/dl.h"

// What the tests ask of the operating system in ways of its own.

#ifdef _WIN32

#include <windows.h>

#include <cstdlib>
#include <filesystem>

// Whether the library of that file is loaded.
inline bool library_is_loaded(const std::string& path) {
    return GetModuleHandleW(std::filesystem::u8path(path).c_str()) != nullptr;
}

// Sets an environment variable, or takes it away where `value` is null.
inline void set_environment(const char* name, const char* value) {
    // An empty value takes the variable away.
    _putenv_s(name, value == nullptr ? "" : value);
}

// An empty file that takes whatever is written to it.
constexpr const char kNullDevice[] = "NUL";

#else

#include <cstdlib>

inline bool library_is_loaded(const std::string& path) {
    void* handle = dlopen(path.c_str(), RTLD_LAZY | RTLD_NOLOAD);
    if (handle != nullptr) {
        dlclose(handle);
    }
    return handle != nullptr;
}

inline void set_environment(const char* name, const char* value) {
    if (value == nullptr) {
        unsetenv(name);
    } else {
        setenv(name, value, 1);
    }
}

constexpr const char kNullDevice[] = "/dev/null";

#endif
