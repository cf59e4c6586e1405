#include "host/thread_id.h"

#include <atomic>

namespace zolt {

long current_thread_id() {
    static std::atomic<long> last_id{0};
    thread_local const long id = ++last_id;
    return id;
}

}  // namespace zolt
