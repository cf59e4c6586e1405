#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace zolt {

// `text` as it is written in HTML and SVG, in quotation marks too.
std::string escaped(std::string_view text);

// Formatted as by printf; for numbers and short texts.
[[gnu::format(printf, 1, 2)]] std::string formatted(const char* format, ...);

// An address that holds the file itself (RFC 2397).
std::string data_address(const char* media_type, const std::vector<unsigned char>& file);

}  // namespace zolt
