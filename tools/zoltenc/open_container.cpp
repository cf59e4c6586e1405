#include "zoltenc/open_container.h"

#include "libav/ContainerSink.h"

namespace zolt {

bool has_containers() {
    return true;
}

std::unique_ptr<PictureSink> open_container(const Options& options, FrameSource& source) {
    libav_prepare(options.verbose);
    ContainerSink::Settings settings;
    settings.muxer = options.output_format->muxer;
    settings.is_live = OutputFormat::is_address(options.output);
    settings.needs_seeking = options.output_format->needs_seeking;
    settings.ends_early = options.frames.has_value();
    return std::make_unique<ContainerSink>(options.output, settings, source.traits(),
                                           options.copy_streams ? source.side_streams() : nullptr);
}

}  // namespace zolt
