#include "zoltenc/JsonObject.h"

#include <cmath>
#include <cstdio>

namespace zolt {
namespace {

// The length of the UTF-8 sequence that `text` begins with (RFC 3629); 0 where it is none.
std::size_t utf8_length(std::string_view text) {
    const auto byte = [text](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned first = byte(0);
    if (first < 0x80) {
        return 1;
    }
    const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    if (first < 0xC2 || first > 0xF4 || text.size() < length) {
        return 0;
    }
    // The second byte rules out overlong forms, surrogates and what lies beyond U+10FFFF.
    const unsigned low = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
    const unsigned high = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
    if (byte(1) < low || byte(1) > high) {
        return 0;
    }
    for (std::size_t i = 2; i < length; ++i) {
        if ((byte(i) & 0xC0) != 0x80) {
            return 0;
        }
    }
    return length;
}

std::string quoted(std::string_view text) {
    std::string result = "\"";
    while (!text.empty()) {
        const std::size_t length = utf8_length(text);
        const auto first = static_cast<unsigned char>(text[0]);
        if (length == 0) {
            result += "\\ufffd";
        } else if (first < 0x20 || first == 0x7F) {
            char escape[8];
            std::snprintf(escape, sizeof escape, "\\u%04x", first);
            result += escape;
        } else {
            if (first == '"' || first == '\\') {
                result += '\\';
            }
            result += text.substr(0, length);
        }
        text.remove_prefix(length == 0 ? 1 : length);
    }
    return result + "\"";
}

}  // namespace

JsonObject& JsonObject::add(const char* name, std::string_view value) {
    return add_text(name, quoted(value));
}

JsonObject& JsonObject::add(const char* name, std::int64_t value) {
    return add_text(name, std::to_string(value));
}

JsonObject& JsonObject::add(const char* name, double value) {
    if (!std::isfinite(value)) {
        return add_text(name, "\"inf\"");
    }
    char text[64];
    std::snprintf(text, sizeof text, "%.9g", value);
    return add_text(name, text);
}

JsonObject& JsonObject::add(const char* name, const JsonObject& value) {
    return add_text(name, value.text());
}

JsonObject& JsonObject::add_text(const char* name, const std::string& value) {
    members_ += (members_.empty() ? "" : ",") + quoted(name) + ":" + value;
    return *this;
}

}  // namespace zolt
