#pragma once

// Mutexes and threads: the system's own pthread_*, or on Windows functions of these names, and what
// the library needs beside them.

#ifdef _WIN32

struct pthread_mutexattr_t;
struct pthread_attr_t;

// The system's critical section, which its owning thread may enter again.
struct pthread_mutex_t {
    void* section[6];
};

struct ThreadRecord {
    void* (*start)(void*);
    void* argument;
    void* handle;
    unsigned long id;
};
using pthread_t = ThreadRecord*;

// These return 0. The attributes are not used.
int pthread_mutex_init(pthread_mutex_t* mutex, const pthread_mutexattr_t* attributes);
int pthread_mutex_destroy(pthread_mutex_t* mutex);
int pthread_mutex_lock(pthread_mutex_t* mutex);
int pthread_mutex_unlock(pthread_mutex_t* mutex);

// 0 when the mutex was taken, 1 while another thread holds it.
int pthread_mutex_trylock(pthread_mutex_t* mutex);

// Starts a thread that calls start(argument), whose result is not kept. Stores the thread in
// *thread, for pthread_join or pthread_detach to release, and returns 0; or returns an errno value.
// The attributes are not used.
int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*start)(void*),
                   void* argument);

// Waits for the end of the thread and releases it: 0; or 36 (EDEADLK) when it is the calling
// thread. No result is delivered.
int pthread_join(pthread_t thread, void** result);

// Releases the thread, which runs on: 0.
int pthread_detach(pthread_t thread);

// The system's number of the calling thread, which is not a pthread_t.
unsigned long pthread_self();

// The system's handle of a thread, as pthread_setTimeCritical takes it.
using ThreadHandle = void*;

#else

#include <pthread.h>

using ThreadHandle = pthread_t;

#endif

namespace zolt {

// Initialises a mutex that its owning thread may lock again, the kind that the whole library uses.
// Returns what pthread_mutex_init returns. The caller destroys it with pthread_mutex_destroy.
int init_recursive_mutex(pthread_mutex_t* mutex);

}  // namespace zolt

// Lifts a thread above every thread of ordinary priority. Returns 0 where the system refuses, as
// Linux does for a process without the privilege, and another value (1 on Linux) on success.
int pthread_setTimeCritical(ThreadHandle thread);
