#pragma once

// A sample as the host reads it from a media file, as far as this system looks at it: the host's
// interface goes on behind these seven operations. Times are microseconds.
class IMediaFileSample {
public:
    virtual unsigned char* GetSampleData() = 0;
    virtual long GetSampleSize() = 0;
    virtual long long GetSampleTime() = 0;
    virtual long long GetSampleCompTimeOffset() = 0;
    virtual bool SampleIsSync() = 0;
    virtual int GetFrameType() = 0;
    virtual long long GetSampleKeyStreamOffset() = 0;

protected:
    ~IMediaFileSample() = default;
};
