#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "io/OutputFile.h"
#include "media/ISampleConsumer.h"

class IConfigVideoAvc;

namespace zolt {

// Writes an encoder's samples as an Annex B byte stream (ITU-T H.264 clause B.1): each NAL unit
// behind a four-byte start code, the parameter sets before the first picture that uses them.
//
// A failed write must not unwind through the encoder, so it is kept and thrown by `check`.
class AnnexBConsumer : public ISampleConsumer {
public:
    // Is told of every coded picture after it was written; the bytes are a bare NAL unit.
    using PictureListener =
        std::function<void(const unsigned char* nal, std::size_t size, std::int64_t time)>;

    explicit AnnexBConsumer(OutputFile& output) : output_(output) {}

    void set_picture_listener(PictureListener listener) { listener_ = std::move(listener); }

    // Of the encoder that feeds this consumer; null until its stream configuration came.
    IConfigVideoAvc* stream() const { return stream_; }
    std::int64_t pictures() const { return pictures_; }
    std::int64_t bytes() const { return bytes_; }

    // Throws what went wrong since the last call.
    void check();

    void Notify(IEvent* event) override;
    int PutStreamConfig(ISampleStreamConfig* config) override;
    void PutSample(ISample* sample) override;
    void EndOfSamples() override {}

private:
    void write_nal(const unsigned char* nal, std::size_t size);

    OutputFile& output_;
    PictureListener listener_;
    IConfigVideoAvc* stream_ = nullptr;
    std::vector<unsigned char> seq_par_set_;  // as of the last stream configuration
    std::vector<unsigned char> pic_par_set_;
    bool parameter_sets_written_ = false;
    std::int64_t pictures_ = 0;
    std::int64_t bytes_ = 0;
    std::exception_ptr failure_;
};

}  // namespace zolt
