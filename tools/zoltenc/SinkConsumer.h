#pragma once

#include <cstdint>
#include <exception>
#include <functional>

#include "io/PictureSink.h"
#include "media/ISampleConsumer.h"

class IConfigVideoAvc;

namespace zolt {

// Takes an encoder's samples and hands them to a sink, with what the encoder does not carry: the
// input's own times and traits.
//
// A failed write must not unwind through the encoder, so it is kept and thrown by `check`.
class SinkConsumer : public ISampleConsumer {
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

    // Of the encoder that feeds this consumer; null until its stream configuration came.
    IConfigVideoAvc* stream() const { return stream_; }
    std::int64_t pictures() const { return pictures_; }

    // Throws what went wrong since the last call.
    void check();

    void Notify(IEvent* event) override;
    int PutStreamConfig(ISampleStreamConfig* config) override;
    void PutSample(ISample* sample) override;
    void EndOfSamples() override {}

private:
    PictureSink& sink_;
    PictureListener listener_;
    IConfigVideoAvc* stream_ = nullptr;
    StreamDescription description_;
    bool described_ = false;  // the sink knows the stream as it is now
    PictureTime time_;
    std::int64_t pictures_ = 0;
    std::exception_ptr failure_;
};

}  // namespace zolt
