#pragma once

// One unit of media data with its timing and flags. Times are microseconds.
class ISample {
public:
    // The payload; it belongs to the sample, and whoever receives a sample copies what it keeps.
    virtual unsigned char* GetSampleData() = 0;
    // Payload bytes.
    virtual long GetSampleSize() = 0;
    // Presentation time.
    virtual long long GetSampleTime() = 0;
    // Whether decoding can start at this sample.
    virtual bool SampleIsSync() = 0;
    // Composition time less decoding time.
    virtual long long GetSampleCompTimeOffset() = 0;
    virtual long long GetSampleKeyStreamOffset() = 0;
    virtual int GetSubStreamId() = 0;

protected:
    ~ISample() = default;
};
