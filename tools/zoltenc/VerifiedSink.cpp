#include "zoltenc/VerifiedSink.h"

#include "io/ToolError.h"

namespace zolt {

void VerifiedSink::begin(const StreamDescription& stream) {
    digest_.add(stream);
    SinkDecorator::begin(stream);
}

void VerifiedSink::write(const CodedPicture& picture) {
    digest_.add(picture);
    SinkDecorator::write(picture);
}

void VerifiedSink::commit() {
    const std::string found = digest_.hex();
    if (found != expected_) {
        throw ToolError(name() + ": the stream has the digest " + found + ", not " + expected_ +
                        " as --verify demands");
    }
    SinkDecorator::commit();
}

}  // namespace zolt
