#include "avc/VideoAvcParser.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstring>

#include "media/ISampleConsumer.h"
#include "media/MediaType.h"

namespace {

constexpr int kInitialCapacity = 100000;
constexpr int kCapacityStep = 50000;
constexpr int kMinHeldBytes = 8;
constexpr int kMaxZeros = 3;  // zeros before the 01 byte that can belong to a start code

constexpr int kNonIdrSlice = 1;
constexpr int kIdrSlice = 5;
constexpr int kSeqParSet = 7;
constexpr int kPicParSet = 8;

// Time of a sample in microseconds, truncated; saturates, and is 0 for what is not a number. The
// extended precision is what makes the fourth sample at 30 frames per second 99999.
long long sample_time(long long count, double period) {
    constexpr long double kLimit = 9223372036854775808.0L;  // 2^63
    const long double time = static_cast<long double>(count) * period * 1000000;
    if (time >= kLimit) {
        return LLONG_MAX;
    }
    if (time < -kLimit) {
        return LLONG_MIN;
    }
    return time == time ? static_cast<long long>(time) : 0;
}

}  // namespace

VideoAvcParser::VideoAvcParser(ISampleConsumer* newConsumer, double framesPerSecond)
    : consumer(newConsumer),
      streamConfig(MediaType::kVideoAvc, this),
      buffer(kInitialCapacity),
      frameRate(framesPerSecond),
      framePeriod(framesPerSecond == 0.0 ? 0.0 : 1.0 / framesPerSecond) {
    sample.SetSampleData(buffer.data());
}

int VideoAvcParser::Connect(ISampleConsumer* newConsumer) {
    consumer = newConsumer;
    return consumer != nullptr ? consumer->PutStreamConfig(&streamConfig) : 0;
}

void VideoAvcParser::Disconnect(ISampleConsumer* oldConsumer) {
    if (consumer == oldConsumer) {
        consumer = nullptr;
    }
}

unsigned char* VideoAvcParser::GetSeqParSetData() {
    return seqParSetData.empty() ? nullptr : seqParSetData.data();
}

unsigned char* VideoAvcParser::GetPicParSetData() {
    return picParSetData.empty() ? nullptr : picParSetData.data();
}

void VideoAvcParser::PutNextAvcData(const unsigned char* data, int len) {
    AddDataToBuffer(data, len);
    if (dataSize < kMinHeldBytes) {
        return;
    }
    int start_code_length = GetStartCodeLength(Held());
    int next_start_code_length = 0;
    while (DelimitUnit(start_code_length, &next_start_code_length)) {
        TakeUnit(start_code_length);
        start_code_length = next_start_code_length;
    }
}

void VideoAvcParser::Flush() {
    if (dataSize > 0) {
        unsigned char* const unit = Held();
        const int size = dataSize;
        dataSize = 0;
        scannedSize = 0;
        if (unitListener) {
            unitListener(unit, size);
        }
        DeliverSample(unit, size);
    }
    if (consumer != nullptr) {
        consumer->EndOfSamples();
    }
}

void VideoAvcParser::AddDataToBuffer(const unsigned char* data, int len) {
    if (data == nullptr || len <= 0) {
        return;
    }
    // The held bytes move to the front once per append, not once per unit: behind a delivered unit
    // no more are left than came with the appends since the last search, and three.
    if (dataStart > 0) {
        std::memmove(buffer.data(), Held(), static_cast<std::size_t>(dataSize));
        dataStart = 0;
    }
    len = std::min(len, INT_MAX - dataSize);
    const int capacity = GetBufferCapacity();
    if (len > capacity - dataSize) {
        // The vector's storage grows geometrically, so that a long unit in short pieces is not
        // copied again at every step of the capacity.
        const long long grown = static_cast<long long>(capacity) + std::max(len, kCapacityStep);
        buffer.resize(static_cast<std::size_t>(std::min<long long>(grown, INT_MAX)));
        sample.SetSampleData(buffer.data());
    }
    std::memcpy(buffer.data() + dataSize, data, static_cast<std::size_t>(len));
    dataSize += len;
}

