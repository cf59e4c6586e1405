#include "avc/VideoAvcParser.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>

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

// Adds a * factor to sum, numbers of n and n + 1 digits of 32 bits, the lowest first. The sum has
// to fit.
void add_product(std::uint32_t* sum, const std::uint32_t* a, int n, std::uint32_t factor) {
    std::uint32_t carry = 0;
    for (int i = 0; i < n; ++i) {
        const std::uint64_t digit = std::uint64_t{a[i]} * factor + sum[i] + carry;
        sum[i] = static_cast<std::uint32_t>(digit);
        carry = static_cast<std::uint32_t>(digit >> 32);
    }
    sum[n] += carry;
}

// Time of a sample in microseconds: the exact product count * period * 1000000, truncated;
// saturates, and is 0 for what is not a number. In integers, because a host may have set the
// floating-point unit to another rounding or precision.
long long sample_time(long long count, double period) {
    static_assert(std::numeric_limits<double>::is_iec559, "the period is taken apart by its bits");
    std::uint64_t bits;
    std::memcpy(&bits, &period, sizeof bits);
    std::uint64_t mantissa = bits & ((std::uint64_t{1} << 52) - 1);
    int exponent = static_cast<int>(bits >> 52 & 0x7ff);
    const bool negative = (count < 0) != (bits >> 63 != 0);
    const long long limit = negative ? LLONG_MIN : LLONG_MAX;
    if (exponent == 0x7ff) {
        return count == 0 || mantissa != 0 ? 0 : limit;
    }
    if (exponent > 0) {
        mantissa |= std::uint64_t{1} << 52;
    } else {
        exponent = 1;
    }
    exponent -= 1023 + 52;

    const std::uint64_t magnitude =
        count < 0 ? 0 - static_cast<std::uint64_t>(count) : static_cast<std::uint64_t>(count);
    const std::uint32_t digits[2] = {static_cast<std::uint32_t>(mantissa),
                                     static_cast<std::uint32_t>(mantissa >> 32)};
    std::uint32_t scaled[3] = {};
    add_product(scaled, digits, 2, 1000000);
    std::uint32_t product[5] = {};
    add_product(product, scaled, 3, static_cast<std::uint32_t>(magnitude));
    add_product(product + 1, scaled, 3, static_cast<std::uint32_t>(magnitude >> 32));

    std::uint64_t time = 0;
    for (int i = 0; i < 5; ++i) {
        const std::uint64_t digit = product[i];
        const int shift = 32 * i + exponent;
        if (digit == 0 || shift <= -32) {
            continue;
        }
        if (shift >= 63 || (shift > 0 && digit >> (63 - shift) != 0)) {
            return limit;
        }
        time += shift < 0 ? digit >> -shift : digit << shift;
    }
    return negative ? -static_cast<long long>(time) : static_cast<long long>(time);
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
