#include "gtest_win32.h"

#include <windows.h>

namespace std {
namespace {

// A structure of one pointer, which is null at first.
SRWLOCK* lock_of(void** pointer) {
    return reinterpret_cast<SRWLOCK*>(pointer);
}

CONDITION_VARIABLE* variable_of(void** pointer) {
    return reinterpret_cast<CONDITION_VARIABLE*>(pointer);
}

}  // namespace

void mutex::lock() {
    AcquireSRWLockExclusive(lock_of(&system_lock));
}

void mutex::unlock() {
    ReleaseSRWLockExclusive(lock_of(&system_lock));
}

void condition_variable::notify_all() {
    WakeAllConditionVariable(variable_of(&system_variable));
}

void condition_variable::wait(mutex& held) {
    SleepConditionVariableSRW(variable_of(&system_variable), lock_of(&held.system_lock), INFINITE,
                              0);
}

}  // namespace std
