#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "io/FrameSource.h"
#include "io/PictureSink.h"
#include "zoltenc/Options.h"
#include "zoltenc/PictureStats.h"
#include "zoltenc/SinkConsumer.h"

namespace zolt {

class EncoderLibrary;
class EncoderSession;
class Progress;

// One run of the program: reads pictures, has them coded and writes the stream, reporting on
// standard error.
class EncodeRun {
public:
    // Opens input and outputs; `options` outlives the run. Throws a ToolError when that fails.
    explicit EncodeRun(const Options& options);

    // Codes the input up to its end, the number of frames asked for or a stop signal. Throws a
    // ToolError when that fails; the outputs are then as they were before, unless the options or a
    // mere cut at the input's end say that what is coded is kept.
    void run();

private:
    void check_outputs() const;
    void skip_frames();
    void choose_frame_rate();
    void describe_input();
    std::optional<std::int64_t> expected_frames() const;
    void describe(const EncoderLibrary& library) const;
    void encode_all(EncoderSession& session, Progress& progress);
    bool read_picture(std::vector<unsigned char>& picture);
    PictureTime picture_time(std::int64_t frame);
    void commit();
    void note(const std::string& text) const;

    const Options& options_;
    std::unique_ptr<FrameSource> source_;
    FrameRate frame_rate_;
    TimeBase time_base_;
    std::int64_t time_offset_ = 0;  // what the input's own times lose, in ticks
    std::unique_ptr<PictureSink> sink_;
    std::optional<PictureStats> stats_;
    SinkConsumer consumer_;
    std::string cut_;  // how the input is cut off within a picture; empty when it is not
};

}  // namespace zolt
