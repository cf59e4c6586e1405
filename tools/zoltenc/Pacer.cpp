#include "zoltenc/Pacer.h"

#include <algorithm>

#include "io/StopSignal.h"
#include "io/os.h"

namespace zolt {

void Pacer::wait_for(std::int64_t time) {
    // A signal that comes just before the system's wait does not end that one.
    constexpr std::int64_t kLongestWait = 50000;
    const std::chrono::microseconds offset(time);
    if (!zero_) {
        zero_ = Clock::now() - offset;
    }
    while (StopSignal::received() == 0) {
        const auto left =
            std::chrono::duration_cast<std::chrono::microseconds>(*zero_ + offset - Clock::now());
        if (left.count() <= 0) {
            return;
        }
        os_sleep(std::min<std::int64_t>(left.count(), kLongestWait));
    }
}

}  // namespace zolt
