#pragma once

#include <optional>
#include <string>

#include "io/FrameRate.h"

namespace zolt {

// What the command line of avcdump asks for.
struct Options {
    enum class Format { table, json, csv };

    std::string input;
    FrameRate frame_rate;
    Format format = Format::table;
    bool verbose = false;

    // Nothing when the command line asked for help or the version, which has then been printed.
    // Throws UsageError.
    static std::optional<Options> parse(int argc, const char* const* argv);
};

}  // namespace zolt
