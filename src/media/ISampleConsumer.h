#pragma once

#include "media/IEventListener.h"

class ISample;
class ISampleStreamConfig;

// The receiving end of a stream.
class ISampleConsumer : public IEventListener {
public:
    // Announces the stream that follows; returns a status flag, nonzero for a failure.
    virtual int PutStreamConfig(ISampleStreamConfig* config) = 0;
    // Hands over one sample, which is valid only during the call.
    virtual void PutSample(ISample* sample) = 0;
    // The stream has ended.
    virtual void EndOfSamples() = 0;

protected:
    ~ISampleConsumer() = default;
};
