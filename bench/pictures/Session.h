#pragma once

#include <cstdint>
#include <vector>

#include "media/IConfigVideoUncompressed.h"
#include "media/IParallelRunner.h"
#include "media/ISampleConsumer.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "media/MediaType.h"
#include "media/fourcc.h"
#include "plugin/VideoH264ZoltEnc.h"

namespace zolt_bench {

// An encoding session of planar 4:2:0 pictures at 30 frames/s, and the host around it, which counts
// what it is sent.
class Session : private ISampleConsumer, private IConfigVideoUncompressed {
public:
    Session(int width, int height, int bit_rate_kbs) : width_(width), height_(height) {
        session_.SetBitRateKbs(bit_rate_kbs);
        session_.Connect(this);
        session_.PutStreamConfig(&input_);
    }

    // Lends the session threads, from the next picture on.
    void lend(IParallelRunner* runner) { session_.SetParallelRunner(runner); }

    void encode(const std::uint8_t* picture) {
        // The interface has no const; the session only reads.
        sample_.SetSampleData(const_cast<std::uint8_t*>(picture));
        sample_.SetSampleTime(pictures_++ * 1000000LL / kFrameRate);
        session_.PutSample(&sample_);
    }

    long long bytes() const { return bytes_; }

private:
    static constexpr int kFrameRate = 30;

    void Notify(IEvent*) override {}
    int PutStreamConfig(ISampleStreamConfig*) override { return 0; }
    void PutSample(ISample* sample) override { bytes_ += sample->GetSampleSize(); }
    void EndOfSamples() override {}
    int GetWidth() override { return width_; }
    int GetHeight() override { return height_; }
    double GetFrameRate() override { return kFrameRate; }
    int GetColorFormat() override { return zolt::fourcc("IYUV"); }

    const int width_, height_;
    MediaStreamConfig input_{MediaType::kVideoUncompressed,
                             static_cast<IConfigVideoUncompressed*>(this)};
    MediaSample sample_;
    VideoH264ZoltEnc session_;
    long long pictures_ = 0;
    long long bytes_ = 0;
};

}  // namespace zolt_bench
