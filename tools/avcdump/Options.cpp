#include "avcdump/Options.h"

#include <CLI/CLI.hpp>

#include "io/ToolError.h"

namespace zolt {

std::optional<Options> Options::parse(int argc, const char* const* argv) {
    constexpr double kMaxFrameRate = 1000;
    Options options;
    std::string fps;
    bool json = false;
    bool csv = false;

    CLI::App app("Lists the NAL units of an H.264 elementary stream (Annex B).", "avcdump");
    // A file's name may begin with '/' on any system.
    app.allow_windows_style_options(false);
    app.set_version_flag("--version", "avcdump " ZOLT_VERSION);
    app.add_option("FILE", options.input, "File to read, '-' for standard input")->required();
    app.add_option("--fps", fps,
                   "Frame rate for times and the bit rate, such as 25, 29.97 or 30000/1001 "
                   "(otherwise 30)")
        ->type_name("FPS");
    CLI::Option* const json_flag = app.add_flag("--json", json, "Write JSON");
    CLI::Option* const csv_flag =
        app.add_flag("--csv", csv, "Write comma-separated values")->excludes(json_flag);
    app.add_flag("-v,--verbose", options.verbose,
                 "Also print what the parser reads from each slice header")
        ->excludes(json_flag)
        ->excludes(csv_flag);

    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& request) {
        app.exit(request);
        return std::nullopt;
    } catch (const CLI::ParseError& error) {
        throw UsageError(std::string(error.what()) + " (avcdump --help lists the options)");
    }

    if (!fps.empty()) {
        const auto rate = FrameRate::parse(fps);
        if (!rate || rate->per_second() > kMaxFrameRate) {
            throw UsageError("--fps: '" + fps +
                             "' is not a frame rate above 0 and up to 1000, such as 25, 29.97 or "
                             "30000/1001");
        }
        options.frame_rate = *rate;
    }
    options.format = json ? Format::json : csv ? Format::csv : Format::table;
    return options;
}

}  // namespace zolt
