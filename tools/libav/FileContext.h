#pragma once

#include <cstdint>
#include <exception>
#include <functional>

#include "io/OutputFile.h"
#include "libav/libav.h"

namespace zolt {

// An OutputFile as libavformat writes to it. What goes wrong with the file does not travel through
// the library, which knows no exceptions: `check` throws it.
class FileContext {
public:
    // `file` is the caller's and outlives the context.
    explicit FileContext(OutputFile& file);
    ~FileContext();
    FileContext(const FileContext&) = delete;
    FileContext& operator=(const FileContext&) = delete;

    // Owned by this object; seekable where the file is.
    AVIOContext* get() const { return context_; }

    // Throws the first failure of the file, if there was one.
    void check();

private:
    static int write(void* self, std::uint8_t* data, int size);
    static std::int64_t seek(void* self, std::int64_t offset, int whence);
    bool try_file(const std::function<void()>& operation);

    OutputFile& file_;
    std::int64_t position_ = 0;
    std::int64_t size_ = 0;
    std::exception_ptr failure_;
    AVIOContext* context_ = nullptr;
};

}  // namespace zolt
