#include "media/MediaSample.h"

#include <climits>
#include <cstring>

#include "media/IMediaFileSample.h"
#include "support/MemUtil.h"

MediaSample::~MediaSample() {
    ReleaseData();
}

void MediaSample::SetSampleData(unsigned char* payload) {
    ReleaseData();
    data = payload;
}

void MediaSample::Copy(ISample* sample) {
    if (sample != nullptr) {
        CopyFrom(*sample);
    }
}

void MediaSample::Copy(IMediaFileSample* sample) {
    if (sample != nullptr) {
        CopyFrom(*sample);
    }
}

void MediaSample::Set(IMediaFileSample* sample) {
    if (sample == nullptr) {
        return;
    }
    SetSampleData(sample->GetSampleData());
    size = sample->GetSampleSize();
    time = sample->GetSampleTime();
    isSync = sample->SampleIsSync();
    frameType = sample->GetFrameType();
    compTimeOffset = sample->GetSampleCompTimeOffset();
    keyStreamOffset = sample->GetSampleKeyStreamOffset();
}

void MediaSample::SetSampleMetaInfo(ISample* sample) {
    if (sample == nullptr) {
        return;
    }
    isSync = sample->SampleIsSync();
    compTimeOffset = sample->GetSampleCompTimeOffset();
    keyStreamOffset = sample->GetSampleKeyStreamOffset();
    subStreamId = sample->GetSubStreamId();
}

template <class Source>
void MediaSample::CopyFrom(Source& source) {
    size = source.GetSampleSize();
    time = source.GetSampleTime();
    isSync = source.SampleIsSync();
    compTimeOffset = source.GetSampleCompTimeOffset();
    keyStreamOffset = source.GetSampleKeyStreamOffset();

    const unsigned char* bytes = source.GetSampleData();
    if (bytes == data && capacity > 0) {
        return;  // a copy of itself: the bytes are here already
    }
    if (capacity == 0) {
        data = nullptr;  // a borrowed payload is not ours to grow or to write to
    }
    if (bytes == nullptr || size > INT_MAX) {
        size = 0;
    }
    if (size > 0) {
        MemUtil::CheckSizeArrayByte(&data, &capacity, static_cast<int>(size));
        std::memmove(data, bytes, static_cast<size_t>(size));
    }
}

void MediaSample::ReleaseData() {
    if (capacity > 0) {
        delete[] data;
    }
    data = nullptr;
    capacity = 0;
}
