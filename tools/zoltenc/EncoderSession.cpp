#include "zoltenc/EncoderSession.h"

#include "io/ToolError.h"
#include "io/thread_runner.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/MediaType.h"
#include "zoltenc/HostServices.h"

namespace zolt {

EncoderSession::EncoderSession(const EncoderLibrary& library, const PictureFormat& format,
                               const FrameRate& frame_rate, const Settings& settings,
                               SinkConsumer& consumer)
    : consumer_(consumer),
      input_config_(format, frame_rate),
      stream_config_(MediaType::kVideoUncompressed, &input_config_),
      runner_(settings.threads > 1 ? make_thread_runner(settings.threads) : nullptr),
      encoder_(library.new_encoder()) {
    // The settings of a video encoder are IVideoEncSettings. Set before the encoder knows its
    // input, they cost no rebuild.
    auto* const video_settings = static_cast<IVideoEncSettings*>(encoder_->GetEncSettings());
    video_settings->SetBitRateKbs(settings.bit_rate_kbs);
    video_settings->SetKeyFrameInt(settings.key_frame_interval);
    video_settings->SetParallelRunner(runner_.get());
    if (encoder_->Connect(&consumer_) != 0 || encoder_->PutStreamConfig(&stream_config_) != 0) {
        fail("the encoder refuses the input");
    }
    if (consumer_.stream() == nullptr) {
        fail("the encoder does not describe its stream");
    }
}

EncoderSession::~EncoderSession() = default;

void EncoderSession::encode(std::vector<unsigned char>& picture, std::int64_t time) {
    sample_.SetSampleData(picture.data());
    sample_.SetSampleSize(static_cast<long>(picture.size()));
    sample_.SetSampleTime(time);
    const std::int64_t before = consumer_.pictures();
    encoder_->PutSample(&sample_);
    consumer_.check();
    if (consumer_.pictures() == before) {
        fail("the encoder dropped picture " + std::to_string(before));
    }
}

void EncoderSession::end() {
    encoder_->EndOfSamples();
    consumer_.check();
}

void EncoderSession::fail(const std::string& what) const {
    const std::string reason = HostServices::last_error();
    throw ToolError(reason.empty() ? what : what + ": " + reason);
}

}  // namespace zolt
