#include "zoltenc/open_sink.h"

#include <utility>

#include "io/ToolError.h"
#include "zoltenc/AnnexBSink.h"
#include "zoltenc/DigestSink.h"
#include "zoltenc/NullSink.h"
#include "zoltenc/PlayerHeadersSink.h"
#include "zoltenc/VerifiedSink.h"
#ifdef ZOLT_LIBAV
#include "libav/ContainerSink.h"
#endif

namespace zolt {
namespace {

using Kind = OutputFormat::Kind;

std::unique_ptr<PictureSink> open_container([[maybe_unused]] const Options& options,
                                            [[maybe_unused]] FrameSource& source) {
#ifdef ZOLT_LIBAV
    libav_prepare(options.verbose);
    ContainerSink::Settings settings;
    settings.muxer = options.output_format->muxer;
    settings.is_live = OutputFormat::is_address(options.output);
    settings.needs_seeking = options.output_format->needs_seeking;
    settings.ends_early = options.frames.has_value();
    return std::make_unique<ContainerSink>(options.output, settings, source.traits(),
                                           options.copy_streams ? source.side_streams() : nullptr);
#else
    throw ToolError(options.output + ": this build of zoltenc lacks libavformat and writes no " +
                    options.output_format->name + "; name it .264, or build with Debian's " +
                    "libavformat-dev, libavcodec-dev, libavdevice-dev and libswscale-dev");
#endif
}

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

std::unique_ptr<PictureSink> open_sink(const Options& options, FrameSource& source) {
    std::unique_ptr<PictureSink> sink = open_output(options, source);
    const bool is_container = options.output_format->kind == Kind::container;
    if (is_container && !options.plain_headers && !options.rewrite_headers) {
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
