#pragma once

#include <string>

namespace zolt {

// What FFmpeg's libraries read here, as lines of text: containers, codecs of video, kinds of
// devices, protocols of URLs.
std::string input_formats();

}  // namespace zolt
