#include "zoltenc/open_sink.h"

#include <utility>

#include "zoltenc/AnnexBSink.h"
#include "zoltenc/DigestSink.h"
#include "zoltenc/NullSink.h"
#include "zoltenc/PlayerHeadersSink.h"
#include "zoltenc/VerifiedSink.h"
#include "zoltenc/open_container.h"

namespace zolt {
namespace {

using Kind = OutputFormat::Kind;

std::unique_ptr<PictureSink> open_output(const Options& options, FrameSource& source) {
    switch (options.output_format->kind) {
        case Kind::container:
            return open_container(options, source);
        case Kind::digest:
            return std::make_unique<DigestSink>(options.output);
        case Kind::null:
            return std::make_unique<NullSink>();
        case Kind::annex_b:
            break;
    }
    return std::make_unique<AnnexBSink>(options.output);
}

}  // namespace

bool writes_container(const Options& options) {
    return options.output_format->kind == Kind::container;
}

std::unique_ptr<PictureSink> open_sink(const Options& options, FrameSource& source) {
    std::unique_ptr<PictureSink> sink = open_output(options, source);
    if (writes_container(options) && !options.plain_headers && !options.rewrite_headers) {
        sink = std::make_unique<PlayerHeadersSink>(std::move(sink));
    }
    // The digest is that of the elementary stream which the same options give, whatever holds it.
    if (!options.verify.empty()) {
        sink = std::make_unique<VerifiedSink>(std::move(sink), options.verify);
    }
    if (options.rewrite_headers) {
        sink = std::make_unique<PlayerHeadersSink>(std::move(sink));
    }
    return sink;
}

}  // namespace zolt
