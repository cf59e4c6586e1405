#pragma once

#include <vector>

#include "avc/IdrNumbers.h"
#include "session/StreamConsumer.h"
#include "stream_format.h"

namespace zolt {

// Keeps the last picture that an encoder has given, and the parameter sets of its stream.
class UnitConsumer final : public StreamConsumer {
public:
    const std::vector<unsigned char>& nal() const { return nal_; }
    bool is_key() const { return is_key_; }

    // As the encoder gives them, with the size of the coded pictures.
    const ParameterSetUnits& sets() const { return sets_; }
    int width() const { return width_; }
    int height() const { return height_; }

private:
    void begin_stream(IConfigVideoAvc& stream) override;
    void take_picture(ISample& sample) override;

    std::vector<unsigned char> nal_;
    bool is_key_ = false;
    ParameterSetUnits sets_;
    SequenceParameterSet seq_par_set_;
    IdrNumbers idr_numbers_;
    int width_ = 0;
    int height_ = 0;
};

}  // namespace zolt
