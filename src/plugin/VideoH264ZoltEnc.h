#pragma once

#include <atomic>
#include <memory>

#include "media/ExpDecayAverage.h"
#include "media/IConfigVideoAvc.h"
#include "media/IEncCapabilities.h"
#include "media/IEncRunTimeControl.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "media/MediaType.h"
#include "media/abi.h"
#include "media/fourcc.h"
#include "plugin/LentThreads.h"
#include "support/SimpleMutex.h"

class CEncH;
class CEncoder;
class ColorConverter;

// One encoding session: takes the configuration of an uncompressed video stream and its frames, and
// hands one sample per frame, a bare NAL unit, to the one consumer connected to it. It is also the
// description of its own output stream and the object through which the host sets the encoder.
//
// The first of PutStreamConfig and Connect only stores what it is given, the second one builds
// converter and engine, for the largest central part of the input whose sides are multiples of 16,
// and sends the stream configuration to the consumer. Each later one, and SetBitRateKbs until the
// first sample, builds them anew: the next picture is then an IDR picture.
//
// Calls may come from several threads. One mutex guards the session; it is held while the consumer
// is called, so a consumer must not call back into the session from there. Notify, Disconnect, the
// key-frame interval, the parallel runner and all getters take no lock. Parameter sets that getters
// return are valid until the session is built anew. A consumer that throws leaves the session as
// after a return.
class VideoH264ZoltEnc : public IMediaEncoder,
                         public IConfigVideoAvc,
                         public IVideoEncCapabilities,
                         public IVideoEncSettings,
                         public IVideoEncRunTimeControl {
public:
    static constexpr int Type = MediaType::kVideoAvc;
    static constexpr char Name[] = "ZOLT H.264 Video Encoder";

    VideoH264ZoltEnc();
    VideoH264ZoltEnc(const VideoH264ZoltEnc&) = delete;
    VideoH264ZoltEnc& operator=(const VideoH264ZoltEnc&) = delete;

    // Passes the event on to the consumer.
    void Notify(IEvent* event) override;
    // Takes the description of the input: media type uncv with an IConfigVideoUncompressed. A frame
    // rate that is 0, negative or not finite counts as 15. Returns 1 after a report to the error
    // manager, else the consumer's status, or 0 while there is no consumer.
    int PutStreamConfig(ISampleStreamConfig* config) override;
    // Encodes one frame. Dropped without a report before the session is built; dropped with one
    // when it has no data or fewer bytes than a picture (a size of 0 or less is not checked).
    void PutSample(ISample* sample) override;
    // Passes the end on to the consumer; nothing is pending here.
    void EndOfSamples() override;

    // The consumer is not told.
    ZOLT_DESTRUCTOR(VideoH264ZoltEnc);

    int GetEncoderMediaType() override { return Type; }
    IEncCapabilities* GetEncCapabilities() override { return this; }
    IEncSettings* GetEncSettings() override { return this; }
    IEncRunTimeControl* GetEncRunTimeControl() override { return this; }

    ISampleStreamConfig* GetSampleStreamConfig() override { return &streamConfig; }
    // Connects the consumer in place of any earlier one; returns what PutStreamConfig returns.
    int Connect(ISampleConsumer* sampleConsumer) override;
    // Nothing for a consumer that is not the connected one.
    void Disconnect(ISampleConsumer* sampleConsumer) override;

    // Size of the coded pictures; the input's until converter and engine are built.
    int GetWidth() override { return width; }
    int GetHeight() override { return height; }
    // The configured rate, never the measured one.
    double GetFrameRate() override { return frameRate; }
    unsigned char* GetSeqParSetData() override { return seqParSetData; }
    int GetSeqParSetSize() override { return seqParSetSize; }
    unsigned char* GetPicParSetData() override { return picParSetData; }
    int GetPicParSetSize() override { return picParSetSize; }

    bool SupportsBframes() override { return false; }

    int GetBitRateKbs() override { return bitRateKbs; }
    // Before the first sample this builds the session anew, later it changes the engine's rate. A
    // rate of 0 or less switches rate control off. A rate above the level's limit given before the
    // first sample ends the process.
    int SetBitRateKbs(int kbs) override;
    int GetKeyFrameIntMsecs() override { return 0; }
    void SetKeyFrameIntMsecs(int) override {}
    int GetKeyFrameInt() override { return keyFrameInt; }
    // Takes effect at the next frame; an interval below 1 is reported and changes nothing.
    void SetKeyFrameInt(int frames) override;
    int GetNumBframes() override { return kNumBframes; }
    int SetNumBframes(int) override { return 0; }

    bool SupportsChangingBitRate() override { return true; }
    // Returns the rate in force, which is changed through SetBitRateKbs alone.
    int ChangeBitRateKbs(int) override { return bitRateKbs; }
    void ForceIntraFrame() override {}
    bool SupportsProducingExtraIntraFrame() override { return false; }
    void ProduceExtraIntraFrame() override {}

    // Stored without a lock and read when the next picture begins.
    void SetParallelRunner(IParallelRunner* runner) override { parallelRunner = runner; }

private:
    static constexpr int kNumBframes = 0;  // B pictures between anchors

    int InitEncAndPutConfig();
    void TearDown();
    CEncoder& engine() const;
    void StoreParSet(std::atomic<unsigned char*>* data, std::atomic<int>* size);
    static void ReleaseParSet(std::atomic<unsigned char*>* data, std::atomic<int>* size);
    bool SampleIsUsable(const unsigned char* data, long size) const;
    void MeasureFrameRate(long long time);
    void FillOutSample(long long time);

    // Atomic: also read or written without the mutex.
    std::atomic<ISampleConsumer*> consumer{nullptr};  // borrowed
    std::atomic<double> frameRate{15.0};              // configured frames per second
    std::atomic<int> width{0}, height{0};             // coded pictures
    std::atomic<int> bitRateKbs{200};
    std::atomic<int> keyFrameInt{30};  // intra period in frames
    std::atomic<int> seqParSetSize{0};
    std::atomic<unsigned char*> seqParSetData{nullptr};  // owned array
    std::atomic<int> picParSetSize{0};
    std::atomic<unsigned char*> picParSetData{nullptr};  // owned array
    std::atomic<unsigned char*> frameBuffer{nullptr};    // converter's output; null: nothing built
    std::atomic<IParallelRunner*> parallelRunner{
        nullptr};  // borrowed; null: the caller's thread alone

    // Under the mutex.
    int inputWidth = 0, inputHeight = 0;
    int inputColorFormat = zolt::fourcc("####");
    std::unique_ptr<ColorConverter> converter;
    std::unique_ptr<CEncH> encoder;
    LentThreads lentThreads;  // the engine's view of parallelRunner
    MediaSample outSample;    // reused for every frame; borrows the engine's NAL buffer
    MediaStreamConfig streamConfig;
    bool firstSample = true;           // nothing encoded since construction
    long long lastSampleTime = 0;      // of the previous input sample, microseconds
    ExpDecayAverage frameRateAverage;  // of the seconds between input samples

    SimpleMutex mutex;
};
