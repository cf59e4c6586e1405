#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"

namespace zolt {

// What the command line asks for.
struct Options {
    // The largest bit rate of level 2.2, Main profile (ITU-T H.264 Table A-1).
    static constexpr int kMaxBitRateKbs = 4000;

    std::string input = "synthetic";  // a file, "-" or "synthetic..."
    std::string output;               // a file or "-"
    bool demonstration = false;       // no input was named: the test picture goes to out.264

    int bit_rate_kbs = 200;  // 0: no rate control
    int key_frame_interval = 30;
    std::optional<FrameRate> frame_rate;      // for an input that states none
    std::optional<PictureFormat> raw_format;  // of raw input, when its size was given
    std::optional<std::int64_t> frames;       // most frames to code
    std::int64_t skip = 0;                    // frames to leave out first

    std::string stats;   // CSV file, empty for none
    std::string report;  // HTML file, empty for none
    bool psnr = false;   // measure the quality
    bool json = false;   // tell programs of the run
    bool match_rate = false;
    std::string plugin;  // shared library, empty for the one beside the program
    bool keep_partial = false;
    bool quiet = false;
    bool verbose = false;

    // Reads the command line. Prints help or version on standard output and gives nothing when the
    // line asks for that. Throws a UsageError when it is wrong.
    static std::optional<Options> parse(int argc, const char* const* argv);
};

}  // namespace zolt
