#include "libav/FileContext.h"

#include <algorithm>
#include <cstdio>
#include <new>
#include <utility>

extern "C" {
#include <libavutil/mem.h>
}

namespace zolt {

FileContext::FileContext(OutputFile& file) : file_(file) {
    constexpr int kBufferBytes = 1 << 16;
    auto* const buffer = static_cast<unsigned char*>(av_malloc(kBufferBytes));
    const bool is_seekable = !file.temporary_name().empty();
    context_ = buffer == nullptr ? nullptr
                                 : avio_alloc_context(buffer, kBufferBytes, 1, this, nullptr, write,
                                                      is_seekable ? seek : nullptr);
    if (context_ == nullptr) {
        av_free(buffer);
        throw std::bad_alloc();
    }
}

FileContext::~FileContext() {
    av_freep(&context_->buffer);
    avio_context_free(&context_);
}

void FileContext::check() {
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
}

int FileContext::write(void* self, std::uint8_t* data, int size) {
    auto& context = *static_cast<FileContext*>(self);
    const auto bytes = static_cast<std::size_t>(size);
    if (!context.try_file([&] { context.file_.write(data, bytes); })) {
        return AVERROR(EIO);
    }
    context.position_ += size;
    context.size_ = std::max(context.size_, context.position_);
    return size;
}

std::int64_t FileContext::seek(void* self, std::int64_t offset, int whence) {
    auto& context = *static_cast<FileContext*>(self);
    if (whence == AVSEEK_SIZE) {
        return context.size_;
    }
    if ((whence & ~AVSEEK_FORCE) != SEEK_SET) {
        return AVERROR(EINVAL);
    }
    if (!context.try_file([&] { context.file_.seek(offset); })) {
        return AVERROR(EIO);
    }
    context.position_ = offset;
    return offset;
}

// False when the file has failed, now or before.
bool FileContext::try_file(const std::function<void()>& operation) {
    if (failure_) {
        return false;
    }
    try {
        operation();
    } catch (...) {
        failure_ = std::current_exception();
    }
    return !failure_;
}

}  // namespace zolt
