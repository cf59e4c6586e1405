#pragma once

#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include "media/IParallelRunner.h"

namespace zolt {

// Threads that wait for an encoder's pictures. One task at a time; the thread that calls Run works
// on it, too.
class ThreadRunner final : public IParallelRunner {
public:
    // Starts threads - 1 threads; threads: from 1.
    explicit ThreadRunner(int threads);
    ~ThreadRunner();
    ThreadRunner(const ThreadRunner&) = delete;
    ThreadRunner& operator=(const ThreadRunner&) = delete;

    int GetThreads() noexcept override { return static_cast<int>(threads_.size()) + 1; }
    void Run(IParallelTask* task, int workers) noexcept override;

private:
    void wait_for_tasks();
    void work(std::unique_lock<std::mutex>& lock);

    std::vector<std::thread> threads_;

    std::mutex mutex_;                  // of what follows
    std::condition_variable changed_;   // there are workers to call, or the runner ends
    std::condition_variable finished_;  // the last of them has returned
    IParallelTask* task_ = nullptr;
    int next_ = 0;     // the worker to be called next
    int workers_ = 0;  // of the task
    int running_ = 0;  // called and not returned
    bool stopping_ = false;
};

}  // namespace zolt
