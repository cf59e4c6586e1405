#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>

#include "support/ErrnoKeeper.h"
#include "support/Util.h"

namespace {

char to_lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool is_digit(char c) {
    return c >= '0' && c <= '9';
}

bool is_space(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

bool equal_ignoring_case(const char* a, const char* b) {
    for (; to_lower(*a) == to_lower(*b); a++, b++) {
        if (*a == '\0') {
            return true;
        }
    }
    return false;
}

bool starts_ignoring_case(const char* s, const char* start) {
    for (; *start != '\0'; s++, start++) {
        if (to_lower(*s) != to_lower(*start)) {
            return false;
        }
    }
    return true;
}

enum class Number { kValid, kInvalid, kTooLarge };

// Reads decimal digits up to the end of the string. A number above `limit` is too large only when
// it is a number at all.
Number read_digits(const char* s, long long limit, long long* value) {
    if (*s == '\0') {
        return Number::kInvalid;
    }
    *value = 0;
    for (; is_digit(*s); s++) {
        *value = std::min(*value * 10 + (*s - '0'), limit + 1);
    }
    if (*s != '\0') {
        return Number::kInvalid;
    }
    return *value > limit ? Number::kTooLarge : Number::kValid;
}

char* new_string(const char* begin, size_t length) {
    char* s = new char[length + 1];
    std::memcpy(s, begin, length);
    s[length] = '\0';
    return s;
}

char* new_string(const std::string& text) {
    return new_string(text.data(), text.size());
}

void append_hex(std::string* text, unsigned char byte) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    *text += kDigits[byte >> 4];
    *text += kDigits[byte & 15];
}

void append_spaced_hex(std::string* text, const unsigned char* b, int n) {
    for (int i = 0; i < n; i++) {
        *text += ' ';
        append_hex(text, b[i]);
    }
}

}  // namespace

char* Util::StrCaseStr(char* s, const char* sub) {
    for (; !starts_ignoring_case(s, sub); s++) {
        if (*s == '\0') {
            return nullptr;
        }
    }
    return s;
}

int Util::FindStringInList(const char* s, const char* const* list, int n) {
    for (int i = 0; s != nullptr && i < n; i++) {
        if (list[i] != nullptr && equal_ignoring_case(s, list[i])) {
            return i;
        }
    }
    return -1;
}

bool Util::StringIsInList(const char* s, const char* const* list, int n) {
    return FindStringInList(s, list, n) >= 0;
}

void Util::StringToLowerCase(char* s) {
    for (; *s != '\0'; s++) {
        *s = to_lower(*s);
    }
}

int Util::StringToInt(const char* s) {
    errno = EINVAL;
    if (s == nullptr) {
        return -1;
    }
    const bool negative = *s == '-';
    if (*s == '+' || *s == '-') {
        s++;
    }
    long long magnitude = 0;
    switch (read_digits(s, negative ? -static_cast<long long>(INT_MIN) : INT_MAX, &magnitude)) {
        case Number::kInvalid:
            return -1;
        case Number::kTooLarge:
            errno = ERANGE;
            return -1;
        case Number::kValid:
            break;
    }
    errno = 0;
    return static_cast<int>(negative ? -magnitude : magnitude);
}

int Util::StringToUnsInt(const char* s) {
    long long value = 0;
    if (s == nullptr || read_digits(s, INT_MAX, &value) != Number::kValid) {
        return -1;
    }
    return static_cast<int>(value);
}

int Util::ReplaceChar(char* s, char from, char to) {
    const size_t length = std::strlen(s);
    std::replace(s, s + length, from, to);
    return static_cast<int>(length);
}

char* Util::CopyString(const char* s) {
    return s == nullptr ? nullptr : new_string(s, std::strlen(s));
}

char* Util::ExtractString(const char* begin, const char* end) {
    return new_string(begin, static_cast<size_t>(end - begin));
}

char* Util::FindNextNewLine(char* s) {
    s += std::strcspn(s, "\r\n");
    return *s == '\0' ? s : s + 1;
}

