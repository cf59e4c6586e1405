#pragma once

#include <string>
#include <utility>

#include "zoltenc/SinkDecorator.h"
#include "zoltenc/StreamDigest.h"

namespace zolt {

// Lets a stream of the right digest appear and no other.
class VerifiedSink : public SinkDecorator {
public:
    // `digest`: what StreamDigest::hex is to give.
    VerifiedSink(std::unique_ptr<PictureSink> next, std::string digest)
        : SinkDecorator(std::move(next)), expected_(std::move(digest)) {}

    void begin(const StreamDescription& stream) override;
    void write(const CodedPicture& picture) override;
    // Throws a ToolError that names both digests where they differ.
    void commit() override;

private:
    std::string expected_;
    StreamDigest digest_;
};

}  // namespace zolt
