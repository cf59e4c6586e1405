#pragma once

#include <functional>
#include <memory>
#include <stdexcept>
#include <utility>

#include "support/pthread.h"

// A thread that runs an action, for tests of the library that also run where the C++ library has no
// std::thread. Joined before it is destroyed.
class Thread {
public:
    explicit Thread(std::function<void()> action)
        : m_action(std::make_unique<std::function<void()>>(std::move(action))) {
        const auto run = [](void* its_action) -> void* {
            (*static_cast<std::function<void()>*>(its_action))();
            return nullptr;
        };
        if (pthread_create(&m_thread, nullptr, run, m_action.get()) != 0) {
            throw std::runtime_error("no thread");
        }
    }

    void join() { pthread_join(m_thread, nullptr); }

private:
    std::unique_ptr<std::function<void()>> m_action;
    pthread_t m_thread{};
};
