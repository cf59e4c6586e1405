#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace zolt {

// The text of a JSON object (RFC 8259), put together member by member.
class JsonObject {
public:
    // Bytes that are no UTF-8 become U+FFFD.
    JsonObject& add(const char* name, std::string_view value);
    JsonObject& add(const char* name, const char* value) {
        return add(name, std::string_view(value));
    }
    JsonObject& add(const char* name, std::int64_t value);
    JsonObject& add(const char* name, int value) {
        return add(name, static_cast<std::int64_t>(value));
    }
    // Nine digits; JSON has no infinite number, so that one is the string "inf".
    JsonObject& add(const char* name, double value);
    JsonObject& add(const char* name, const JsonObject& value);

    std::string text() const { return "{" + members_ + "}"; }

private:
    JsonObject& add_text(const char* name, const std::string& value);

    std::string members_;
};

}  // namespace zolt
