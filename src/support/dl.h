#pragma once

#include <dlfcn.h>

// Run-time loading of shared libraries: the system's own dlopen, dlsym, dlclose, dlerror, and what
// its libraries' file names look like.

namespace zolt {

constexpr char kDirSeparator = '/';
constexpr const char kDllExtension[] = ".so";

}  // namespace zolt
