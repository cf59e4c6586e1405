#pragma once

#include <mutex>

namespace zolt {

// An object made for its first user and deleted with its last one. Trivially destroyed: users that
// have not given the object back may call it until the process ends.
template <class T>
class SharedObject {
public:
    T* get() {
        const std::lock_guard<std::mutex> lock(mutex);
        if (users == 0) {
            object = new T;
        }
        users++;
        return object;
    }

    // Nothing happens without a user.
    void give_back() {
        const std::lock_guard<std::mutex> lock(mutex);
        if (users > 0 && --users == 0) {
            delete object;
            object = nullptr;
        }
    }

private:
    std::mutex mutex;
    int users = 0;
    T* object = nullptr;
};

}  // namespace zolt
