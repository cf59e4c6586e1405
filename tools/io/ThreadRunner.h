#pragma once

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include "media/IParallelRunner.h"

namespace zolt {

// Threads that wait for an encoder's pictures. One task at a time; the thread that calls Run works
// on it, too. They stay awake for a moment after a task, since the next picture of a file comes
// sooner than a sleeping thread wakes up, and sleep after that.
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
    void serve();
    void work();

    std::vector<std::thread> threads_;

    std::mutex mutex_;                  // what a sleeping thread waits for changes under it
    std::condition_variable called_;    // there are workers to call, or the runner ends
    std::condition_variable finished_;  // all workers have returned
    IParallelTask* task_ = nullptr;     // written before uncalled_ rises, read by who lowers it
    std::atomic<int> uncalled_{0};      // workers of the task that nobody has called
    std::atomic<int> unfinished_{0};    // workers of the task that have not returned
    std::atomic<bool> stopping_{false};
};

}  // namespace zolt