char* Util::FindNextSpace(char* s) {
    while (*s != '\0' && !is_space(*s)) {
        s++;
    }
    return s;
}

char* Util::FindNextNonSpace(char* s) {
    while (is_space(*s)) {
        s++;
    }
    return s;
}

void Util::RemoveTrailingSpace(char* s) {
    size_t length = std::strlen(s);
    while (length > 0 && is_space(s[length - 1])) {
        length--;
    }
    s[length] = '\0';
}

char* Util::ExtractToNextSep(char* s, char sep, char* out, int outLen) {
    int copied = 0;
    for (; *s != '\0' && *s != sep; s++) {
        if (copied < outLen - 1) {
            out[copied++] = *s;
        }
    }
    if (outLen > 0) {
        out[copied] = '\0';
    }
    return *s == '\0' ? nullptr : s + 1;
}

char** Util::CreateWordsList(int n, int len) {
    const auto count = static_cast<size_t>(std::max(n, 0));
    auto list = std::make_unique<char*[]>(count);
    try {
        for (size_t i = 0; i < count; i++) {
            list[i] = new char[static_cast<size_t>(std::max(len, 0)) + 1]();
        }
    } catch (...) {
        DeleteWordsList(list.release(), n);
        throw;
    }
    return list.release();
}

void Util::DeleteWordsList(char** list, int n) {
    if (list == nullptr) {
        return;
    }
    for (int i = 0; i < n; i++) {
        delete[] list[i];
    }
    delete[] list;
}

int Util::ParseString(const char* s, char** words, int maxWords, int maxLen) {
    int count = 0;
    while (count < maxWords) {
        while (is_space(*s)) {
            s++;
        }
        if (*s == '\0') {
            break;
        }
        const char quote = *s == '\'' || *s == '"' ? *s++ : '\0';
        const char* end = s;
        while (*end != '\0' && (quote != '\0' ? *end != quote : !is_space(*end))) {
            end++;
        }
        if (quote != '\0' && *end == '\0') {
            break;
        }
        const long length = std::min<long>(end - s, std::max(maxLen, 0));
        std::memcpy(words[count], s, static_cast<size_t>(length));
        words[count][length] = '\0';
        count++;
        s = quote != '\0' ? end + 1 : end;
    }
    return count;
}

int Util::HexStringToBytes(unsigned char** out, const char* hex) {
    const zolt::ErrnoKeeper keep_errno;
    const size_t length = std::strlen(hex);
    const size_t count = (length + 1) / 2;
    *out = new unsigned char[count];
    for (size_t i = 0; i < count; i++) {
        const char pair[3] = {hex[2 * i], hex[2 * i + 1], '\0'};
        unsigned value = 0;
        std::sscanf(pair, "%2x", &value);
        (*out)[i] = static_cast<unsigned char>(value);
    }
    return static_cast<int>(count);
}

char* Util::BytesToHexString(const unsigned char* b, int n) {
    std::string text;
    for (int i = 0; i < n; i++) {
        append_hex(&text, b[i]);
    }
    return new_string(text);
}

char* Util::BytesToHexString(const unsigned char* b, int n, const char* prefix, int perLine) {
    const int line_size = perLine < 1 ? std::max(n, 1) : perLine;
    std::string text;
    for (int start = 0; start < n;) {
        const int size = std::min(line_size, n - start);
        if (start > 0) {
            text += '\n';
        }
        if (prefix != nullptr) {
            text += prefix;
        }
        append_spaced_hex(&text, b + start, size);
        start += size;
    }
    return new_string(text);
}

void Util::BytesToHexString(char* out, const unsigned char* b, int n, int head, int tail) {
    head = std::max(head, 0);
    tail = std::max(tail, 0);
    std::string text;
    if (static_cast<long long>(head) + tail >= n) {
        append_spaced_hex(&text, b, n);
    } else {
        append_spaced_hex(&text, b, head);
        text += " ...";
        append_spaced_hex(&text, b + n - tail, tail);
    }
    std::memcpy(out, text.c_str(), text.size() + 1);
}
