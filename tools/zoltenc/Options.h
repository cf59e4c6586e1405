#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "session/EncoderSession.h"
#include "zoltenc/OutputFormat.h"

namespace zolt {

// How pictures are brought to sides that are multiples of 16: their middle is coded, they are
// extended, or they are scaled.
enum class Fit { crop, pad, scale };

// What the command line asks for.
struct Options {
    static constexpr int kMaxBitRateKbs = EncoderSession::kMaxBitRateKbs;

    std::string input = "synthetic";              // a file, "-" or "synthetic..."
    std::string output;                           // a file, "-" or an address; "null" for none
    const OutputFormat* output_format = nullptr;  // never null once the line is read
    bool demonstration = false;  // no input was named: the test picture goes to out.264

    int bit_rate_kbs = 200;  // 0: no rate control
    int key_frame_interval = 30;
    std::optional<int> threads;               // to code a picture on; nothing: as many as help
    std::optional<FrameRate> frame_rate;      // for an input that states none
    std::optional<PictureFormat> raw_format;  // of raw input, when its size was given
    std::optional<std::int64_t> frames;       // most frames to code
    std::int64_t skip = 0;                    // frames to leave out first
    std::optional<Fit> fit;                   // nothing: as the output needs it

    bool plain_headers = false;    // containers keep the encoder's parameter sets
    bool rewrite_headers = false;  // elementary streams get those that players understand
    bool copy_streams = true;      // audio and subtitles of the input go to a container
    bool realtime = false;         // code pictures at their times
    std::string verify;            // digest that the stream must have, empty for any

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
