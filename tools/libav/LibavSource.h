#pragma once

#include <optional>
#include <string>

#include "io/ByteReader.h"
#include "io/FrameSource.h"
#include "io/PictureClock.h"
#include "libav/FrameConverter.h"
#include "libav/LibavInput.h"

namespace zolt {

// The pictures of the first video stream of anything that FFmpeg's libraries read and decode.
class LibavSource : public FrameSource {
public:
    // As LibavInput has it. Decodes the first picture; throws a ToolError when there is none.
    LibavSource(const std::string& input, bool with_side_streams);
    LibavSource(ByteReader bytes, bool with_side_streams);

    std::string name() const override { return input_.name(); }
    PictureFormat format() const override { return converter_->format(); }
    std::optional<FrameRate> frame_rate() const override { return frame_rate_; }
    VideoTraits traits() const override { return traits_; }
    std::optional<TimeBase> time_base() const override;
    PictureTime time() const override { return time_; }
    SideStreams* side_streams() override { return input_.side_streams(); }
    std::string remark() const override;
    std::string closing_remark() const override;
    std::optional<std::int64_t> frames_left() const override;
    bool read(std::vector<unsigned char>& sample) override;
    void interrupt() override { input_.interrupt(); }

private:
    void begin();
    void open_decoder();
    bool decode();
    bool feed();
    void look_at_first_frame();

    LibavInput input_;
    LibavPtr<AVCodecContext> decoder_;
    LibavPtr<AVPacket> packet_;
    LibavPtr<AVFrame> frame_;
    bool has_frame_ = false;  // one is decoded and not handed out yet
    bool is_input_over_ = false;
    std::optional<FrameConverter> converter_;
    std::optional<PictureClock> clock_;

    std::optional<FrameRate> frame_rate_;
    VideoTraits traits_;
    PictureTime time_;
    bool is_interlaced_ = false;
    std::int64_t frames_read_ = 0;
    std::int64_t undecodable_ = 0;
    std::string other_size_;  // of the first picture that is not like the first one
};

}  // namespace zolt
