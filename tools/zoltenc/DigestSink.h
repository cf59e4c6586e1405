#pragma once

#include "io/OutputFile.h"
#include "zoltenc/NullSink.h"
#include "zoltenc/StreamDigest.h"

namespace zolt {

// Writes the stream's digest, as a line of text, in place of the stream.
class DigestSink : public NullSink {
public:
    explicit DigestSink(const std::string& file_name) : file_(file_name) {}

    const std::string& name() const override { return file_.name(); }
    const OutputFile* file() const override { return &file_; }
    void begin(const StreamDescription& stream) override;
    void write(const CodedPicture& picture) override;
    void commit() override;

private:
    OutputFile file_;
    StreamDigest digest_;
};

}  // namespace zolt
