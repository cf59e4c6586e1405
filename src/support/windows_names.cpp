#include "support/windows_names.h"

#include <windows.h>

namespace zolt {

bool to_utf16(const char* utf8, std::wstring* utf16) {
    // A length of -1: up to the terminating 0, which counts.
    const int size = MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, utf8, -1, nullptr, 0);
    if (size < 1) {
        return false;
    }
    utf16->resize(static_cast<size_t>(size));
    MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, utf8, -1, utf16->data(), size);
    utf16->pop_back();
    return true;
}

bool to_utf8(const wchar_t* utf16, std::string* utf8) {
    const int size =
        WideCharToMultiByte(CP_UTF8, WC_ERR_INVALID_CHARS, utf16, -1, nullptr, 0, nullptr, nullptr);
    if (size < 1) {
        return false;
    }
    utf8->resize(static_cast<size_t>(size));
    WideCharToMultiByte(CP_UTF8, WC_ERR_INVALID_CHARS, utf16, -1, utf8->data(), size, nullptr,
                        nullptr);
    utf8->pop_back();
    return true;
}

}  // namespace zolt
