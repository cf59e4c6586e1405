#include "zoltenc/open_sink.h"

#include <algorithm>
#include <iterator>

#include "zoltenc/AnnexBSink.h"

namespace zolt {
namespace {

constexpr const char* kContainerEndings[] = {".mp4", ".mov", ".mkv", ".flv", ".ts"};

}  // namespace

bool writes_container(const Options& options) {
    const std::size_t dot = options.output.rfind('.');
    const std::string ending = dot == std::string::npos ? "" : options.output.substr(dot);
    return std::find(std::begin(kContainerEndings), std::end(kContainerEndings), ending) !=
           std::end(kContainerEndings);
}

std::unique_ptr<PictureSink> open_sink(const Options& options) {
    return std::make_unique<AnnexBSink>(options.output);
}

}  // namespace zolt
