#pragma once

class ISampleConsumer;
class ISampleStreamConfig;

// The sending end of a stream.
class ISampleProducer {
public:
    // Description of the stream that is produced; it belongs to the producer.
    virtual ISampleStreamConfig* GetSampleStreamConfig() = 0;
    // Connects a consumer, which stays the caller's; returns a status flag, nonzero for a failure.
    virtual int Connect(ISampleConsumer* consumer) = 0;
    virtual void Disconnect(ISampleConsumer* consumer) = 0;

protected:
    ~ISampleProducer() = default;
};
