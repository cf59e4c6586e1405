#include "io/ThreadRunner.h"

#include <gtest/gtest.h>

#include <atomic>
#include <vector>

namespace {

// Counts the calls of each worker.
class CountingTask : public IParallelTask {
public:
    explicit CountingTask(int workers) : calls(static_cast<std::size_t>(workers)) {}
    void Run(int worker) noexcept override { ++calls[static_cast<std::size_t>(worker)]; }
    std::vector<std::atomic<int>> calls;
};

TEST(ThreadRunner, CallsEachWorkerOnceAndReturnsWhenAllHave) {
    for (const int threads : {1, 2, 3, 8}) {
        zolt::ThreadRunner runner(threads);
        EXPECT_EQ(runner.GetThreads(), threads);
        for (int round = 0; round < 300; ++round) {
            CountingTask task(round % 11);
            runner.Run(&task, round % 11);
            for (const std::atomic<int>& calls : task.calls) {
                ASSERT_EQ(calls, 1) << "round " << round << ", threads: " << threads;
            }
        }
    }
}

// Workers that need each other run at once as long as there are threads for them.
TEST(ThreadRunner, RunsWorkersAtOnce) {
    class Meeting : public IParallelTask {
    public:
        void Run(int) noexcept override {
            ++m_here;
            while (m_here < 4) {
                std::this_thread::yield();
            }
        }

    private:
        std::atomic<int> m_here{0};
    };
    zolt::ThreadRunner runner(4);
    for (int round = 0; round < 50; ++round) {
        Meeting meeting;
        runner.Run(&meeting, 4);
    }
}

}  // namespace
