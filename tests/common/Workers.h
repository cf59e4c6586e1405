#pragma once

#include <algorithm>
#include <functional>
#include <numeric>
#include <string>
#include <vector>

#include "common/Random.h"
#include "common/Thread.h"
#include "encoder/Wavefront.h"
#include "encoder/WorkerPool.h"

namespace zolt_test {

// How actions 0..count-1 are run, each once.
enum class Order {
    kAtOnce,    // on a thread each
    kSerial,    // one after another on the caller's thread
    kReversed,  // the same, the last one first
    kDelayed    // on a thread each, which begins after a random while
};

inline std::string order_name(Order order) {
    constexpr const char* kNames[] = {"at_once", "serial", "reversed", "delayed"};
    return kNames[static_cast<int>(order)];
}

// Passes some time.
inline void while_away(int rounds) {
    volatile int counter = 0;
    for (int n = 0; n < 10000 * rounds; ++n) {
        counter = counter + 1;
    }
}

inline void run_all(Order order, int count, Random& random,
                    const std::function<void(int)>& action) {
    if (order == Order::kSerial || order == Order::kReversed) {
        for (int n = 0; n < count; ++n) {
            action(order == Order::kSerial ? n : count - 1 - n);
        }
        return;
    }
    std::vector<Thread> threads;
    for (int n = 0; n < count; ++n) {
        const int rounds = order == Order::kDelayed ? random.between(0, 30) : 0;
        threads.emplace_back([n, rounds, &action] {
            while_away(rounds);
            action(n);
        });
    }
    for (Thread& thread : threads) {
        thread.join();
    }
}

// So many workers for the engine.
class Workers : public WorkerPool {
public:
    explicit Workers(int count, Order order = Order::kAtOnce) : m_count(count), m_order(order) {}

    void set_count(int count) { m_count = count; }

    int threads() noexcept override { return m_count; }
    void run(Wavefront& work, int workers) noexcept override {
        run_all(m_order, workers, m_random, [&work](int n) { work.run_worker(n); });
    }

private:
    int m_count;
    Order m_order;
    Random m_random{1};
};

}  // namespace zolt_test
