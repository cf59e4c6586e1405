#include "io/ThreadRunner.h"

#include <chrono>

namespace zolt {
namespace {

// About what lies between two pictures of a file.
constexpr std::chrono::microseconds kAwake(300);

// Waits for the condition without sleep, but not for long.
template <typename Condition>
void stay_awake_for(Condition condition) {
    using Clock = std::chrono::steady_clock;
    for (const Clock::time_point end = Clock::now() + kAwake; !condition() && Clock::now() < end;) {
        std::this_thread::yield();
    }
}

}  // namespace

ThreadRunner::ThreadRunner(int threads) {
    for (int n = 1; n < threads; ++n) {
        threads_.emplace_back([this] { serve(); });
    }
}

ThreadRunner::~ThreadRunner() {
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    called_.notify_all();
    for (std::thread& thread : threads_) {
        thread.join();
    }
}

void ThreadRunner::Run(IParallelTask* task, int workers) noexcept {
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        task_ = task;
        unfinished_ = workers;
        uncalled_ = workers;
    }
    for (int n = 1; n < workers; ++n) {
        called_.notify_one();
    }
    work();
    const auto finished = [this] { return unfinished_ == 0; };
    stay_awake_for(finished);
    std::unique_lock<std::mutex> lock(mutex_);
    finished_.wait(lock, finished);
}

// A thread: calls workers until the runner ends.
void ThreadRunner::serve() {
    const auto called = [this] { return stopping_ || uncalled_ > 0; };
    while (!stopping_) {
        stay_awake_for(called);
        {
            std::unique_lock<std::mutex> lock(mutex_);
            called_.wait(lock, called);
        }
        work();
    }
}

// Calls workers of the task while there are any that nobody has called.
void ThreadRunner::work() {
    for (int left = uncalled_; left > 0;) {
        if (!uncalled_.compare_exchange_weak(left, left - 1)) {
            continue;
        }
        task_->Run(left - 1);
        if (--unfinished_ == 0) {
            const std::lock_guard<std::mutex> lock(mutex_);
            finished_.notify_one();
        }
        left = uncalled_;
    }
}

}  // namespace zolt
