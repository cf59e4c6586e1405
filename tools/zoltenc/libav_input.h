#pragma once

#include <memory>
#include <optional>
#include <string>

#include "io/ByteReader.h"
#include "io/FrameSource.h"
#include "zoltenc/Options.h"

// What FFmpeg's libraries do for the input. A build without them has functions of the same names
// that throw a ToolError, which says what is missing.
namespace zolt {

// Whether `input` is a URL or a device rather than a file.
bool names_address(const std::string& input);

// The pictures of a file, a device or a URL that is no Y4M: those of `bytes` if given, otherwise
// what the options name.
std::unique_ptr<FrameSource> open_libav_source(const Options& options,
                                               std::optional<ByteReader> bytes);

// The pictures scaled to the nearest size that the encoder codes as it is.
std::unique_ptr<FrameSource> scale_to_fit(std::unique_ptr<FrameSource> source);

// What can be read, as lines of text.
std::string list_inputs();

}  // namespace zolt
