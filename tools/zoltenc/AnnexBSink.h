#pragma once

#include "io/OutputFile.h"
#include "io/PictureSink.h"

namespace zolt {

// Writes an Annex B byte stream (ITU-T H.264 clause B.1): each NAL unit behind a four-byte start
// code, the parameter sets before the first picture that uses them.
class AnnexBSink : public PictureSink {
public:
    explicit AnnexBSink(const std::string& file_name) : file_(file_name) {}

    const std::string& name() const override { return file_.name(); }
    const OutputFile* file() const override { return &file_; }
    void begin(const StreamDescription& stream) override;
    void write(const CodedPicture& picture) override;
    std::int64_t bytes() const override { return bytes_; }
    void commit() override { file_.commit(); }

private:
    void write_nal(const unsigned char* nal, std::size_t size);

    OutputFile file_;
    std::int64_t bytes_ = 0;
};

}  // namespace zolt
