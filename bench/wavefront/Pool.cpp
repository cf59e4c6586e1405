#include "Pool.h"

#include <pthread.h>
#include <sched.h>

#include <algorithm>
#include <cstddef>

#include "encoder/Wavefront.h"

namespace zolt_bench {
namespace {

// Keeps the thread to the nth of the processors; it stays free where that is refused.
void keep_to_processor(pthread_t thread, int n, const cpu_set_t& processors) {
    for (int processor = 0; processor < CPU_SETSIZE; ++processor) {
        if (CPU_ISSET(processor, &processors) && n-- == 0) {
            cpu_set_t one;
            CPU_ZERO(&one);
            CPU_SET(processor, &one);
            pthread_setaffinity_np(thread, sizeof one, &one);
            return;
        }
    }
}

}  // namespace

Pool::Pool(int count) {
    for (int worker = 1; worker < count; ++worker) {
        m_threads.emplace_back([this, worker] { serve(worker); });
    }
    cpu_set_t processors;
    if (sched_getaffinity(0, sizeof processors, &processors) == 0 &&
        CPU_COUNT(&processors) >= count) {
        keep_to_processor(pthread_self(), 0, processors);
        for (int worker = 1; worker < count; ++worker) {
            keep_to_processor(m_threads[static_cast<std::size_t>(worker - 1)].native_handle(),
                              worker, processors);
        }
    }
}

Pool::~Pool() {
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_stop = true;
    }
    m_wake.notify_all();
    for (std::thread& thread : m_threads) {
        thread.join();
    }
}

void Pool::run(Wavefront& work, int workers) noexcept {
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_work = &work;
        m_workers = workers;
        m_running = workers - 1;
        ++m_run;
        m_start_nanoseconds = 0;
        m_called = Clock::now();
    }
    m_wake.notify_all();
    work.run_worker(0);
    std::unique_lock<std::mutex> lock(m_mutex);
    m_finished.wait(lock, [this] { return m_running == 0; });
}

void Pool::serve(int worker) {
    std::unique_lock<std::mutex> lock(m_mutex);
    for (unsigned last_run = 0;;) {
        m_wake.wait(lock, [&] { return m_stop || m_run != last_run; });
        if (m_stop) {
            return;
        }
        last_run = m_run;
        if (worker >= m_workers) {
            continue;
        }
        const std::chrono::duration<double, std::nano> start = Clock::now() - m_called;
        m_start_nanoseconds = std::max(m_start_nanoseconds, start.count());
        lock.unlock();
        m_work->run_worker(worker);
        lock.lock();
        if (--m_running == 0) {
            m_finished.notify_one();
        }
    }
}

}  // namespace zolt_bench
