#pragma once

#include <optional>
#include <string>

#include "host/IErrData.h"

namespace zolt {

// A reported error with copies of its texts.
class ErrData final : public IErrData {
public:
    // Every text may be null.
    ErrData(int error_domain, int error_code, const char* type_text, const char* class_name,
            const char* method_name, const char* message_text, const char* extra_text);

    const char* ClassName() const override { return pointer(cls); }
    const char* MethodName() const override { return pointer(method); }
    const char* Message() const override { return message.c_str(); }
    const char* Extra() const override { return pointer(extra); }
    const char* Type() const override { return pointer(type); }
    int Domain() const override { return domain; }
    int Code() const override { return code; }

    // The error in one line: class, method, type, message, extra, domain and code, as far as they
    // are there.
    std::string to_string() const;

private:
    using Text = std::optional<std::string>;

    static Text copy(const char* text);
    static const char* pointer(const Text& text) { return text ? text->c_str() : nullptr; }

    int domain;
    int code;
    Text type;
    Text cls;
    Text method;
    std::string message;
    Text extra;
};

}  // namespace zolt
