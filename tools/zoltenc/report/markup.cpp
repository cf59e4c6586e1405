#include "zoltenc/report/markup.h"

#include <cstdarg>
#include <cstdint>
#include <cstdio>

namespace zolt {

std::string escaped(std::string_view text) {
    std::string result;
    for (const char letter : text) {
        switch (letter) {
            case '&':
                result += "&amp;";
                break;
            case '<':
                result += "&lt;";
                break;
            case '>':
                result += "&gt;";
                break;
            case '"':
                result += "&quot;";
                break;
            default:
                result += letter;
        }
    }
    return result;
}

std::string formatted(const char* format, ...) {
    char text[256];
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return text;
}

std::string data_address(const char* media_type, const std::vector<unsigned char>& file) {
    constexpr char kDigits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text = std::string("data:") + media_type + ";base64,";
    for (std::size_t i = 0; i < file.size(); i += 3) {
        const std::size_t count = file.size() - i < 3 ? file.size() - i : 3;
        std::uint32_t bits = 0;
        for (std::size_t j = 0; j < 3; ++j) {
            bits = bits << 8 | (j < count ? file[i + j] : 0U);
        }
        for (std::size_t j = 0; j < 4; ++j) {
            text += j <= count ? kDigits[bits >> (18 - 6 * j) & 63] : '=';
        }
    }
    return text;
}

}  // namespace zolt
