#include "plugin/VideoH264ZoltEnc.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>

#include "avc/VideoAvcParser.h"
#include "color/ColorConverter.h"
#include "encoder/CEncoder.h"
#include "encoder/EncH.h"
#include "media/IConfigVideoUncompressed.h"
#include "support/ErrMgr.h"
#include "support/MutexLock.h"

namespace {

constexpr char kClassName[] = "VideoH264ZoltEnc";
constexpr double kDefaultFrameRate = 15.0;
constexpr int kInitialQp = 28;
constexpr int kSizeMultiple = 16;
constexpr int kIdrSlice = 5;  // nal_unit_type, ITU-T H.264 Table 7-1
constexpr int kFrameTypeI = 'I';

int bits_per_second(int kbs) {
    return static_cast<int>(std::clamp<long long>(kbs * 1000LL, INT_MIN, INT_MAX));
}

// Beyond what any level allows (ITU-T H.264 Table A-1), which the engine does not take.
bool is_too_large(int width, int height) {
    constexpr int kMaxSide = 16880;
    constexpr int kMaxMacroblocks = 139264;
    return width > kMaxSide || height > kMaxSide ||
           (static_cast<long long>(width) / 16) * (height / 16) > kMaxMacroblocks;
}

// Seconds from `earlier` to `later`, whatever the two times are.
double seconds_between(long long earlier, long long later) {
    const auto difference = static_cast<std::uint64_t>(later) - static_cast<std::uint64_t>(earlier);
    return static_cast<double>(static_cast<std::int64_t>(difference)) / 1000000.0;
}

}  // namespace

VideoH264ZoltEnc::VideoH264ZoltEnc() : streamConfig(Type, static_cast<IConfigVideoAvc*>(this)) {}

VideoH264ZoltEnc::~VideoH264ZoltEnc() {
    TearDown();
}

void VideoH264ZoltEnc::Notify(IEvent* event) {
    if (ISampleConsumer* const connected = consumer) {
        connected->Notify(event);
    }
}

int VideoH264ZoltEnc::PutStreamConfig(ISampleStreamConfig* config) {
    constexpr char kMethodName[] = "PutStreamConfig";
    if (config == nullptr) {
        ErrMgr::AddErr(kClassName, kMethodName, nullptr, "Stream config may not be NULL");
        return 1;
    }
    const int mediaType = config->GetMediaType();
    if (mediaType != MediaType::kVideoUncompressed) {
        ErrMgr::AddErr(kClassName, kMethodName, nullptr, "Expected media type %s, but got %s",
                       MediaType::ToString(MediaType::kVideoUncompressed),
                       MediaType::ToString(mediaType));
        return 1;
    }
    // The media type says what the description is.
    auto* const video = static_cast<IConfigVideoUncompressed*>(config->GetMediaConfig());
    if (video == nullptr) {
        ErrMgr::AddErr(kClassName, kMethodName, nullptr, "Media config may not be NULL");
        return 1;
    }
    const int newWidth = video->GetWidth();
    const int newHeight = video->GetHeight();
    if (is_too_large(newWidth, newHeight)) {
        ErrMgr::AddErr(kClassName, kMethodName, nullptr, "Source dimensions (%d,%d) are too large",
                       newWidth, newHeight);
        return 1;
    }
    const zolt::MutexLock lock(mutex);
    inputWidth = newWidth;
    inputHeight = newHeight;
    inputColorFormat = video->GetColorFormat();
    const double rate = video->GetFrameRate();
    frameRate = std::isfinite(rate) && rate > 0.0 ? rate : kDefaultFrameRate;
    return InitEncAndPutConfig();
}

void VideoH264ZoltEnc::PutSample(ISample* sample) {
    if (frameBuffer == nullptr) {
        return;
    }
    const zolt::MutexLock lock(mutex);
    if (frameBuffer == nullptr) {
        return;  // torn down while this call waited
    }
    if (sample == nullptr) {
        ErrMgr::AddErr(kClassName, "PutSample", nullptr, "Sample may not be NULL");
        return;
    }
    const long long time = sample->GetSampleTime();
    const unsigned char* const data = sample->GetSampleData();
    if (!SampleIsUsable(data, sample->GetSampleSize())) {
        return;
    }
    MeasureFrameRate(time);
    // The engine reads a picture that needs no conversion where it stands.
    const bool converts = !converter->KeepsPictures();
    if (converts) {
        converter->Convert(data);
    }

    // However the rest ends, the engine is ready for the next frame. The engine is looked up again
    // then: a consumer that calls back against the rules may have replaced it.
    struct NalBufferReset {
        const VideoH264ZoltEnc& session;
        ~NalBufferReset() {
            if (session.encoder != nullptr) {
                session.engine().reset_nal_buffer();
            }
        }
    } const reset{*this};
    engine().set_intra_period(keyFrameInt);
    IParallelRunner* const runner = parallelRunner;
    lentThreads.set_runner(runner);
    engine().set_worker_pool(runner == nullptr ? nullptr : &lentThreads);
    engine().encode_frame(converts ? frameBuffer.load() : data);
    FillOutSample(time);
    if (ISampleConsumer* const connected = consumer) {
        connected->PutSample(&outSample);
    }
}

void VideoH264ZoltEnc::EndOfSamples() {
    const zolt::MutexLock lock(mutex);
    if (ISampleConsumer* const connected = consumer) {
        connected->EndOfSamples();
    }
}

