#include "zoltenc/SinkConsumer.h"

#include <utility>

#include "media/IConfigVideoAvc.h"
#include "media/ISample.h"
#include "media/ISampleStreamConfig.h"
#include "media/MediaType.h"

namespace zolt {

void SinkConsumer::check() {
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
}

void SinkConsumer::Notify(IEvent*) {}

int SinkConsumer::PutStreamConfig(ISampleStreamConfig* config) {
    if (config == nullptr || config->GetMediaType() != MediaType::kVideoAvc ||
        config->GetMediaConfig() == nullptr) {
        return 1;
    }
    stream_ = static_cast<IConfigVideoAvc*>(config->GetMediaConfig());
    const unsigned char* const sps = stream_->GetSeqParSetData();
    const unsigned char* const pps = stream_->GetPicParSetData();
    description_.seq_par_set.assign(sps, sps + stream_->GetSeqParSetSize());
    description_.pic_par_set.assign(pps, pps + stream_->GetPicParSetSize());
    description_.width = stream_->GetWidth();
    description_.height = stream_->GetHeight();
    described_ = false;
    return 0;
}

void SinkConsumer::PutSample(ISample* sample) {
    if (failure_) {
        return;
    }
    try {
        if (!described_) {
            sink_.begin(description_);
            described_ = true;
        }
        const CodedPicture picture = {sample->GetSampleData(),
                                      static_cast<std::size_t>(sample->GetSampleSize()), time_,
                                      sample->SampleIsSync()};
        sink_.write(picture);
        ++pictures_;
        if (listener_) {
            listener_(picture);
        }
    } catch (...) {
        failure_ = std::current_exception();
    }
}

}  // namespace zolt
