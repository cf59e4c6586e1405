#pragma once

#include "io/ByteReader.h"
#include "io/FrameSource.h"
#include "io/Y4mHeader.h"

namespace zolt {

// The pictures of a Y4M file of 8-bit 4:2:0.
class Y4mReader : public FrameSource {
public:
    // Whether `input` begins like a Y4M file, be it cut off.
    static bool recognises(ByteReader& input);

    // Reads the stream header. Throws a ToolError when it is cut off, malformed or of another
    // format.
    explicit Y4mReader(ByteReader input);

    std::string name() const override { return input_.name(); }
    PictureFormat format() const override { return format_; }
    std::optional<FrameRate> frame_rate() const override { return header_.frame_rate; }
    std::optional<std::int64_t> frames_left() const override;
    std::string remark() const override;
    bool read(std::vector<unsigned char>& sample) override;
    void interrupt() override { input_.interrupt(); }

private:
    bool read_frame_header();

    ByteReader input_;
    Y4mHeader header_;
    PictureFormat format_;
    std::int64_t frames_read_ = 0;
};

}  // namespace zolt
