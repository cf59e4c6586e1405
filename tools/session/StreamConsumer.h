#pragma once

#include <cstdint>
#include <exception>

#include "media/ISampleConsumer.h"

class IConfigVideoAvc;
class ISample;

namespace zolt {

// Takes what an encoder gives. What is wrong on the consumer's side must not unwind through the
// encoder, so it is kept and thrown by `check`.
class StreamConsumer : public ISampleConsumer {
public:
    // Of the encoder that feeds this consumer; null until its stream configuration came.
    IConfigVideoAvc* stream() const { return stream_; }

    // Coded pictures that have been taken.
    std::int64_t pictures() const { return pictures_; }

    // Throws what went wrong since the last call.
    void check();

    void Notify(IEvent*) override {}
    int PutStreamConfig(ISampleStreamConfig* config) override;
    void PutSample(ISample* sample) override;
    void EndOfSamples() override {}

protected:
    ~StreamConsumer() = default;

private:
    // The stream that follows; comes again where the encoder begins anew.
    virtual void begin_stream(IConfigVideoAvc& stream) = 0;
    virtual void take_picture(ISample& sample) = 0;

    IConfigVideoAvc* stream_ = nullptr;
    std::int64_t pictures_ = 0;
    std::exception_ptr failure_;
};

}  // namespace zolt
