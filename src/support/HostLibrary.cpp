#include "support/HostLibrary.h"

#include <new>

namespace zolt {

SimpleMutex& host_library_mutex() {
    // Never destroyed: static objects of other units may still report when they are.
    alignas(SimpleMutex) static unsigned char storage[sizeof(SimpleMutex)];
    static SimpleMutex* const loadMutex = new (storage) SimpleMutex;
    return *loadMutex;
}

}  // namespace zolt
