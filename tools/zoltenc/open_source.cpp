#include "zoltenc/open_source.h"

#include <optional>
#include <utility>

#include "io/PaddedSource.h"
#include "io/RawReader.h"
#include "io/SyntheticSource.h"
#include "io/ToolError.h"
#include "io/Y4mReader.h"
#include "io/read_ahead.h"
#include "zoltenc/libav_input.h"
#include "zoltenc/open_sink.h"

namespace zolt {
namespace {

std::unique_ptr<FrameSource> open_input(const Options& options) {
    if (SyntheticSource::recognises(options.input)) {
        return std::make_unique<SyntheticSource>(SyntheticSource::parse(options.input));
    }
    if (names_address(options.input)) {
        return open_libav_source(options, std::nullopt);
    }
    ByteReader input(options.input);
    if (input.peek(1).empty()) {
        throw TruncatedInput(input.name() +
                             ": is empty; Y4M, another video or raw pictures are "
                             "needed");
    }
    if (Y4mReader::recognises(input)) {
        return std::make_unique<Y4mReader>(std::move(input));
    }
    if (options.raw_format) {
        return std::make_unique<RawReader>(std::move(input), *options.raw_format);
    }
    // A file is opened again, to be read in any order; what a pipe gave is there only once.
    if (input.bytes_left() && options.input != "-") {
        return open_libav_source(options, std::nullopt);
    }
    return open_libav_source(options, std::move(input));
}

// Pictures are padded where the output tells players what to show of them.
Fit chosen_fit(const Options& options) {
    const bool tells_size = writes_container(options) && !options.plain_headers;
    return options.fit.value_or(tells_size ? Fit::pad : Fit::crop);
}

std::unique_ptr<FrameSource> fitted(std::unique_ptr<FrameSource> source, Fit fit) {
    const PictureFormat format = source->format();
    if (fit == Fit::crop || (format.width == PictureFormat::rounded_up(format.width) &&
                             format.height == PictureFormat::rounded_up(format.height))) {
        return source;
    }
    if (fit == Fit::scale) {
        return scale_to_fit(std::move(source));
    }
    return std::make_unique<PaddedSource>(std::move(source));
}

}  // namespace

std::unique_ptr<FrameSource> open_source(const Options& options) {
    std::unique_ptr<FrameSource> source = fitted(open_input(options), chosen_fit(options));
    // What has no known end may be live, and is not to wait in a queue.
    const int waiting = source->frames_left() ? 3 : 1;
    return read_ahead(std::move(source), waiting);
}

}  // namespace zolt
