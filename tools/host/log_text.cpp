#include "host/log_text.h"

#include "support/Util.h"

namespace zolt {

std::string origin_text(const char* cls, const char* method) {
    std::string text;
    if (cls != nullptr) {
        text += cls;
    }
    if (method != nullptr) {
        text += text.empty() ? "" : "::";
        text += method;
    }
    if (!text.empty()) {
        text += ": ";
    }
    return text;
}

std::string code_text(int domain, int code) {
    char characters[5];
    std::string text = Util::FourccToString(domain, characters);
    const bool printable =
        text.size() == 4 &&
        text.find_first_not_of(
            "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789 .") ==
            std::string::npos;
    if (!printable) {
        text = std::to_string(domain);
    }
    return "[" + text + " " + std::to_string(code) + "]";
}

}  // namespace zolt
