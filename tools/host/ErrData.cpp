#include "host/ErrData.h"

#include "host/log_text.h"

namespace zolt {

ErrData::ErrData(int error_domain, int error_code, const char* type_text, const char* class_name,
                 const char* method_name, const char* message_text, const char* extra_text)
    : domain(error_domain),
      code(error_code),
      type(copy(type_text)),
      cls(copy(class_name)),
      method(copy(method_name)),
      message(message_text == nullptr ? "" : message_text),
      extra(copy(extra_text)) {}

std::string ErrData::to_string() const {
    std::string text = origin_text(ClassName(), MethodName());
    if (type) {
        text += *type + ": ";
    }
    text += message;
    if (extra) {
        text += " (" + *extra + ")";
    }
    if (domain != 0 || code != 0) {
        text += " " + code_text(domain, code);
    }
    return text;
}

ErrData::Text ErrData::copy(const char* text) {
    return text == nullptr ? Text() : Text(text);
}

}  // namespace zolt
