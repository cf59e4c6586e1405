#include "support/DllUtils.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>

#include "support/ErrMgr.h"
#include "support/ErrnoKeeper.h"
#include "support/Util.h"
#include "support/dl.h"
#include "support/os.h"
#include "support/pdir.h"

namespace {

constexpr size_t kExtensionLength = sizeof zolt::kDllExtension - 1;

using Directory = std::unique_ptr<DIR, int (*)(DIR*)>;

// Opening anything but a regular file may wait for ever, as a pipe does that nobody writes to.
bool is_readable_file(const std::string& path) {
    std::FILE* file =
        zolt::os_is_regular_file(path.c_str()) ? Util::Win32FileOpen(path.c_str(), "rb") : nullptr;
    if (file == nullptr) {
        return false;
    }
    std::fclose(file);
    return true;
}

bool is_library_name(const std::string& name) {
    constexpr size_t kShortestName = 4;
    if (name.size() < kShortestName) {
        return false;
    }
    std::string extension = name.substr(name.size() - kExtensionLength);
    Util::StringToLowerCase(extension.data());
    return extension == zolt::kDllExtension;
}

const char* last_dl_error() {
    const char* error = dlerror();
    return error == nullptr ? "no such function" : error;
}

}  // namespace

const char* const DllUtils::EnvVarStreamingEngineLib = "STREAMING_ENGINE_LIB";
const char* const DllUtils::DefaultStreamingEngineLib = ".";
char DllUtils::dllDirectory[288];

void DllUtils::SetDllDir(const char* dir) {
    if (dir == nullptr) {
        return;
    }
    const zolt::ErrnoKeeper keep_errno;
    std::printf("LOAD_DLLS> Setting shared library (dll) directory to: %s\n", dir);
    std::snprintf(dllDirectory, sizeof dllDirectory, "%s", dir);
    zolt::os_set_environment(EnvVarStreamingEngineLib, dir);
}

const char* DllUtils::GetDllDir() {
    if (dllDirectory[0] == '\0') {
        const std::string dir = zolt::os_environment(EnvVarStreamingEngineLib);
        std::snprintf(dllDirectory, sizeof dllDirectory, "%s",
                      dir.empty() ? DefaultStreamingEngineLib : dir.c_str());
    }
    return dllDirectory;
}

int DllUtils::ConstructDllFullPathName(char* out, const char* name) {
    const zolt::ErrnoKeeper keep_errno;
    std::string file_name = name;
    if (Util::FindExtension(name) == nullptr) {
        file_name += zolt::kDllExtension;
    }
    for (const char* prefix : {"", "lib", "libdll_"}) {
        const std::string path =
            std::string(GetDllDir()) + zolt::kDirSeparator + prefix + file_name;
        if (is_readable_file(path)) {
            std::memcpy(out, path.c_str(), path.size() + 1);
            return 0;
        }
    }
    out[0] = '\0';
    return 1;
}

void* DllUtils::LoadDll(const char* path, int n, const char* const* funcNames, void** funcPtrs) {
    const zolt::ErrnoKeeper keep_errno;
    std::printf("LOAD_DLLS> Loading shared library (dll) %s\n", path);
    std::fill_n(funcPtrs, std::max(n, 0), nullptr);
    void* handle = dlopen(path, RTLD_LAZY);
    if (handle == nullptr) {
        std::printf("LOAD_DLLS> Error in dlopen: %s\n", last_dl_error());
        return nullptr;
    }
    for (int i = 0; i < n; i++) {
        std::printf("LOAD_DLLS>   Getting function pointer of: %s\n", funcNames[i]);
        funcPtrs[i] = dlsym(handle, funcNames[i]);
        if (funcPtrs[i] == nullptr) {
            std::printf("LOAD_DLLS>   Error in dlsym: %s\n", last_dl_error());
            dlclose(handle);
            // The addresses found so far have gone with the library.
            std::fill_n(funcPtrs, n, nullptr);
            return nullptr;
        }
    }
    std::printf("LOAD_DLLS> Successfully loaded shared library (dll) %s\n", path);
    return handle;
}

int DllUtils::LoadAllDlls(const char* dir, int n, const char* const* funcNames, int maxDlls,
                          char** dllNames, void** dllHandles, void** funcPtrs) {
    const zolt::ErrnoKeeper keep_errno;
    const Directory directory(opendir(dir), closedir);
    if (!directory) {
        ErrMgr::AddErr("DllUtils", "LoadAllDlls", nullptr, "Error opening dll directory %s", dir);
        return 0;
    }
    int count = 0;
    while (count < maxDlls) {
        const dirent* entry = readdir(directory.get());
        if (entry == nullptr) {
            break;
        }
        const std::string name = entry->d_name;
        const std::string path = std::string(dir) + zolt::kDirSeparator + name;
        if (!is_library_name(name) || !zolt::os_is_regular_file(path.c_str())) {
            continue;
        }
        void* handle = LoadDll(path.c_str(), n, funcNames, funcPtrs + count * n);
        if (handle == nullptr) {
            continue;
        }
        dllHandles[count] = handle;
        if (dllNames != nullptr) {
            dllNames[count] =
                Util::CopyString(name.substr(0, name.size() - kExtensionLength).c_str());
        }
        count++;
    }
    return count;
}

int DllUtils::LoadAllDlls(int n, const char* const* funcNames, int maxDlls, char** dllNames,
                          void** dllHandles, void** funcPtrs) {
    return LoadAllDlls(GetDllDir(), n, funcNames, maxDlls, dllNames, dllHandles, funcPtrs);
}

int DllUtils::LoadFirstDll(int n, const char* const* funcNames, char** dllName, void** dllHandle,
                           void** funcPtrs) {
    return LoadAllDlls(n, funcNames, 1, dllName, dllHandle, funcPtrs) == 1 ? 0 : 1;
}

void DllUtils::UnloadDll(char** name, void** handle) {
    const zolt::ErrnoKeeper keep_errno;
    if (name != nullptr) {
        delete[] * name;
        *name = nullptr;
    }
    if (*handle != nullptr) {
        dlclose(*handle);
        *handle = nullptr;
    }
}

void DllUtils::UnloadAllDlls(int* count, char** names, void** handles) {
    for (int i = 0; i < *count; i++) {
        UnloadDll(names == nullptr ? nullptr : &names[i], &handles[i]);
    }
    *count = 0;
}
