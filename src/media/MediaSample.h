#pragma once

#include "media/ISample.h"
#include "media/abi.h"

class IMediaFileSample;

// A sample that either owns its payload (after Copy) or borrows it (after SetSampleData or Set).
// Not synchronised: it belongs to one producer, which guards it.
class MediaSample : public ISample {
public:
    // An empty sync sample at time 0.
    MediaSample() = default;
    MediaSample(const MediaSample&) = delete;
    MediaSample& operator=(const MediaSample&) = delete;

    unsigned char* GetSampleData() override { return data; }
    long GetSampleSize() override { return size; }
    long long GetSampleTime() override { return time; }
    bool SampleIsSync() override { return isSync; }
    long long GetSampleCompTimeOffset() override { return compTimeOffset; }
    long long GetSampleKeyStreamOffset() override { return keyStreamOffset; }
    int GetSubStreamId() override { return subStreamId; }

    // Releases the payload when the sample owns it.
    ZOLT_DESTRUCTOR(MediaSample);

    int GetFrameType() const { return frameType; }

    // Borrows `payload`, which must stay valid while the sample points to it and must not be the
    // sample's own buffer: that one is released. The size is set apart.
    void SetSampleData(unsigned char* payload);
    void SetSampleSize(long bytes) { size = bytes; }
    void SetSampleTime(long long microseconds) { time = microseconds; }
    void SetSampleIsSync(bool sync) { isSync = sync; }
    void SetFrameType(int type) { frameType = type; }
    void SetSampleCompTimeOffset(long long microseconds) { compTimeOffset = microseconds; }
    void SetSampleKeyStreamOffset(long long offset) { keyStreamOffset = offset; }
    void SetSubStreamId(int id) { subStreamId = id; }

    // Deep copy of everything but frame type and sub-stream id; nothing for null. The own buffer
    // is kept when it is large enough. A size of 0 or less copies no bytes. Null data, or a size
    // beyond the range of int, counts as size 0.
    void Copy(ISample* sample);
    void Copy(IMediaFileSample* sample);

    // Shallow copy of everything but the sub-stream id: the payload is borrowed. Nothing for null.
    void Set(IMediaFileSample* sample);

    // Takes sync flag, both offsets and sub-stream id; payload, time and frame type stay. Nothing
    // for null.
    void SetSampleMetaInfo(ISample* sample);

private:
    template <class Source>
    void CopyFrom(Source& source);
    void ReleaseData();

    int capacity = 0;               // bytes of the owned buffer; 0: `data` is borrowed or null
    unsigned char* data = nullptr;  // payload
    long size = 0;                  // payload bytes
    long long time = 0;             // presentation time, microseconds
    bool isSync = true;             // decoding can start here
    int frameType = 0;              // 'I' for an IDR picture, else 0
    long long compTimeOffset = 0;   // composition-time offset, microseconds
    long long keyStreamOffset = 0;
    int subStreamId = 0;
};
