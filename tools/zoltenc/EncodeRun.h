#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "io/FrameSource.h"
#include "io/PictureSink.h"
#include "zoltenc/Options.h"
#include "zoltenc/Progress.h"
#include "zoltenc/RunRecorder.h"
#include "zoltenc/RunSummary.h"
#include "zoltenc/SinkConsumer.h"

namespace zolt {

class EncoderLibrary;
class EncoderSession;
class JsonLines;

// One run over the input: reads pictures, has them coded and writes the stream, reporting on
// standard error.
class EncodeRun {
public:
    // One of several runs over the same input, of which one is left.
    struct Pass {
        int number = 1;
        int most = 1;
        int bit_rate_kbs = 0;  // what the encoder is asked for
    };

    // Opens input and outputs; `options` and `json` (null for none) outlive the run. Throws a
    // ToolError when that fails.
    EncodeRun(const Options& options, JsonLines* json)
        : EncodeRun(options, json, {1, 1, options.bit_rate_kbs}) {}
    EncodeRun(const Options& options, JsonLines* json, const Pass& pass);

    // Codes the input and leaves the outputs.
    void run();

    // The two halves of `run`. The first codes the input up to its end, the number of frames asked
    // for or a stop signal. Throws a ToolError when that fails; the outputs are then as they were
    // before, unless the options say that what is coded is kept. The second leaves the outputs and
    // sums up; it throws a ToolError when the input was cut off within a picture. `runs` have been
    // made until this one was chosen.
    void encode();
    void finish(int runs);

    // Throws a UsageError unless there can be another run over the input, and the output left out.
    void require_repeatable() const;

    // Of a run that is through.
    const RunSummary& summary() const { return summary_; }

    // Tells the user something, unless that is not wanted.
    void note(const std::string& text) const;

private:
    void check_outputs() const;
    void skip_frames();
    void choose_frame_rate();
    void describe_input();
    std::optional<std::int64_t> expected_frames() const;
    void describe(const EncoderLibrary& library) const;
    void begin_summary(const EncoderLibrary& library);
    void encode_all(EncoderSession& session, Progress& progress);
    bool read_picture(std::vector<unsigned char>& picture);
    PictureTime picture_time(std::int64_t frame);
    void sum_up(const Progress& progress, const char* exit);
    void commit();
    void tell_summary() const;
    void first_note(const std::string& text) const;

    const Options& options_;
    JsonLines* json_;
    Pass pass_;
    std::unique_ptr<FrameSource> source_;
    FrameRate frame_rate_;
    TimeBase time_base_;
    std::int64_t time_offset_ = 0;  // what the input's own times lose, in ticks
    std::unique_ptr<PictureSink> sink_;
    RunRecorder recorder_;
    SinkConsumer consumer_;
    std::string cut_;  // how the input is cut off within a picture; empty when it is not
    RunSummary summary_;
};

}  // namespace zolt
