#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "session/EncoderLibrary.h"

class IMediaEncoder;
class IParallelRunner;
class IVideoEncSettings;

namespace zolt {

class HostServices;
class StreamConsumer;

// One encoder object of a library and the consumer it feeds. Failures are ToolErrors that carry the
// text that the encoder gave to the error manager.
class EncoderSession {
public:
    // The largest bit rate of level 2.2, Main profile (ITU-T H.264 Table A-1): the engine ends the
    // process with a larger one.
    static constexpr int kMaxBitRateKbs = 4000;

    struct Settings {
        int bit_rate_kbs;        // 0: no rate control; at most kMaxBitRateKbs
        int key_frame_interval;  // frames
        int threads;             // to code a picture on, from 1
    };

    // Two rows of macroblocks or more for each thread, what another one would do is too little; and
    // no more threads than processors.
    static int useful_threads(int picture_height);

    // `library`, `host` and `consumer` are the caller's and outlive the session.
    EncoderSession(const EncoderLibrary& library, const HostServices& host,
                   const Settings& settings, StreamConsumer& consumer);
    ~EncoderSession();
    EncoderSession(const EncoderSession&) = delete;
    EncoderSession& operator=(const EncoderSession&) = delete;

    // Begins a stream of pictures of this format. To be called before the first picture, and again
    // wherever the stream is to begin anew, with an IDR picture.
    void begin(const PictureFormat& format, const FrameRate& frame_rate);

    // Take effect with the next picture.
    void set_bit_rate(int kbs);
    void set_key_frame_interval(int frames);

    // Codes one picture of the format's sample layout, which is only read; the consumer has its NAL
    // unit on return. `time` is in microseconds.
    void encode(const unsigned char* picture, std::size_t bytes, std::int64_t time);

    void end();

private:
    // What the encoder reads the input's description from.
    class InputConfig : public IConfigVideoUncompressed {
    public:
        void set(const PictureFormat& format, const FrameRate& frame_rate) {
            format_ = format;
            frame_rate_ = frame_rate;
        }
        int GetWidth() override { return format_.width; }
        int GetHeight() override { return format_.height; }
        double GetFrameRate() override { return frame_rate_.per_second(); }
        int GetColorFormat() override { return format_.fourcc_code; }

    private:
        PictureFormat format_;
        FrameRate frame_rate_;
    };

    IVideoEncSettings& settings() const;
    [[noreturn]] void fail(const std::string& what) const;

    const HostServices& host_;
    StreamConsumer& consumer_;
    InputConfig input_config_;
    MediaStreamConfig stream_config_;
    MediaSample sample_;
    std::shared_ptr<IParallelRunner> runner_;  // null: this thread alone
    std::unique_ptr<IMediaEncoder, Delete> encoder_;
};

}  // namespace zolt
