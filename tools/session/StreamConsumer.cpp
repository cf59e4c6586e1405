#include "session/StreamConsumer.h"

#include <utility>

#include "media/IConfigVideoAvc.h"
#include "media/ISample.h"
#include "media/ISampleStreamConfig.h"
#include "media/MediaType.h"

namespace zolt {

void StreamConsumer::check() {
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
}

int StreamConsumer::PutStreamConfig(ISampleStreamConfig* config) {
    if (config == nullptr || config->GetMediaType() != MediaType::kVideoAvc ||
        config->GetMediaConfig() == nullptr) {
        return 1;
    }
    stream_ = static_cast<IConfigVideoAvc*>(config->GetMediaConfig());
    begin_stream(*stream_);
    return 0;
}

void StreamConsumer::PutSample(ISample* sample) {
    if (failure_) {
        return;
    }
    try {
        take_picture(*sample);
        ++pictures_;
    } catch (...) {
        failure_ = std::current_exception();
    }
}

}  // namespace zolt
