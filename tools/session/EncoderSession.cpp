#include "session/EncoderSession.h"

#include <algorithm>

#include "io/ToolError.h"
#include "io/thread_runner.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/MediaType.h"
#include "session/HostServices.h"
#include "session/StreamConsumer.h"

namespace zolt {

int EncoderSession::useful_threads(int picture_height) {
    constexpr int kMacroblock = 16;
    constexpr int kRowsOfAThread = 2;
    return std::clamp(picture_height / kMacroblock / kRowsOfAThread, 1, processor_count());
}

EncoderSession::EncoderSession(const EncoderLibrary& library, const HostServices& host,
                               const Settings& settings, StreamConsumer& consumer)
    : host_(host),
      consumer_(consumer),
      stream_config_(MediaType::kVideoUncompressed, &input_config_),
      runner_(settings.threads > 1 ? make_thread_runner(settings.threads) : nullptr),
      encoder_(library.new_encoder()) {
    // Set before the encoder knows its input, they cost no rebuild.
    set_bit_rate(settings.bit_rate_kbs);
    set_key_frame_interval(settings.key_frame_interval);
    this->settings().SetParallelRunner(runner_.get());
    if (encoder_->Connect(&consumer_) != 0) {
        fail("the encoder refuses its consumer");
    }
}

EncoderSession::~EncoderSession() = default;

void EncoderSession::begin(const PictureFormat& format, const FrameRate& frame_rate) {
    input_config_.set(format, frame_rate);
    if (encoder_->PutStreamConfig(&stream_config_) != 0) {
        fail("the encoder refuses the input");
    }
    if (consumer_.stream() == nullptr) {
        fail("the encoder does not describe its stream");
    }
}

void EncoderSession::set_bit_rate(int kbs) {
    settings().SetBitRateKbs(kbs);
}

void EncoderSession::set_key_frame_interval(int frames) {
    settings().SetKeyFrameInt(frames);
}

void EncoderSession::encode(const unsigned char* picture, std::size_t bytes, std::int64_t time) {
    sample_.SetSampleData(const_cast<unsigned char*>(picture));
    sample_.SetSampleSize(static_cast<long>(bytes));
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

// The settings of a video encoder are IVideoEncSettings.
IVideoEncSettings& EncoderSession::settings() const {
    return *static_cast<IVideoEncSettings*>(encoder_->GetEncSettings());
}

void EncoderSession::fail(const std::string& what) const {
    const std::string reason = host_.take_error();
    throw ToolError(reason.empty() ? what : what + ": " + reason);
}

}  // namespace zolt