int VideoH264ZoltEnc::Connect(ISampleConsumer* sampleConsumer) {
    const zolt::MutexLock lock(mutex);
    consumer = sampleConsumer;
    return InitEncAndPutConfig();
}

void VideoH264ZoltEnc::Disconnect(ISampleConsumer* sampleConsumer) {
    consumer.compare_exchange_strong(sampleConsumer, nullptr);
}

int VideoH264ZoltEnc::SetBitRateKbs(int kbs) {
    const zolt::MutexLock lock(mutex);
    bitRateKbs = kbs;
    if (firstSample) {
        InitEncAndPutConfig();
    } else if (encoder != nullptr) {
        engine().set_bit_rate(bits_per_second(kbs));
    }
    return bitRateKbs;
}

void VideoH264ZoltEnc::SetKeyFrameInt(int frames) {
    if (frames < 1) {
        ErrMgr::AddErr(kClassName, "SetKeyFrameInt", nullptr,
                       "Key frame interval must be positive, but got %d", frames);
        return;
    }
    keyFrameInt = frames;  // reaches the engine with the next frame
}

// Builds converter and engine anew from the session's settings, as far as input and consumer are
// known, and sends the stream configuration. Called with the mutex held; returns a status flag.
int VideoH264ZoltEnc::InitEncAndPutConfig() {
    TearDown();
    // Getters do not wait for the lock, so the size is stored once, when it is known.
    const auto set_size = [this](int newWidth, int newHeight) {
        width = newWidth;
        height = newHeight;
    };
    if (consumer == nullptr || inputWidth == 0 || inputHeight == 0) {
        set_size(inputWidth, inputHeight);
        return 0;
    }
    converter.reset(ColorConverter::GetNewColorConverter(inputWidth, inputHeight, inputColorFormat,
                                                         ColorConverter::kIYUV, kSizeMultiple,
                                                         kSizeMultiple));
    if (converter == nullptr) {
        set_size(inputWidth, inputHeight);
        ErrMgr::AddErr(kClassName, "InitEncAndPutConfig", nullptr,
                       "Error constructing a new color converter");
        return 1;
    }
    set_size(converter->GetOutputWidth(), converter->GetOutputHeight());

    encoder = std::make_unique<CEncH>(width, height);
    engine().set_bit_rate(bits_per_second(bitRateKbs));
    engine().set_qp(kInitialQp);
    engine().set_frame_rate(frameRate);
    engine().set_intra_period(keyFrameInt);
    engine().set_inter_period(kNumBframes + 1);
    engine().initialize_encoder();
    engine().encode_sps();
    StoreParSet(&seqParSetData, &seqParSetSize);
    engine().encode_pps();
    StoreParSet(&picParSetData, &picParSetSize);

    frameBuffer = converter->GetOutputBuffer();  // from here on samples are taken
    ISampleConsumer* const connected = consumer;
    return connected == nullptr ? 0 : connected->PutStreamConfig(&streamConfig);
}

void VideoH264ZoltEnc::TearDown() {
    frameBuffer = nullptr;
    encoder.reset();
    converter.reset();
    ReleaseParSet(&seqParSetData, &seqParSetSize);
    ReleaseParSet(&picParSetData, &picParSetSize);
}

CEncoder& VideoH264ZoltEnc::engine() const {
    return *encoder->get_encoder();
}

// Moves the NAL unit that the engine has just written into a new array.
void VideoH264ZoltEnc::StoreParSet(std::atomic<unsigned char*>* data, std::atomic<int>* size) {
    const int bytes = engine().get_nal_size();
    auto copy = std::make_unique<unsigned char[]>(static_cast<std::size_t>(bytes));
    engine().copy_nal_unit(copy.get(), bytes);
    engine().reset_nal_buffer();
    *data = copy.release();
    *size = bytes;
}

void VideoH264ZoltEnc::ReleaseParSet(std::atomic<unsigned char*>* data, std::atomic<int>* size) {
    *size = 0;
    delete[] data->exchange(nullptr);
}

// Whether a sample of this data and size holds a picture of the input; reports it when not.
bool VideoH264ZoltEnc::SampleIsUsable(const unsigned char* data, long size) const {
    if (data == nullptr) {
        ErrMgr::AddErr(kClassName, "PutSample", nullptr, "Sample data may not be NULL");
        return false;
    }
    const int needed = ColorConverter::GetReadSize(inputWidth, inputHeight, inputColorFormat);
    if (size > 0 && size < needed) {
        ErrMgr::AddErr(kClassName, "PutSample", nullptr,
                       "Sample of %ld bytes is shorter than a picture of %d bytes", size, needed);
        return false;
    }
    return true;
}

// Tells the engine the frame rate that the times of the samples so far show.
void VideoH264ZoltEnc::MeasureFrameRate(long long time) {
    if (!firstSample) {
        const double average = frameRateAverage.Update(seconds_between(lastSampleTime, time));
        engine().set_frame_rate(average == 0.0 ? 1.0 : 1.0 / average);
    }
    firstSample = false;
    lastSampleTime = time;
}

void VideoH264ZoltEnc::FillOutSample(long long time) {
    unsigned char* const nal_unit = engine().get_nal_buffer();
    const bool is_idr = VideoAvcParser::GetNaluType(nal_unit) == kIdrSlice;
    outSample.SetSampleData(nal_unit);
    outSample.SetSampleSize(engine().get_nal_size());
    outSample.SetSampleTime(time);
    outSample.SetFrameType(is_idr ? kFrameTypeI : 0);
    outSample.SetSampleIsSync(is_idr);
}
