#pragma once

#include <cstdint>
#include <string>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "zoltenc/JsonObject.h"
#include "zoltenc/StreamTally.h"

namespace zolt {

// What came of a run.
struct RunSummary {
    std::string input;
    std::string output;
    std::string encoder;
    PictureFormat input_format;
    int width = 0;  // of the coded pictures
    int height = 0;
    FrameRate frame_rate;
    int key_frame_interval = 0;
    double seconds = 0;      // that coding took
    std::int64_t bytes = 0;  // of the output's pictures and parameter sets
    int target_kbs = 0;      // 0: no rate control
    int controller_kbs = 0;  // what the encoder was asked for
    int runs = 1;            // until the target was met
    std::string exit;        // "end", "stopped", "cut" (within a picture) or "failed"
    StreamTally tally;

    double frames_per_second() const { return static_cast<double>(tally.frames()) / seconds; }
    double speed() const { return tally.stream_seconds() / seconds; }

    // How far the average is from the target, in per cent.
    double deviation() const;

    // Without the name of the output.
    std::string text() const;
    std::string quality_text() const;  // empty where it was not measured
    JsonObject json() const;
};

}  // namespace zolt
