#pragma once

#include <cstdint>
#include <optional>

#include "io/PictureTime.h"

namespace zolt {

// Makes times that grow of those that an input states: what is missing or does not grow is
// replaced.
class PictureClock {
public:
    // `usual_duration` in ticks, from 1, is for pictures that state none.
    explicit PictureClock(std::int64_t usual_duration) : usual_duration_(usual_duration) {}

    // The time of the next picture, of which the input states these; nothing or 0 for none.
    PictureTime next(std::optional<std::int64_t> start, std::int64_t duration);

    // How many times were replaced.
    std::int64_t repairs() const { return repairs_; }

private:
    std::int64_t usual_duration_;
    std::optional<PictureTime> last_;
    std::int64_t shift_ = 0;  // of all times since the input's clock went back
    std::int64_t repairs_ = 0;
};

}  // namespace zolt
