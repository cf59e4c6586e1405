#pragma once

#include "support/SimpleMutex.h"

namespace zolt {

// Holds a SimpleMutex from its construction to the end of the scope, however the scope is left.
class MutexLock {
public:
    explicit MutexLock(SimpleMutex& owner) : held(owner) { pthread_mutex_lock(&held.mutex); }
    ~MutexLock() { pthread_mutex_unlock(&held.mutex); }
    MutexLock(const MutexLock&) = delete;
    MutexLock& operator=(const MutexLock&) = delete;

private:
    SimpleMutex& held;
};

}  // namespace zolt
