#pragma once

#include "io/PictureSink.h"

namespace zolt {

// Counts bytes and keeps none, to see how fast coding is.
class NullSink : public PictureSink {
public:
    const std::string& name() const override { return name_; }
    const OutputFile* file() const override { return nullptr; }
    void begin(const StreamDescription& stream) override;
    void write(const CodedPicture& picture) override;
    std::int64_t bytes() const override { return bytes_; }
    void commit() override {}

private:
    std::string name_ = "null";
    std::int64_t bytes_ = 0;
};

}  // namespace zolt
