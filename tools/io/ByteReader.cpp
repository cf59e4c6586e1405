#include "io/ByteReader.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "io/os.h"

namespace zolt {

ByteReader::ByteReader(const std::string& file_name)
    : name_(file_name == "-" ? "standard input" : file_name), buffer_(kBufferSize) {
    if (file_name == "-") {
        descriptor_ = kStandardInput;
        return;
    }
    descriptor_ = os_open_input(file_name);
    if (descriptor_ < 0) {
        throw ToolError(name_ + ": cannot be read: " + std::strerror(errno));
    }
}

ByteReader::~ByteReader() {
    if (descriptor_ > kStandardInput) {
        os_close(descriptor_);
    }
}

ByteReader::ByteReader(ByteReader&& other) noexcept
    : name_(std::move(other.name_)),
      descriptor_(std::exchange(other.descriptor_, -1)),
      buffer_(std::move(other.buffer_)),
      begin_(std::exchange(other.begin_, 0)),
      end_(std::exchange(other.end_, 0)),
      interrupted_(other.interrupted_.load()) {}

std::string_view ByteReader::peek(std::size_t count) {
    if (buffered() < count) {
        std::memmove(buffer_.data(), buffer_.data() + begin_, buffered());
        end_ = buffered();
        begin_ = 0;
        while (end_ < count) {
            const std::size_t got = read_some(buffer_.data() + end_, buffer_.size() - end_);
            if (got == 0) {
                break;
            }
            end_ += got;
        }
    }
    return {reinterpret_cast<const char*>(buffer_.data()) + begin_, std::min(count, buffered())};
}

std::size_t ByteReader::read(void* data, std::size_t size) {
    auto* const bytes = static_cast<unsigned char*>(data);
    std::size_t taken = std::min(size, buffered());
    std::memcpy(bytes, buffer_.data() + begin_, taken);
    begin_ += taken;
    while (taken < size) {
        const std::size_t got = read_some(bytes + taken, size - taken);
        if (got == 0) {
            break;
        }
        taken += got;
    }
    return taken;
}

std::size_t ByteReader::read_available(void* data, std::size_t size) {
    if (buffered() == 0) {
        return read_some(static_cast<unsigned char*>(data), size);
    }
    return read(data, std::min(size, buffered()));
}

ByteReader::Line ByteReader::read_line(std::string& line, std::size_t max_length) {
    line.clear();
    while (true) {
        const std::string_view next = peek(1);
        if (next.empty()) {
            return line.empty() ? Line::end_of_input : Line::cut_off;
        }
        if (next[0] == '\n') {
            ++begin_;
            return Line::whole;
        }
        if (line.size() == max_length) {
            return Line::too_long;
        }
        line.push_back(next[0]);
        ++begin_;
    }
}

std::optional<std::int64_t> ByteReader::bytes_left() const {
    const std::optional<std::int64_t> unread = os_bytes_left(descriptor_);
    if (!unread) {
        return std::nullopt;
    }
    return std::max<std::int64_t>(0, *unread) + static_cast<std::int64_t>(buffered());
}

std::size_t ByteReader::read_some(unsigned char* data, std::size_t size) {
    while (StopSignal::received() == 0 && !interrupted_) {
        const std::ptrdiff_t got = os_read(descriptor_, data, size);
        if (got >= 0) {
            return static_cast<std::size_t>(got);
        }
        if (errno != EINTR) {
            throw ToolError(name_ + ": cannot be read: " + std::strerror(errno));
        }
    }
    return 0;
}

}  // namespace zolt
