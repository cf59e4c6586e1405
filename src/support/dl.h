#pragma once

// Run-time loading of shared libraries, and what their file names look like: the system's own
// dlopen, dlsym, dlclose and dlerror, or on Windows functions of these names.

#ifdef _WIN32

constexpr int RTLD_LAZY = 1;
constexpr int RTLD_NOW = 2;

// The handle of the library of that name (UTF-8), or null. `mode` is not used.
void* dlopen(const char* name, int mode);

// The address of an exported function, or null.
void* dlsym(void* handle, const char* name);

// 0, or -1 when there is no such library.
int dlclose(void* handle);

// What was wrong with the last dlopen, dlsym or dlclose, on any thread; null if nothing was.
const char* dlerror();

namespace zolt {

constexpr char kDirSeparator = '\\';
constexpr const char kDllExtension[] = ".dll";

}  // namespace zolt

#else

#include <dlfcn.h>

namespace zolt {

constexpr char kDirSeparator = '/';
constexpr const char kDllExtension[] = ".so";

}  // namespace zolt

#endif
