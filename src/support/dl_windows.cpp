#include <windows.h>

#include <cstdio>
#include <string>

#include "support/dl.h"
#include "support/windows_names.h"

namespace {

// Empty: no error.
char errorText[208];

void set_error(const char* operation) {
    std::snprintf(errorText, sizeof errorText, "Error in %s failed with windows error code %lu",
                  operation, GetLastError());
}

// Whether a handle is there, as every handle that dlopen gave is.
bool check_handle(void* handle, const char* operation) {
    errorText[0] = '\0';
    if (handle == nullptr) {
        std::snprintf(errorText, sizeof errorText, "Error in %s: NULL handle", operation);
    }
    return handle != nullptr;
}

}  // namespace

void* dlopen(const char* name, int) {
    errorText[0] = '\0';
    std::wstring utf16;
    HMODULE module = zolt::to_utf16(name, &utf16) ? LoadLibraryW(utf16.c_str()) : nullptr;
    if (module == nullptr) {
        set_error("dlopen: LoadLibrary()");
    }
    return module;
}

void* dlsym(void* handle, const char* name) {
    if (!check_handle(handle, "dlsym")) {
        return nullptr;
    }
    const FARPROC function = GetProcAddress(static_cast<HMODULE>(handle), name);
    if (function == nullptr) {
        set_error("dlsym: GetProcAddress()");
    }
    return reinterpret_cast<void*>(function);
}

int dlclose(void* handle) {
    if (!check_handle(handle, "dlclose")) {
        return -1;
    }
    if (!FreeLibrary(static_cast<HMODULE>(handle))) {
        set_error("dlclose: FreeLibrary()");
        return -1;
    }
    return 0;
}

const char* dlerror() {
    return errorText[0] == '\0' ? nullptr : errorText;
}
