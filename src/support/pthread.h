#pragma once

#include <pthread.h>

// Mutexes and threads: the system's own pthread_* and what the library needs beside them.

namespace zolt {

// Initialises a mutex that its owning thread may lock again, the kind that the whole library uses.
// Returns what pthread_mutex_init returns. The caller destroys it with pthread_mutex_destroy.
int init_recursive_mutex(pthread_mutex_t* mutex);

}  // namespace zolt

// Lifts a thread above every thread of ordinary priority. Returns 1 on success and 0 where the
// system refuses, as it does for a process without the privilege.
int pthread_setTimeCritical(pthread_t thread);
