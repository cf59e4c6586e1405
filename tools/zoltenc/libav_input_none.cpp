#include "io/ToolError.h"
#include "zoltenc/libav_input.h"

namespace zolt {
namespace {

constexpr const char* kMissing =
    "FFmpeg's libraries, which this build lacks (Debian: libavdevice-dev libavformat-dev "
    "libavcodec-dev libswscale-dev libavutil-dev; then build again)";

}  // namespace

bool names_address(const std::string& input) {
    return input.find("://") != std::string::npos;
}

std::unique_ptr<FrameSource> open_libav_source(const Options& options,
                                               std::optional<ByteReader> bytes) {
    throw ToolError((bytes ? bytes->name() : options.input) +
                    ": is not Y4M; raw pictures need -s WIDTHxHEIGHT (and -f FOURCC), anything "
                    "else " +
                    kMissing);
}

std::unique_ptr<FrameSource> scale_to_fit(std::unique_ptr<FrameSource>) {
    throw ToolError(std::string("--fit scale needs ") + kMissing);
}

std::string list_inputs() {
    return std::string("Files: Y4M, raw pictures; others need ") + kMissing + "\n";
}

}  // namespace zolt
