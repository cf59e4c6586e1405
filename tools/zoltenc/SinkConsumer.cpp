#include "zoltenc/SinkConsumer.h"

#include "media/IConfigVideoAvc.h"
#include "media/ISample.h"

namespace zolt {

void SinkConsumer::begin_stream(IConfigVideoAvc& stream) {
    const unsigned char* const sps = stream.GetSeqParSetData();
    const unsigned char* const pps = stream.GetPicParSetData();
    description_.seq_par_set.assign(sps, sps + stream.GetSeqParSetSize());
    description_.pic_par_set.assign(pps, pps + stream.GetPicParSetSize());
    description_.width = stream.GetWidth();
    description_.height = stream.GetHeight();
    described_ = false;
}

void SinkConsumer::take_picture(ISample& sample) {
    if (!described_) {
        sink_.begin(description_);
        described_ = true;
    }
    const CodedPicture picture = {sample.GetSampleData(),
                                  static_cast<std::size_t>(sample.GetSampleSize()), time_,
                                  sample.SampleIsSync()};
    sink_.write(picture);
    if (listener_) {
        listener_(picture);
    }
}

}  // namespace zolt
