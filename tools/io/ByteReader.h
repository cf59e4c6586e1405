#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace zolt {

// Buffered bytes of a file or of standard input. Failures of the system are ToolErrors that name
// the file. A stop signal ends the input where it is.
class ByteReader {
public:
    enum class Line { whole, end_of_input, cut_off, too_long };

    // `file_name` "-" is standard input.
    explicit ByteReader(const std::string& file_name);
    ~ByteReader();
    ByteReader(ByteReader&& other) noexcept;
    ByteReader(const ByteReader&) = delete;
    ByteReader& operator=(const ByteReader&) = delete;

    // What to call the input in a message.
    const std::string& name() const { return name_; }

    // The next bytes without taking them: `count` of them, or fewer where the input ends. The view
    // holds until the next operation. `count` is at most kBufferSize.
    std::string_view peek(std::size_t count);

    // Takes `size` bytes; returns how many there were.
    std::size_t read(void* data, std::size_t size);

    // Takes what is there, at most `size` bytes, and waits only for the first; 0 at the end.
    std::size_t read_available(void* data, std::size_t size);

    // Takes a line of at most `max_length` characters and its line end; `line` comes without it.
    // On `too_long` the characters seen so far are in `line` and the reader stands behind them.
    Line read_line(std::string& line, std::size_t max_length);

    // Bytes from the current position to the end; nothing where that cannot be known, as on a pipe.
    std::optional<std::int64_t> bytes_left() const;

    // Ends the input where it is, also for a read that waits on another thread.
    void interrupt() { interrupted_ = true; }

    static constexpr std::size_t kBufferSize = 65536;

private:
    std::size_t read_some(unsigned char* data, std::size_t size);
    std::size_t buffered() const { return end_ - begin_; }

    std::string name_;
    int descriptor_ = -1;
    std::vector<unsigned char> buffer_;
    std::size_t begin_ = 0;  // the unread part of the buffer
    std::size_t end_ = 0;
    std::atomic<bool> interrupted_{false};
};

}  // namespace zolt
