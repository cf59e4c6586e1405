#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include "encoder/WorkerPool.h"

namespace zolt_bench {

// Threads that stay: the caller is worker 0, and each other worker has a thread that sleeps between
// two pictures. Every thread keeps to a processor of its own where there are enough: on a busy
// machine a thread may else be woken on its caller's, and then one of them does all the work.
class Pool : public WorkerPool {
public:
    explicit Pool(int count);
    ~Pool();

    int threads() noexcept override { return static_cast<int>(m_threads.size()) + 1; }
    // workers: at most threads().
    void run(Wavefront& work, int workers) noexcept override;

    // From the call of run() to the start of the last worker, in the last run.
    double start_nanoseconds() const { return m_start_nanoseconds; }

private:
    using Clock = std::chrono::steady_clock;

    void serve(int worker);

    std::mutex m_mutex;
    std::condition_variable m_wake, m_finished;
    std::vector<std::thread> m_threads;
    // Guarded by the mutex.
    Wavefront* m_work = nullptr;
    int m_workers = 0;  // of the current run
    int m_running = 0;  // of these, the ones that have not returned, without the caller
    unsigned m_run = 0;
    bool m_stop = false;
    Clock::time_point m_called;
    double m_start_nanoseconds = 0;
};

}  // namespace zolt_bench
