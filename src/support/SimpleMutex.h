#pragma once

#include "support/pthread.h"

// A recursive mutex. Users lock and unlock the member with pthread_mutex_lock and
// pthread_mutex_unlock, or hold it for a scope with zolt::MutexLock.
class SimpleMutex {
public:
    // Throws std::system_error when the system cannot give a mutex.
    SimpleMutex();
    virtual ~SimpleMutex();
    SimpleMutex(const SimpleMutex&) = delete;
    SimpleMutex& operator=(const SimpleMutex&) = delete;

    pthread_mutex_t mutex;
};
