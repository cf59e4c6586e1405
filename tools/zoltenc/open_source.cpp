#include "zoltenc/open_source.h"

#include <utility>

#include "io/RawReader.h"
#include "io/SyntheticSource.h"
#include "io/ToolError.h"
#include "io/Y4mReader.h"

namespace zolt {

std::unique_ptr<FrameSource> open_source(const Options& options) {
    if (SyntheticSource::recognises(options.input)) {
        return std::make_unique<SyntheticSource>(SyntheticSource::parse(options.input));
    }
    ByteReader input(options.input);
    if (input.peek(1).empty()) {
        throw TruncatedInput(input.name() + ": is empty; Y4M or raw pictures are needed");
    }
    if (Y4mReader::recognises(input)) {
        return std::make_unique<Y4mReader>(std::move(input));
    }
    if (!options.raw_format) {
        throw ToolError(input.name() +
                        ": is not Y4M; raw pictures need -s WIDTHxHEIGHT (and -f "
                        "FOURCC), anything else a conversion to Y4M");
    }
    return std::make_unique<RawReader>(std::move(input), *options.raw_format);
}

}  // namespace zolt
