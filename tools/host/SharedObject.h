#pragma once

#include "support/MutexLock.h"

namespace zolt {

// An object made for its first user and deleted with its last one.
template <class T>
class SharedObject {
public:
    T* get() {
        const MutexLock lock(mutex);
        if (users == 0) {
            object = new T;
        }
        users++;
        return object;
    }

    // Nothing happens without a user.
    void give_back() {
        const MutexLock lock(mutex);
        if (users > 0 && --users == 0) {
            delete object;
            object = nullptr;
        }
    }

private:
    SimpleMutex mutex;
    int users = 0;
    T* object = nullptr;
};

}  // namespace zolt
