#pragma once

class IParallelRunner;

// Settings of an encoder. Setters with a result return the value in force after the call.
class IEncSettings {
public:
    // Target bit rate, kbit/s.
    virtual int GetBitRateKbs() = 0;
    virtual int SetBitRateKbs(int kbs) = 0;

protected:
    ~IEncSettings() = default;
};

// Settings of a video encoder.
class IVideoEncSettings : public IEncSettings {
public:
    // Key-frame interval in milliseconds; 0 where the interval is counted in frames.
    virtual int GetKeyFrameIntMsecs() = 0;
    virtual void SetKeyFrameIntMsecs(int msecs) = 0;
    // Key-frame interval in frames, from 1.
    virtual int GetKeyFrameInt() = 0;
    virtual void SetKeyFrameInt(int frames) = 0;
    // B pictures between two anchor pictures.
    virtual int GetNumBframes() = 0;
    virtual int SetNumBframes(int count) = 0;
    // Lends the encoder threads to code each picture on, from the next picture on; null, the
    // default, takes them back. The stream does not depend on them. Borrowed: a runner lives until
    // a PutSample that began after it was replaced has returned, or the encoder is deleted.
    virtual void SetParallelRunner(IParallelRunner* runner) = 0;

protected:
    ~IVideoEncSettings() = default;
};
