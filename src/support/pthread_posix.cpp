#include <sched.h>

#include "support/pthread.h"

namespace zolt {

int init_recursive_mutex(pthread_mutex_t* mutex) {
    pthread_mutexattr_t attributes;
    int result = pthread_mutexattr_init(&attributes);
    if (result != 0) {
        return result;
    }
    result = pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
    if (result == 0) {
        result = pthread_mutex_init(mutex, &attributes);
    }
    pthread_mutexattr_destroy(&attributes);
    return result;
}

}  // namespace zolt

int pthread_setTimeCritical(ThreadHandle thread) {
    // The lowest real-time priority is already above all ordinary threads and leaves room for the
    // system's own real-time work.
    sched_param parameters{};
    parameters.sched_priority = sched_get_priority_min(SCHED_RR);
    return pthread_setschedparam(thread, SCHED_RR, &parameters) == 0 ? 1 : 0;
}
