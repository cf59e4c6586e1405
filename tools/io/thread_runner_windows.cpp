#include "io/thread_runner.h"
#include "media/IParallelRunner.h"

namespace zolt {

int processor_count() {
    return 1;
}

std::shared_ptr<IParallelRunner> make_thread_runner(int) {
    return nullptr;
}

}  // namespace zolt