int VideoAvcParser::GetStartCodeLength(const unsigned char* bytes) {
    if (bytes[0] != 0 || bytes[1] != 0) {
        return 0;
    }
    if (bytes[2] == 1) {
        return StartCode3Length;
    }
    return bytes[2] == 0 && bytes[3] == 1 ? StartCode4Length : 0;
}

int VideoAvcParser::FindStartCode(const unsigned char* bytes, int len, int* startCodeLength) {
    int found_length = 0;
    int offset = std::max(len, 0);
    // The 01 byte has two zeros before it, so the next candidate behind a byte that is 01 without
    // them comes three bytes later at the earliest.
    for (std::ptrdiff_t i = 2; i < len; i += 3) {
        const void* one = std::memchr(bytes + i, 1, static_cast<std::size_t>(len - i));
        if (one == nullptr) {
            break;
        }
        i = static_cast<const unsigned char*>(one) - bytes;
        if (bytes[i - 1] == 0 && bytes[i - 2] == 0) {
            const int zeros = i >= kMaxZeros && bytes[i - kMaxZeros] == 0 ? kMaxZeros : 2;
            found_length = zeros + 1;
            offset = static_cast<int>(i) - zeros;
            break;
        }
    }
    if (startCodeLength != nullptr) {
        *startCodeLength = found_length;
    }
    return offset;
}

// Looks for the start code that ends the unit at the front, whose own is startCodeLength bytes
// long. True with nalSize and *nextStartCodeLength when there is one.
bool VideoAvcParser::DelimitUnit(int startCodeLength, int* nextStartCodeLength) {
    // The zeros of a start code may be among the bytes that an earlier search has seen.
    const int from = std::max(startCodeLength, scannedSize - kMaxZeros);
    const int offset = FindStartCode(Held() + from, dataSize - from, nextStartCodeLength);
    if (*nextStartCodeLength == 0) {
        scannedSize = dataSize;
        return false;
    }
    scannedSize = 0;
    nalSize = from + offset;
    return true;
}

// Removes the unit just delimited from the held bytes and does with it what is due. It is removed
// first, so that a consumer that throws is not given the same unit again.
void VideoAvcParser::TakeUnit(int startCodeLength) {
    unsigned char* const unit = Held();
    unsigned char* const nal = unit + startCodeLength;
    const int size = nalSize - startCodeLength;
    dataStart += nalSize;
    dataSize -= nalSize;
    nalType = size > 0 ? GetNaluType(nal) : 0;

    if (unitListener) {
        unitListener(unit, nalSize);
    }
    if (!HoldsParSets()) {
        CaptureParSet(nal, size);
        return;
    }
    if (nalType == kNonIdrSlice || nalType == kIdrSlice) {
        ParseSliceHeader(nal, size, &seqParSet, &sliceHeader, diagnostics);
    }
    DeliverSample(unit, nalSize);
}

// Keeps a copy of the unit if it is the first sequence or picture parameter set.
void VideoAvcParser::CaptureParSet(const unsigned char* nal, int size) {
    if (nalType == kSeqParSet && seqParSetData.empty()) {
        seqParSetData.assign(nal, nal + size);
        ParseSeqParSet(nal, size, &seqParSet);
        ParseSeqParSet(nal, size, &width, &height);
    } else if (nalType == kPicParSet && picParSetData.empty()) {
        picParSetData.assign(nal, nal + size);
    }
    firstSampleOffset += std::min(nalSize, INT_MAX - firstSampleOffset);
    if (HoldsParSets() && consumer != nullptr) {
        consumer->PutStreamConfig(&streamConfig);
    }
}

void VideoAvcParser::DeliverSample(unsigned char* unit, int size) {
    sampleTime = sample_time(sampleCount, framePeriod);
    ++sampleCount;
    sample.SetSampleData(unit);
    sample.SetSampleSize(size);
    sample.SetSampleTime(sampleTime);
    sample.SetSampleIsSync(nalType == kIdrSlice);
    if (consumer != nullptr) {
        consumer->PutSample(&sample);
    }
}
