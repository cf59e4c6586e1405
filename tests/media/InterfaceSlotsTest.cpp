#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

#include "media/IConfigVideoAvc.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/IEncCapabilities.h"
#include "media/IEncRunTimeControl.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/IMediaFileSample.h"
#include "media/IParallelRunner.h"
#include "media/ISample.h"
#include "media/ISampleStreamConfig.h"

namespace {

// The host calls through slots, so an operation that moves breaks every host without a diagnostic.
// The Itanium C++ ABI writes a virtual operation's slot into the pointer to member, as its byte
// offset plus 1 (clause 2.3); a virtual destructor takes two slots, on Windows one (media/abi.h).
#if defined(__GXX_ABI_VERSION) && (defined(__x86_64__) || defined(__i386__))
#ifdef _WIN32
constexpr long kDestructorSlots = 1;
#else
constexpr long kDestructorSlots = 2;
#endif

template <class Operation>
long slot(Operation operation) {
    std::uintptr_t encoded;
    static_assert(sizeof operation >= sizeof encoded, "a pointer to member holds the offset first");
    std::memcpy(&encoded, &operation, sizeof encoded);
    return encoded % sizeof(void*) == 1 ? static_cast<long>(encoded / sizeof(void*)) : -1;
}

// Expects the operations in slots first, first + 1, ...
template <class... Operations>
void expect_slots(long first, Operations... operations) {
    for (const long found : {slot(operations)...}) {
        EXPECT_EQ(found, first++);
    }
}

TEST(InterfaceSlots, StandInTheOrderThatHostsRelyOn) {
    expect_slots(0, &ISampleConsumer::Notify, &ISampleConsumer::PutStreamConfig,
                 &ISampleConsumer::PutSample, &ISampleConsumer::EndOfSamples);
    expect_slots(0, &ISampleProducer::GetSampleStreamConfig, &ISampleProducer::Connect,
                 &ISampleProducer::Disconnect);
    expect_slots(4 + kDestructorSlots, &IMediaEncoder::GetEncoderMediaType,
                 &IMediaEncoder::GetEncCapabilities, &IMediaEncoder::GetEncSettings,
                 &IMediaEncoder::GetEncRunTimeControl);
    expect_slots(0, &IConfigVideoAvc::GetWidth, &IConfigVideoAvc::GetHeight,
                 &IConfigVideoAvc::GetFrameRate, &IConfigVideoAvc::GetSeqParSetData,
                 &IConfigVideoAvc::GetSeqParSetSize, &IConfigVideoAvc::GetPicParSetData,
                 &IConfigVideoAvc::GetPicParSetSize);
    expect_slots(3, &IConfigVideoUncompressed::GetColorFormat);
    expect_slots(0, &IVideoEncCapabilities::SupportsBframes);
    expect_slots(0, &IVideoEncSettings::GetBitRateKbs, &IVideoEncSettings::SetBitRateKbs,
                 &IVideoEncSettings::GetKeyFrameIntMsecs, &IVideoEncSettings::SetKeyFrameIntMsecs,
                 &IVideoEncSettings::GetKeyFrameInt, &IVideoEncSettings::SetKeyFrameInt,
                 &IVideoEncSettings::GetNumBframes, &IVideoEncSettings::SetNumBframes,
                 &IVideoEncSettings::SetParallelRunner);
    expect_slots(0, &IParallelTask::Run);
    expect_slots(0, &IParallelRunner::GetThreads, &IParallelRunner::Run);
    expect_slots(0, &IVideoEncRunTimeControl::SupportsChangingBitRate,
                 &IVideoEncRunTimeControl::ChangeBitRateKbs,
                 &IVideoEncRunTimeControl::ForceIntraFrame,
                 &IVideoEncRunTimeControl::SupportsProducingExtraIntraFrame,
                 &IVideoEncRunTimeControl::ProduceExtraIntraFrame);
    expect_slots(0, &ISample::GetSampleData, &ISample::GetSampleSize, &ISample::GetSampleTime,
                 &ISample::SampleIsSync, &ISample::GetSampleCompTimeOffset,
                 &ISample::GetSampleKeyStreamOffset, &ISample::GetSubStreamId);
    expect_slots(0, &ISampleStreamConfig::GetMediaType, &ISampleStreamConfig::GetMediaConfig,
                 &ISampleStreamConfig::IsEncrypted, &ISampleStreamConfig::GetCryptoSessionKey,
                 &ISampleStreamConfig::GetBwAdaptConfig);
    expect_slots(0, &IMediaFileSample::GetSampleData, &IMediaFileSample::GetSampleSize,
                 &IMediaFileSample::GetSampleTime, &IMediaFileSample::GetSampleCompTimeOffset,
                 &IMediaFileSample::SampleIsSync, &IMediaFileSample::GetFrameType,
                 &IMediaFileSample::GetSampleKeyStreamOffset);
}
#endif

}  // namespace
