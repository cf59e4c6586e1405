#include "zoltenc/libav_input.h"

#include <utility>

#include "libav/LibavSource.h"
#include "libav/ScaledSource.h"
#include "libav/input_formats.h"
#include "zoltenc/open_sink.h"

namespace zolt {

bool names_address(const std::string& input) {
    libav_prepare(false);
    return LibavInput::names_address(input);
}

std::unique_ptr<FrameSource> open_libav_source(const Options& options,
                                               std::optional<ByteReader> bytes) {
    libav_prepare(options.verbose);
    const bool with_side_streams = writes_container(options) && options.copy_streams;
    if (bytes) {
        return std::make_unique<LibavSource>(std::move(*bytes), with_side_streams);
    }
    return std::make_unique<LibavSource>(options.input, with_side_streams);
}

std::unique_ptr<FrameSource> scale_to_fit(std::unique_ptr<FrameSource> source) {
    return std::make_unique<ScaledSource>(std::move(source));
}

std::string list_inputs() {
    libav_prepare(false);
    return input_formats();
}

}  // namespace zolt
