#include "io/ToolError.h"
#include "zoltenc/open_container.h"

namespace zolt {

bool has_containers() {
    return false;
}

std::unique_ptr<PictureSink> open_container(const Options& options, FrameSource&) {
    throw ToolError(options.output + ": this build of zoltenc writes no " +
                    options.output_format->name +
                    ", which needs FFmpeg's libraries (Debian: libavdevice-dev libavformat-dev "
                    "libavcodec-dev libswscale-dev); name it .264");
}

}  // namespace zolt
