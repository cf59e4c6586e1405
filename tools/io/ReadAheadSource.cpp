#include "io/ReadAheadSource.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "io/StopSignal.h"

namespace zolt {
namespace {

// A signal does not wake who waits for a condition.
constexpr std::chrono::milliseconds kSignalInterval(100);

}  // namespace

ReadAheadSource::ReadAheadSource(std::unique_ptr<FrameSource> source, int pictures)
    : FilteredSource(std::move(source)), frames_(this->source().frames_left()), spare_(pictures) {
    current_.picture.resize(format().sample_bytes());
    std::fill(spare_.begin(), spare_.end(), current_);
}

ReadAheadSource::~ReadAheadSource() {
    if (!thread_.joinable()) {
        return;
    }
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_all();
    source().interrupt();
    thread_.join();
}

std::optional<std::int64_t> ReadAheadSource::frames_left() const {
    return frames_ ? std::optional(std::max<std::int64_t>(0, *frames_ - frames_read_))
                   : std::nullopt;
}

bool ReadAheadSource::read(std::vector<unsigned char>& sample) {
    if (ended_ || !take()) {
        return false;
    }
    if (!current_.is_picture) {
        ended_ = true;
        if (current_.failure) {
            std::rethrow_exception(current_.failure);
        }
        return false;
    }
    sample.swap(current_.picture);
    ++frames_read_;
    return true;
}

// Makes the next result the current one; false when a stop signal comes first.
bool ReadAheadSource::take() {
    std::unique_lock<std::mutex> lock(mutex_);
    if (!thread_.joinable()) {
        thread_ = std::thread(&ReadAheadSource::work, this);
    }
    while (ready_.empty()) {
        if (StopSignal::received() != 0) {
            return false;
        }
        changed_.wait_for(lock, kSignalInterval);
    }
    spare_.push_back(std::exchange(current_, std::move(ready_.front())));
    ready_.pop_front();
    changed_.notify_all();
    return true;
}

// The thread: fills spare results until the source ends.
void ReadAheadSource::work() {
    bool go_on = true;
    while (go_on) {
        Result result;
        {
            std::unique_lock<std::mutex> lock(mutex_);
            changed_.wait(lock, [this] { return stopping_ || !spare_.empty(); });
            if (stopping_) {
                return;
            }
            result = std::move(spare_.back());
            spare_.pop_back();
        }
        read_into(result);
        go_on = result.is_picture;
        const std::lock_guard<std::mutex> lock(mutex_);
        ready_.push_back(std::move(result));
        changed_.notify_all();
    }
}

void ReadAheadSource::read_into(Result& result) {
    try {
        result.is_picture = source().read(result.picture);
        result.time = source().time();
        result.closing_remark = source().closing_remark();
    } catch (...) {
        result.is_picture = false;
        result.failure = std::current_exception();
    }
}

}  // namespace zolt
