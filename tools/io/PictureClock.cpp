#include "io/PictureClock.h"

namespace zolt {
namespace {

// What a hostile input states must not overflow, here or in the arithmetic of others.
constexpr std::int64_t kMaxTicks = std::int64_t{1} << 56;

// A step back by more pictures than this is a clock that begins anew.
constexpr std::int64_t kMaxWait = 4;

}  // namespace

PictureTime PictureClock::next(std::optional<std::int64_t> start, std::int64_t duration) {
    if (start && (*start < -kMaxTicks || *start > kMaxTicks)) {
        start.reset();
    }
    const PictureTime stated = {start.value_or(0) + shift_,
                                duration > 0 && duration < kMaxTicks ? duration : usual_duration_};
    PictureTime time = stated;
    if (!last_) {
        repairs_ += start ? 0 : 1;
    } else if (!start) {
        ++repairs_;
        time.start = last_->start + last_->duration;
    } else if (stated.start <= last_->start) {
        ++repairs_;
        if (last_->start - stated.start > kMaxWait * usual_duration_) {
            time.start = last_->start + last_->duration;
            shift_ += time.start - stated.start;
        } else {
            // The pictures wait for the input's clock to catch up.
            time.start = last_->start + 1;
        }
    }
    last_ = time;
    return time;
}

}  // namespace zolt
