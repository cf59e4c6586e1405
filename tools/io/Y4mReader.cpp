#include "io/Y4mReader.h"

#include <utility>

#include "io/ToolError.h"

namespace zolt {
namespace {

constexpr std::string_view kFrameMagic = "FRAME";
// Longer lines than any writer makes; comments take the most.
constexpr std::size_t kMaxLine = 4096;

Y4mHeader read_header(ByteReader& input) {
    std::string line;
    switch (input.read_line(line, kMaxLine)) {
        case ByteReader::Line::whole:
            break;
        case ByteReader::Line::end_of_input:
        case ByteReader::Line::cut_off:
            throw TruncatedInput(input.name() +
                                 ": Y4M header is cut off: the input ends before the line does");
        case ByteReader::Line::too_long:
            throw ToolError(input.name() + ": Y4M header is longer than " +
                            std::to_string(kMaxLine) + " characters");
    }
    return Y4mHeader::parse(line, input.name());
}

}  // namespace

bool Y4mReader::recognises(ByteReader& input) {
    const std::string_view start = input.peek(Y4mHeader::kMagic.size());
    return !start.empty() && start == Y4mHeader::kMagic.substr(0, start.size());
}

Y4mReader::Y4mReader(ByteReader input)
    : input_(std::move(input)),
      header_(read_header(input_)),
      format_{PictureFormat::kIyuv, header_.width, header_.height} {}

std::optional<std::int64_t> Y4mReader::frames_left() const {
    const auto bytes = input_.bytes_left();
    if (!bytes) {
        return std::nullopt;
    }
    const std::size_t frame_bytes = kFrameMagic.size() + 1 + format_.file_bytes();
    return *bytes / static_cast<std::int64_t>(frame_bytes);
}

std::string Y4mReader::remark() const {
    return header_.interlaced ? "the pictures are interlaced; they are coded as progressive ones"
                              : "";
}

bool Y4mReader::read(std::vector<unsigned char>& sample) {
    if (!read_frame_header()) {
        return false;
    }
    const std::size_t got = format_.read(input_, sample.data());
    if (got < format_.file_bytes()) {
        throw TruncatedInput(name() + ": picture " + std::to_string(frames_read_) +
                             " is cut off: " + std::to_string(got) + " of its " +
                             std::to_string(format_.file_bytes()) + " bytes are there");
    }
    ++frames_read_;
    return true;
}

// Takes the line before a picture; false at the end of the input.
bool Y4mReader::read_frame_header() {
    std::string line;
    const ByteReader::Line result = input_.read_line(line, kMaxLine);
    if (result == ByteReader::Line::end_of_input) {
        return false;
    }
    const std::string picture = "picture " + std::to_string(frames_read_);
    if (result == ByteReader::Line::cut_off &&
        line.compare(0, kFrameMagic.size(), kFrameMagic, 0, line.size()) == 0) {
        throw TruncatedInput(name() + ": " + picture +
                             " is cut off: the input ends within its FRAME line");
    }
    const bool is_frame = line.compare(0, kFrameMagic.size(), kFrameMagic) == 0 &&
                          (line.size() == kFrameMagic.size() || line[kFrameMagic.size()] == ' ');
    if (result != ByteReader::Line::whole || !is_frame) {
        throw ToolError(name() + ": " + picture +
                        " does not begin with a FRAME line; is the input damaged?");
    }
    return true;
}

}  // namespace zolt
