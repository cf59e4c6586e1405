#pragma once

// The two types that GoogleTest needs and the C++ library lacks in the win32 thread model.
namespace std {

class mutex {
public:
    void lock();
    void unlock();

private:
    friend class condition_variable;
    void* system_lock = nullptr;
};

class condition_variable {
public:
    void notify_all();
    template <class Lock, class Predicate>
    void wait(Lock& lock, Predicate predicate) {
        while (!predicate()) {
            wait(*lock.mutex());
        }
    }

private:
    void wait(mutex& held);

    void* system_variable = nullptr;
};

}  // namespace std
