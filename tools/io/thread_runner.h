#pragma once

#include <memory>

class IParallelRunner;

namespace zolt {

// The processors that this program may use, at least 1.
int processor_count();

// A runner of so many threads (from 1), the caller's included; null where the tools have no
// threads.
std::shared_ptr<IParallelRunner> make_thread_runner(int threads);

}  // namespace zolt
