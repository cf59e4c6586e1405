#include <windows.h>

#include <process.h>

#include <cerrno>
#include <memory>
#include <new>

#include "support/pthread.h"

static_assert(sizeof(pthread_mutex_t) >= sizeof(CRITICAL_SECTION));
static_assert(alignof(pthread_mutex_t) >= alignof(CRITICAL_SECTION));

namespace {

CRITICAL_SECTION* section(pthread_mutex_t* mutex) {
    return reinterpret_cast<CRITICAL_SECTION*>(mutex->section);
}

unsigned __stdcall run(void* own_copy) {
    const ThreadRecord thread = *static_cast<ThreadRecord*>(own_copy);
    delete static_cast<ThreadRecord*>(own_copy);
    thread.start(thread.argument);
    return 0;
}

}  // namespace

int pthread_mutex_init(pthread_mutex_t* mutex, const pthread_mutexattr_t*) {
    InitializeCriticalSection(section(mutex));
    return 0;
}

int pthread_mutex_destroy(pthread_mutex_t* mutex) {
    DeleteCriticalSection(section(mutex));
    return 0;
}

int pthread_mutex_lock(pthread_mutex_t* mutex) {
    EnterCriticalSection(section(mutex));
    return 0;
}

int pthread_mutex_unlock(pthread_mutex_t* mutex) {
    LeaveCriticalSection(section(mutex));
    return 0;
}

int pthread_mutex_trylock(pthread_mutex_t* mutex) {
    return TryEnterCriticalSection(section(mutex)) ? 0 : 1;
}

int pthread_create(pthread_t* thread, const pthread_attr_t*, void* (*start)(void*),
                   void* argument) {
    std::unique_ptr<ThreadRecord> record(new (std::nothrow)
                                             ThreadRecord{start, argument, nullptr, 0});
    // The caller may release the record before the thread has read it.
    std::unique_ptr<ThreadRecord> own_copy(new (std::nothrow)
                                               ThreadRecord{start, argument, nullptr, 0});
    if (!record || !own_copy) {
        return ENOMEM;
    }
    unsigned id = 0;
    const uintptr_t handle = _beginthreadex(nullptr, 0, run, own_copy.get(), 0, &id);
    if (handle == 0) {
        return errno;
    }
    own_copy.release();
    record->handle = reinterpret_cast<void*>(handle);
    record->id = id;
    *thread = record.release();
    return 0;
}

int pthread_join(pthread_t thread, void**) {
    if (thread->id == GetCurrentThreadId()) {
        return EDEADLK;
    }
    WaitForSingleObject(thread->handle, INFINITE);
    return pthread_detach(thread);
}

int pthread_detach(pthread_t thread) {
    CloseHandle(thread->handle);
    delete thread;
    return 0;
}

unsigned long pthread_self() {
    return GetCurrentThreadId();
}

namespace zolt {

int init_recursive_mutex(pthread_mutex_t* mutex) {
    return pthread_mutex_init(mutex, nullptr);
}

}  // namespace zolt

int pthread_setTimeCritical(ThreadHandle thread) {
    return SetThreadPriority(thread, THREAD_PRIORITY_TIME_CRITICAL);
}
