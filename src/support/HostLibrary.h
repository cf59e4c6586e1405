#pragma once

#include <atomic>

#include "support/DllUtils.h"
#include "support/ErrnoKeeper.h"
#include "support/MutexLock.h"

namespace zolt {

// Guards the loading and unloading of all host libraries. One recursive mutex for all: the search
// for one library may report, and so lead to the search for another, on several threads at once.
// Lives from its first use to the end of the process.
SimpleMutex& host_library_mutex();

// The host's object of type Host, found on first use in the first library of the library directory
// that exports a given factory and its counterpart, which take no arguments.
//
// Constant-initialised, so that it works before and after the life of every static object.
template <class Host>
class HostLibrary {
public:
    // The names of the factory (returns Host*) and of its counterpart (returns nothing); they have
    // to outlive this object.
    constexpr HostLibrary(const char* get_object, const char* delete_object)
        : DllFunctionNameList{get_object, delete_object} {}
    // The library stays loaded: other static objects may still use the object.
    ~HostLibrary() {
        ended = true;
        delete[] dllName;
    }
    HostLibrary(const HostLibrary&) = delete;
    HostLibrary& operator=(const HostLibrary&) = delete;

    // The object, loaded where it has not been; null when it is not available.
    Host* get();

    // False when the object is there. True when it is not available: there is no such library,
    // which is found out once and for all, or this is a call made by the search itself.
    bool load();

    // Gives a loaded object back to its library and unloads that; the next use loads again. Does
    // nothing after the destructor.
    void unload();

    // The destructor has run.
    static bool has_ended() { return ended; }

private:
    bool load_object();

    const char* const DllFunctionNameList[2];
    void* dllFuncPtrList[2]{};
    char* dllName = nullptr;
    void* dllHandle = nullptr;
    std::atomic<Host*> object{nullptr};
    bool loadError = false;
    bool inLoad = false;
    // Outside the object, whose own fields are no longer there when it is asked for.
    static inline std::atomic<bool> ended{false};
};

template <class Host>
Host* HostLibrary<Host>::get() {
    Host* host = object.load(std::memory_order_acquire);
    if (host == nullptr && !load()) {
        host = object.load(std::memory_order_acquire);
    }
    return host;
}

template <class Host>
bool HostLibrary<Host>::load() {
    const ErrnoKeeper keep_errno;
    const MutexLock lock(host_library_mutex());
    if (loadError) {
        return true;
    }
    if (object.load(std::memory_order_relaxed) != nullptr) {
        return false;
    }
    if (inLoad) {
        return true;
    }
    inLoad = true;
    loadError = !load_object();
    inLoad = false;
    return loadError;
}

template <class Host>
bool HostLibrary<Host>::load_object() {
    if (DllUtils::LoadFirstDll(2, DllFunctionNameList, &dllName, &dllHandle, dllFuncPtrList) != 0) {
        return false;
    }
    const auto get_object = reinterpret_cast<Host* (*)()>(dllFuncPtrList[0]);
    Host* const host = get_object();
    if (host == nullptr) {
        DllUtils::UnloadDll(&dllName, &dllHandle);
        return false;
    }
    object.store(host, std::memory_order_release);
    return true;
}

template <class Host>
void HostLibrary<Host>::unload() {
    const ErrnoKeeper keep_errno;
    const MutexLock lock(host_library_mutex());
    if (ended || object.load(std::memory_order_relaxed) == nullptr) {
        return;
    }
    // A report made on the way out must neither reach the object nor load it again.
    inLoad = true;
    object.store(nullptr, std::memory_order_release);
    const auto delete_object = reinterpret_cast<void (*)()>(dllFuncPtrList[1]);
    delete_object();
    DllUtils::UnloadDll(&dllName, &dllHandle);
    inLoad = false;
}

}  // namespace zolt
