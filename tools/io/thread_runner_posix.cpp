#include <algorithm>
#include <thread>

#include "io/ThreadRunner.h"
#include "io/thread_runner.h"

namespace zolt {

int processor_count() {
    return std::max(1, static_cast<int>(std::thread::hardware_concurrency()));
}

std::shared_ptr<IParallelRunner> make_thread_runner(int threads) {
    return std::make_shared<ThreadRunner>(threads);
}

}  // namespace zolt
