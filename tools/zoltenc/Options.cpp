#include "zoltenc/Options.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cctype>
#include <iostream>
#include <limits>
#include <utility>

#include "io/SyntheticSource.h"
#include "io/ToolError.h"
#include "io/numbers.h"
#include "zoltenc/libav_input.h"
#include "zoltenc/open_probe.h"

namespace zolt {
namespace {

constexpr const char* kDemonstrationOutput = "out.264";
constexpr FrameRate kMaxFrameRate{1000, 1};
constexpr int kMaxCount = std::numeric_limits<std::int32_t>::max();

// Refuses what is not a whole number of `low`..`high`.
CLI::Validator whole_number(int low, int high) {
    const std::string range = "a whole number from " + std::to_string(low) +
                              (high == kMaxCount ? "" : " to " + std::to_string(high));
    return CLI::Validator(
        [=](std::string& text) -> std::string {
            const auto number = parse_number(text);
            const bool fits = number && *number >= low && *number <= high;
            return fits ? "" : "'" + text + "' is not " + range;
        },
        "");
}

FrameRate parse_frame_rate(const std::string& text) {
    const auto rate = FrameRate::parse(text);
    if (!rate || rate->per_second() > kMaxFrameRate.per_second()) {
        throw UsageError("--fps: '" + text +
                         "' is not a frame rate above 0 and up to 1000, such as 25, 29.97 or "
                         "30000/1001");
    }
    return *rate;
}

PictureFormat parse_raw_format(const std::string& size, const std::string& fourcc_text) {
    PictureFormat format;
    const std::size_t cross = size.find('x');
    const auto width = parse_number(size.substr(0, cross));
    const auto height =
        cross == std::string::npos ? std::nullopt : parse_number(size.substr(cross + 1));
    if (!width || !height) {
        throw UsageError("--size: '" + size + "' is not WIDTHxHEIGHT, such as 176x144");
    }
    const std::string error = PictureFormat::size_error(*width, *height);
    if (!error.empty()) {
        throw UsageError("--size: " + error);
    }
    format.width = *width;
    format.height = *height;
    if (!fourcc_text.empty()) {
        const auto code = PictureFormat::parse_fourcc(fourcc_text);
        if (!code) {
            throw UsageError("--format: '" + fourcc_text +
                             "' is not one of IYUV YUY2 AYUV BGRA RGBA ARGB 'BGR ' 'RGB '");
        }
        format.fourcc_code = *code;
    }
    return format;
}

Fit parse_fit(const std::string& text) {
    if (text == "crop") {
        return Fit::crop;
    }
    if (text == "pad") {
        return Fit::pad;
    }
    if (text == "scale") {
        return Fit::scale;
    }
    throw UsageError("--fit: '" + text + "' is not one of crop, pad, scale");
}

// Options whose values are read after the whole line, since they depend on each other.
struct OptionTexts {
    std::string container;
    std::string fps;
    std::string size;
    std::string format;
    std::string fit;
};

void add_report_options(CLI::App& app, Options& options) {
    app.add_flag("--match-rate", options.match_rate,
                 "Code the input up to four times, until the average is within 3 % of --bitrate");
    app.add_flag("--psnr", options.psnr, "Measure PSNR and SSIM of the decoded output");
    app.add_option("--stats", options.stats, "Write a CSV file with one row per picture")
        ->type_name("FILE");
    app.add_option("--report", options.report, "Write a page with plots and pictures of the run")
        ->type_name("FILE.html");
    app.add_flag("--json", options.json, "Tell of the run in JSON, one object a line");
}

// What these options need of each other and of the build.
void check_report_options(const CLI::App& app, const Options& options) {
    for (const auto& [name, file] :
         {std::pair("--stats", options.stats), std::pair("--report", options.report)}) {
        if (file.empty() && app.count(name) > 0) {
            throw UsageError(std::string(name) + ": an output needs a file name");
        }
        if (file == "-") {
            throw UsageError(std::string(name) + ": standard output is not taken: name a file");
        }
    }
    if (options.psnr && !has_probe()) {
        throw UsageError(
            "--psnr: this zoltenc was built without libavcodec, which decodes the "
            "output; build it where libavcodec-dev is installed");
    }
    if (!options.match_rate) {
        return;
    }
    if (options.bit_rate_kbs == 0) {
        throw UsageError("--match-rate: there is no rate to match: -b must be from 1 to " +
                         std::to_string(Options::kMaxBitRateKbs));
    }
    if (options.input == "-") {
        throw UsageError("--match-rate: standard input cannot be read again: name a file");
    }
}

void add_output_options(CLI::App& app, Options& options, OptionTexts& texts) {
    app.add_option("-o,--output", options.output,
                   "File to write, whose ending tells the format; '-' for an elementary stream on "
                   "standard output; or an address (--list-formats)")
        ->type_name("FILE");
    app.add_option("--container", texts.container,
                   "Format whatever the name: " + OutputFormat::names())
        ->type_name("NAME");
    CLI::Option* const plain = app.add_flag("--plain-headers", options.plain_headers,
                                            "Keep the encoder's parameter sets in a container");
    app.add_flag("--rewrite-headers", options.rewrite_headers,
                 "Write parameter sets for players in an elementary stream too")
        ->excludes(plain);
    app.add_flag_callback(
        "--no-copy", [&options] { options.copy_streams = false; },
        "Leave out the input's audio and subtitles, which a container takes over");
    app.add_flag("--realtime", options.realtime, "Code pictures at their times, like a camera");
    app.add_option("--verify", options.verify,
                   "Fail unless the elementary stream has this digest (--container md5)")
        ->type_name("DIGEST");
}

// Gives the digest its lower-case form.
void check_digest(std::string& digest) {
    constexpr std::size_t kDigits = 32;
    std::transform(digest.begin(), digest.end(), digest.begin(),
                   [](unsigned char digit) { return static_cast<char>(std::tolower(digit)); });
    if (digest.size() != kDigits ||
        digest.find_first_not_of("0123456789abcdef") != std::string::npos) {
        throw UsageError("--verify: '" + digest +
                         "' is not a digest of 32 hexadecimal digits as --container md5 gives it");
    }
}

// Completes what the line says of the output.
void choose_output(Options& options, const std::string& container, bool has_input) {
    options.output_format = container.empty() ? nullptr : OutputFormat::named(container);
    const bool writes_nothing =
        options.output_format != nullptr && options.output_format->kind == OutputFormat::Kind::null;
    if (writes_nothing && !options.output.empty()) {
        throw UsageError("--container null: writes nothing; leave out -o " + options.output);
    }
    if (options.output.empty() && options.output_format != nullptr) {
        options.output = options.output_format->output_without_name();
    }
    if (options.output.empty()) {
        if (has_input) {
            throw UsageError("-o is missing: name the file to write, or '-' for standard output");
        }
        options.output = kDemonstrationOutput;
        options.demonstration = true;
    }
    if (options.output_format == nullptr) {
        options.output_format = &OutputFormat::of(options.output);
    }
    options.output_format->check_address(options.output);
}

void add_input_options(CLI::App& app, OptionTexts& texts) {
    app.add_option("--fit", texts.fit,
                   "How pictures get sides that are multiples of 16: crop (their middle), pad "
                   "(repeat the edges; players show the input's size) or scale; otherwise pad in "
                   "containers and crop elsewhere")
        ->type_name("HOW");
    app.add_flag("--list-formats", "List what can be read and written, and leave");
}

// One entry after the other, in the order of the help text.
void add_options(CLI::App& app, Options& options, OptionTexts& texts) {
    app.set_version_flag("--version", "zoltenc " ZOLT_VERSION);
    app.add_option("INPUT", options.input,
                   "Video file, device (KIND:NAME) or URL, Y4M or raw pictures, '-' for standard "
                   "input, or the built-in moving test picture synthetic[:WxH[@FPS[:FRAMES]]]")
        ->type_name("");
    add_output_options(app, options, texts);
    app.add_option(
           "-b,--bitrate", options.bit_rate_kbs,
           "Target bit rate in kbit/s, up to 4000; 0: no rate control, every picture at QP 28")
        ->check(whole_number(0, Options::kMaxBitRateKbs))
        ->type_name("KBPS")
        ->capture_default_str();
    app.add_option("-g,--keyint", options.key_frame_interval,
                   "Key-frame interval in frames, from 1")
        ->check(whole_number(1, kMaxCount))
        ->type_name("N")
        ->capture_default_str();
    app.add_option("-r,--fps", texts.fps, "Frame rate where the input states none (otherwise 30)")
        ->type_name("FPS");
    app.add_option("-s,--size", texts.size, "Picture size of raw input")->type_name("WxH");
    app.add_option("-f,--format", texts.format,
                   "Colour format of raw input: IYUV (default) YUY2 AYUV BGRA RGBA ARGB 'BGR ' "
                   "'RGB '")
        ->type_name("FOURCC");
    app.add_option("-n,--frames", options.frames, "Stop after this many frames")
        ->check(whole_number(1, kMaxCount))
        ->type_name("N");
    app.add_option("--skip", options.skip, "Leave out this many frames first")
        ->check(whole_number(0, kMaxCount))
        ->type_name("N");
    add_input_options(app, texts);
    add_report_options(app, options);
    app.add_option("--plugin", options.plugin,
                   "Encoder library (otherwise " ZOLT_ENCODER_LIBRARY " beside this program)")
        ->type_name("FILE");
    app.add_flag("--keep-partial", options.keep_partial,
                 "Keep what was written when coding fails in mid-stream");
    CLI::Option* const quiet = app.add_flag("-q,--quiet", options.quiet, "Report errors only");
    app.add_flag("-v,--verbose", options.verbose, "Say what is loaded and coded")->excludes(quiet);
}

}  // namespace

std::optional<Options> Options::parse(int argc, const char* const* argv) {
    Options options;
    OptionTexts texts;
    CLI::App app("Codes video to H.264.", "zoltenc");
    // A file's name may begin with '/' on any system.
    app.allow_windows_style_options(false);
    app.get_formatter()->column_width(34);
    add_options(app, options, texts);
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& request) {
        app.exit(request);
        return std::nullopt;
    } catch (const CLI::ParseError& error) {
        throw UsageError(std::string(error.what()) + " (zoltenc --help lists the options)");
    }

    if (app.count("--list-formats") > 0) {
        std::cout << "Input\n\n" << list_inputs() << "\nOutput\n\n" << OutputFormat::list();
        return std::nullopt;
    }
    if (options.output.empty() && app.count("--output") > 0) {
        throw UsageError("an output needs a file name");
    }
    choose_output(options, texts.container, app.count("INPUT") > 0);
    if (app.count("--verify") > 0) {
        check_digest(options.verify);
    }
    check_report_options(app, options);
    if (!texts.fps.empty()) {
        options.frame_rate = parse_frame_rate(texts.fps);
    }
    if (app.count("--fit") > 0) {
        options.fit = parse_fit(texts.fit);
    }
    if (!texts.size.empty()) {
        options.raw_format = parse_raw_format(texts.size, texts.format);
    } else if (!texts.format.empty()) {
        throw UsageError("--format: raw input needs its size too: -s WIDTHxHEIGHT");
    }
    return options;
}

}  // namespace zolt
