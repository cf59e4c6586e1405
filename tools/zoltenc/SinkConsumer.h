#pragma once

#include <cstdint>
#include <functional>
#include <utility>

#include "io/PictureSink.h"
#include "session/StreamConsumer.h"

namespace zolt {

// Takes an encoder's samples and hands them to a sink, with what the encoder does not carry: the
// input's own times and traits.
class SinkConsumer final : public StreamConsumer {
public:
    // Is told of every coded picture after it was written.
    using PictureListener = std::function<void(const CodedPicture&)>;

    explicit SinkConsumer(PictureSink& sink) : sink_(sink) {}

    // What the sink is told of the stream beside what the encoder says of it, which replaces the
    // parameter sets and the size of `input`. To be called before the first picture.
    void describe_input(const StreamDescription& input) { description_ = input; }

    void set_picture_listener(PictureListener listener) { listener_ = std::move(listener); }

    // How far the times of the pictures that follow are moved from those of the input, in ticks.
    void set_time_offset(std::int64_t ticks) { description_.time_offset = ticks; }

    // The time of the picture that the encoder is about to be given.
    void set_time(const PictureTime& time) { time_ = time; }

private:
    void begin_stream(IConfigVideoAvc& stream) override;
    void take_picture(ISample& sample) override;

    PictureSink& sink_;
    PictureListener listener_;
    StreamDescription description_;
    bool described_ = false;  // the sink knows the stream as it is now
    PictureTime time_;
};

}  // namespace zolt
