#pragma once

#include <memory>
#include <utility>

#include "io/FrameSource.h"

namespace zolt {

// A source that gives the pictures of another one in a different way, with all that is known of
// them.
class FilteredSource : public FrameSource {
public:
    std::string name() const override { return source_->name(); }
    PictureFormat format() const override { return source_->format(); }
    bool states_format() const override { return source_->states_format(); }
    std::optional<FrameRate> frame_rate() const override { return source_->frame_rate(); }
    VideoTraits traits() const override { return source_->traits(); }
    std::optional<TimeBase> time_base() const override { return source_->time_base(); }
    PictureTime time() const override { return source_->time(); }
    SideStreams* side_streams() override { return source_->side_streams(); }
    std::string remark() const override { return source_->remark(); }
    std::string closing_remark() const override { return source_->closing_remark(); }
    std::optional<std::int64_t> frames_left() const override { return source_->frames_left(); }
    void interrupt() override { source_->interrupt(); }

protected:
    explicit FilteredSource(std::unique_ptr<FrameSource> source) : source_(std::move(source)) {}

    FrameSource& source() { return *source_; }
    const FrameSource& source() const { return *source_; }

private:
    std::unique_ptr<FrameSource> source_;
};

}  // namespace zolt
