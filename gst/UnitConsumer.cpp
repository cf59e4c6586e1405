#include "UnitConsumer.h"

#include "avc/rbsp.h"
#include "media/IConfigVideoAvc.h"
#include "media/ISample.h"

namespace zolt {

void UnitConsumer::begin_stream(IConfigVideoAvc& stream) {
    const unsigned char* const sps = stream.GetSeqParSetData();
    const unsigned char* const pps = stream.GetPicParSetData();
    sets_.seq_par_set.assign(sps, sps + stream.GetSeqParSetSize());
    seq_par_set_ = SequenceParameterSet::read(
        rbsp_bytes(sps, stream.GetSeqParSetSize(), stream.GetSeqParSetSize()));
    sets_.pic_par_set.assign(pps, pps + stream.GetPicParSetSize());
    width_ = stream.GetWidth();
    height_ = stream.GetHeight();
}

void UnitConsumer::take_picture(ISample& sample) {
    const unsigned char* const data = sample.GetSampleData();
    nal_.assign(data, data + sample.GetSampleSize());
    idr_numbers_.pass(nal_, seq_par_set_);
    is_key_ = sample.SampleIsSync();
}

}  // namespace zolt
