#pragma once

#include <algorithm>
#include <functional>
#include <utility>
#include <vector>

#include "io/FrameSource.h"

namespace zolt {

// Pictures that a test has made, and what it wants to happen before each of them.
class ListSource : public FrameSource {
public:
    using Picture = std::vector<unsigned char>;

    ListSource(const PictureFormat& format, std::vector<Picture> pictures)
        : format_(format), pictures_(std::move(pictures)) {}

    // Called with the picture's number, also for the one after the last.
    std::function<void(int)> before_read = [](int) {};
    std::function<void()> on_interrupt = [] {};
    VideoTraits own_traits;

    std::string name() const override { return "list"; }
    PictureFormat format() const override { return format_; }
    std::optional<FrameRate> frame_rate() const override { return FrameRate{25, 1}; }
    VideoTraits traits() const override { return own_traits; }
    std::optional<TimeBase> time_base() const override { return TimeBase{1, 1000}; }
    // Picture n begins at n * n.
    PictureTime time() const override { return {(next_ - 1) * (next_ - 1), 2 * next_ - 1}; }
    std::string closing_remark() const override { return std::to_string(next_) + " read"; }
    std::optional<std::int64_t> frames_left() const override { return count() - next_; }
    bool read(std::vector<unsigned char>& sample) override {
        before_read(static_cast<int>(next_));
        if (next_ == count()) {
            return false;
        }
        const Picture& picture = pictures_[next_++];
        sample = picture;
        return true;
    }
    void interrupt() override { on_interrupt(); }

private:
    std::int64_t count() const { return static_cast<std::int64_t>(pictures_.size()); }

    PictureFormat format_;
    std::vector<Picture> pictures_;
    std::int64_t next_ = 0;
};

}  // namespace zolt
