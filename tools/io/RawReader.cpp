#include "io/RawReader.h"

#include <utility>

#include "io/ToolError.h"

namespace zolt {

RawReader::RawReader(ByteReader input, const PictureFormat& format)
    : input_(std::move(input)), format_(format) {}

std::optional<std::int64_t> RawReader::frames_left() const {
    const auto bytes = input_.bytes_left();
    if (!bytes) {
        return std::nullopt;
    }
    return *bytes / static_cast<std::int64_t>(format_.file_bytes());
}

bool RawReader::read(std::vector<unsigned char>& sample) {
    const std::size_t got = format_.read(input_, sample.data());
    if (got == 0) {
        return false;
    }
    if (got < format_.file_bytes()) {
        throw TruncatedInput(name() + ": picture " + std::to_string(frames_read_) +
                             " is cut off: " + std::to_string(got) + " of its " +
                             std::to_string(format_.file_bytes()) +
                             " bytes are there; do size and format (-s, -f) fit the input?");
    }
    ++frames_read_;
    return true;
}

}  // namespace zolt
