#include "zoltenc/DigestSink.h"

namespace zolt {

void DigestSink::begin(const StreamDescription& stream) {
    digest_.add(stream);
    NullSink::begin(stream);
}

void DigestSink::write(const CodedPicture& picture) {
    digest_.add(picture);
    NullSink::write(picture);
}

void DigestSink::commit() {
    const std::string line = digest_.hex() + "\n";
    file_.write(line.data(), line.size());
    file_.commit();
}

}  // namespace zolt
