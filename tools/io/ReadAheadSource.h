#pragma once

#include <condition_variable>
#include <deque>
#include <exception>
#include <mutex>
#include <thread>
#include <vector>

#include "io/FilteredSource.h"

namespace zolt {

// Reads the next pictures of another source on a thread of its own while the caller works on one.
// The thread starts with the first read. A stop signal ends the input where it is.
class ReadAheadSource : public FilteredSource {
public:
    // At most `pictures` (from 1) wait to be taken.
    ReadAheadSource(std::unique_ptr<FrameSource> source, int pictures);
    ~ReadAheadSource() override;

    PictureTime time() const override { return current_.time; }
    std::string closing_remark() const override { return current_.closing_remark; }
    std::optional<std::int64_t> frames_left() const override;
    bool read(std::vector<unsigned char>& sample) override;

private:
    // What a read of the other source gave.
    struct Result {
        std::vector<unsigned char> picture;
        bool is_picture = false;  // not so at the end and on failure
        PictureTime time;
        std::string closing_remark;
        std::exception_ptr failure;
    };

    void work();
    void read_into(Result& result);
    bool take();

    const std::optional<std::int64_t> frames_;  // in the source at first
    std::int64_t frames_read_ = 0;
    Result current_;  // the one that was taken last
    bool ended_ = false;

    std::mutex mutex_;  // of what follows
    std::condition_variable changed_;
    std::deque<Result> ready_;
    std::vector<Result> spare_;
    bool stopping_ = false;
    std::thread thread_;
};

}  // namespace zolt
