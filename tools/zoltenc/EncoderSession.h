#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "zoltenc/EncoderLibrary.h"
#include "zoltenc/SinkConsumer.h"

class IMediaEncoder;
class IParallelRunner;

namespace zolt {

// One encoder object of a library, fed with pictures of one format, and the consumer it feeds.
// Failures are ToolErrors that carry the text that the encoder gave to the error manager.
class EncoderSession {
public:
    struct Settings {
        int bit_rate_kbs;        // 0: no rate control
        int key_frame_interval;  // frames
        int threads;             // to code a picture on, from 1
    };

    // `library` and `consumer` are the caller's and outlive the session.
    EncoderSession(const EncoderLibrary& library, const PictureFormat& format,
                   const FrameRate& frame_rate, const Settings& settings, SinkConsumer& consumer);
    ~EncoderSession();
    EncoderSession(const EncoderSession&) = delete;
    EncoderSession& operator=(const EncoderSession&) = delete;

    // Codes one picture of the format's sample layout; the consumer has its NAL unit on return.
    void encode(std::vector<unsigned char>& picture, std::int64_t time);

    void end();

private:
    // What the encoder reads the input's description from.
    class InputConfig : public IConfigVideoUncompressed {
    public:
        InputConfig(const PictureFormat& format, const FrameRate& frame_rate)
            : format_(format), frame_rate_(frame_rate) {}
        int GetWidth() override { return format_.width; }
        int GetHeight() override { return format_.height; }
        double GetFrameRate() override { return frame_rate_.per_second(); }
        int GetColorFormat() override { return format_.fourcc_code; }

    private:
        PictureFormat format_;
        FrameRate frame_rate_;
    };

    [[noreturn]] void fail(const std::string& what) const;

    SinkConsumer& consumer_;
    InputConfig input_config_;
    MediaStreamConfig stream_config_;
    MediaSample sample_;
    std::shared_ptr<IParallelRunner> runner_;  // null: this thread alone
    std::unique_ptr<IMediaEncoder, Delete> encoder_;
};

}  // namespace zolt
