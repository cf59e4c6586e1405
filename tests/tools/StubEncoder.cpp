// An encoder library that codes nothing: its units tell, as text, what the host gave it. The
// environment variable ZOLT_STUB makes it misbehave.

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "media/IConfigVideoAvc.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/IEncCapabilities.h"
#include "media/IEncRunTimeControl.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "media/MediaType.h"
#include "support/ErrMgr.h"

namespace {

bool misbehaves(const char* how) {
    const char* const wanted = std::getenv("ZOLT_STUB");
    return wanted != nullptr && std::string(wanted) == how;
}

// 64-bit FNV-1a.
unsigned long long digest(const unsigned char* data, long size) {
    std::uint64_t hash = 14695981039346656037u;
    for (long i = 0; i < size; ++i) {
        hash = (hash ^ data[i]) * 1099511628211u;
    }
    return hash;
}

class StubEncoder : public IMediaEncoder, public IConfigVideoAvc, public IVideoEncSettings {
public:
    ZOLT_DESTRUCTOR(StubEncoder) = default;

    void Notify(IEvent*) override {}

    int PutStreamConfig(ISampleStreamConfig* config) override {
        if (misbehaves("refuse")) {
            ErrMgr::AddErr("StubEncoder", "PutStreamConfig", nullptr, "reason %d", 42);
            return 1;
        }
        input_ = static_cast<IConfigVideoUncompressed*>(config->GetMediaConfig());
        return Announce();
    }

    void PutSample(ISample* sample) override {
        if (misbehaves("drop at 2") && index_ == 2) {
            return;
        }
        if (misbehaves("announce at 2") && index_ == 2) {
            Announce();
        }
        if (misbehaves("exit at 2") && index_ == 2) {
            std::exit(109);
        }
        if (misbehaves("chatter")) {
            std::printf("chatter of the library\n");
        }
        char text[160];
        const int length = std::snprintf(
            text, sizeof text, "%cindex=%d time=%lld size=%ld digest=%016llx",
            index_ % key_frame_interval_ == 0 ? 0x65 : 0x41, index_, sample->GetSampleTime(),
            sample->GetSampleSize(), digest(sample->GetSampleData(), sample->GetSampleSize()));
        ++index_;
        std::string unit(text, length);
        if (misbehaves("echo")) {
            unit.assign(sample->GetSampleData(), sample->GetSampleData() + sample->GetSampleSize());
            unit.insert(0, 1, 0x65);
        }
        output_.SetSampleData(reinterpret_cast<unsigned char*>(unit.data()));
        output_.SetSampleSize(static_cast<long>(unit.size()));
        output_.SetSampleTime(sample->GetSampleTime());
        consumer_->PutSample(&output_);
        output_.SetSampleData(nullptr);
    }

    void EndOfSamples() override { consumer_->EndOfSamples(); }

    int GetEncoderMediaType() override { return MediaType::kVideoAvc; }
    IEncCapabilities* GetEncCapabilities() override { return nullptr; }
    IEncSettings* GetEncSettings() override { return this; }
    IEncRunTimeControl* GetEncRunTimeControl() override { return nullptr; }

    ISampleStreamConfig* GetSampleStreamConfig() override { return &stream_config_; }
    int Connect(ISampleConsumer* consumer) override {
        consumer_ = consumer;
        return Announce();
    }
    void Disconnect(ISampleConsumer*) override { consumer_ = nullptr; }

    int GetWidth() override { return input_->GetWidth() / 16 * 16; }
    int GetHeight() override { return input_->GetHeight() / 16 * 16; }
    double GetFrameRate() override { return input_->GetFrameRate(); }
    unsigned char* GetSeqParSetData() override { return Bytes(seq_par_set_); }
    int GetSeqParSetSize() override { return static_cast<int>(seq_par_set_.size()); }
    unsigned char* GetPicParSetData() override { return Bytes(pic_par_set_); }
    int GetPicParSetSize() override { return static_cast<int>(pic_par_set_.size()); }

    int GetBitRateKbs() override { return bit_rate_kbs_; }
    int SetBitRateKbs(int kbs) override { return bit_rate_kbs_ = kbs; }
    int GetKeyFrameIntMsecs() override { return 0; }
    void SetKeyFrameIntMsecs(int) override {}
    int GetKeyFrameInt() override { return key_frame_interval_; }
    void SetKeyFrameInt(int frames) override { key_frame_interval_ = frames; }
    int GetNumBframes() override { return 0; }
    int SetNumBframes(int) override { return 0; }
    void SetParallelRunner(IParallelRunner*) override {}

private:
    static unsigned char* Bytes(std::string& text) {
        return reinterpret_cast<unsigned char*>(text.data());
    }

    int Announce() {
        if (consumer_ == nullptr || input_ == nullptr) {
            return 0;
        }
        char text[160];
        const auto format = static_cast<unsigned>(input_->GetColorFormat());
        std::snprintf(text, sizeof text, "%cwidth=%d height=%d format=%08x fps=%.6f", 0x47,
                      input_->GetWidth(), input_->GetHeight(), format, input_->GetFrameRate());
        seq_par_set_ = text;
        std::snprintf(text, sizeof text, "%cbitrate=%d keyint=%d", 0x48, bit_rate_kbs_,
                      key_frame_interval_);
        pic_par_set_ = text;
        return consumer_->PutStreamConfig(&stream_config_);
    }

    ISampleConsumer* consumer_ = nullptr;
    IConfigVideoUncompressed* input_ = nullptr;
    MediaStreamConfig stream_config_{MediaType::kVideoAvc, static_cast<IConfigVideoAvc*>(this)};
    MediaSample output_;
    std::string seq_par_set_;
    std::string pic_par_set_;
    int bit_rate_kbs_ = 0;
    int key_frame_interval_ = 0;
    int index_ = 0;
};

}  // namespace

extern "C" {

[[gnu::visibility("default")]] int GetEncoderType() {
    return misbehaves("type") ? MediaType::ToMediaType("Video JPEG") : MediaType::kVideoAvc;
}

[[gnu::visibility("default")]] const char* GetEncoderName() {
    return "Stub";
}

[[gnu::visibility("default")]] IMediaEncoder* GetNewEncoder() {
    return misbehaves("null") ? nullptr : new StubEncoder;
}
}
