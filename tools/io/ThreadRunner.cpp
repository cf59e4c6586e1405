#include "io/ThreadRunner.h"

namespace zolt {

ThreadRunner::ThreadRunner(int threads) {
    for (int n = 1; n < threads; ++n) {
        threads_.emplace_back([this] { wait_for_tasks(); });
    }
}

ThreadRunner::~ThreadRunner() {
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_all();
    for (std::thread& thread : threads_) {
        thread.join();
    }
}

void ThreadRunner::Run(IParallelTask* task, int workers) noexcept {
    std::unique_lock<std::mutex> lock(mutex_);
    task_ = task;
    next_ = 0;
    workers_ = workers;
    for (int n = 1; n < workers; ++n) {
        changed_.notify_one();
    }
    work(lock);
    finished_.wait(lock, [this] { return running_ == 0; });
}

void ThreadRunner::wait_for_tasks() {
    std::unique_lock<std::mutex> lock(mutex_);
    for (;;) {
        changed_.wait(lock, [this] { return stopping_ || next_ < workers_; });
        if (stopping_) {
            return;
        }
        work(lock);
    }
}

// Calls workers of the task while there are any that nobody has called.
void ThreadRunner::work(std::unique_lock<std::mutex>& lock) {
    while (next_ < workers_) {
        const int worker = next_++;
        ++running_;
        IParallelTask* const task = task_;
        lock.unlock();
        task->Run(worker);
        lock.lock();
        --running_;
    }
    if (running_ == 0) {
        finished_.notify_one();
    }
}

}  // namespace zolt
