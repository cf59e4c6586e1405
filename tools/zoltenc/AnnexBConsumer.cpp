#include "zoltenc/AnnexBConsumer.h"

#include <exception>
#include <utility>

#include "io/ToolError.h"
#include "media/IConfigVideoAvc.h"
#include "media/ISample.h"
#include "media/ISampleStreamConfig.h"
#include "media/MediaType.h"

namespace zolt {
namespace {

constexpr unsigned char kStartCode[] = {0, 0, 0, 1};

}  // namespace

void AnnexBConsumer::check() {
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
}

void AnnexBConsumer::Notify(IEvent*) {}

int AnnexBConsumer::PutStreamConfig(ISampleStreamConfig* config) {
    if (config == nullptr || config->GetMediaType() != MediaType::kVideoAvc ||
        config->GetMediaConfig() == nullptr) {
        return 1;
    }
    stream_ = static_cast<IConfigVideoAvc*>(config->GetMediaConfig());
    const unsigned char* const sps = stream_->GetSeqParSetData();
    const unsigned char* const pps = stream_->GetPicParSetData();
    seq_par_set_.assign(sps, sps + stream_->GetSeqParSetSize());
    pic_par_set_.assign(pps, pps + stream_->GetPicParSetSize());
    parameter_sets_written_ = false;
    return 0;
}

void AnnexBConsumer::PutSample(ISample* sample) {
    if (failure_) {
        return;
    }
    try {
        if (!parameter_sets_written_) {
            write_nal(seq_par_set_.data(), seq_par_set_.size());
            write_nal(pic_par_set_.data(), pic_par_set_.size());
            parameter_sets_written_ = true;
        }
        const unsigned char* const nal = sample->GetSampleData();
        const auto size = static_cast<std::size_t>(sample->GetSampleSize());
        write_nal(nal, size);
        ++pictures_;
        if (listener_) {
            listener_(nal, size, sample->GetSampleTime());
        }
    } catch (...) {
        failure_ = std::current_exception();
    }
}

void AnnexBConsumer::write_nal(const unsigned char* nal, std::size_t size) {
    output_.write(kStartCode, sizeof kStartCode);
    output_.write(nal, size);
    bytes_ += static_cast<std::int64_t>(sizeof kStartCode + size);
}

}  // namespace zolt
