#pragma once

#include <memory>
#include <utility>

#include "io/PictureSink.h"

namespace zolt {

// A sink before another one; as it is, it passes everything on.
class SinkDecorator : public PictureSink {
public:
    explicit SinkDecorator(std::unique_ptr<PictureSink> next) : next_(std::move(next)) {}

    const std::string& name() const override { return next_->name(); }
    const OutputFile* file() const override { return next_->file(); }
    std::string remark() const override { return next_->remark(); }
    void begin(const StreamDescription& stream) override { next_->begin(stream); }
    void write(const CodedPicture& picture) override { next_->write(picture); }
    std::int64_t bytes() const override { return next_->bytes(); }
    void commit() override { next_->commit(); }

private:
    std::unique_ptr<PictureSink> next_;
};

}  // namespace zolt
