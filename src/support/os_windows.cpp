#include <windows.h>

#include <process.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "support/ErrnoKeeper.h"
#include "support/os.h"
#include "support/windows_names.h"

namespace zolt {
namespace {

bool get_attributes(const char* path, WIN32_FILE_ATTRIBUTE_DATA* attributes) {
    std::wstring utf16;
    return to_utf16(path, &utf16) &&
           GetFileAttributesExW(utf16.c_str(), GetFileExInfoStandard, attributes);
}

std::string system_message(int code) {
    wchar_t message[512];
    const DWORD length =
        FormatMessageW(FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS, nullptr,
                       static_cast<DWORD>(code), 0, message, 512, nullptr);
    // The message ends in a line break.
    message[std::max<DWORD>(length, 2) - 2] = L'\0';
    std::string utf8;
    return to_utf8(message, &utf8) ? utf8 : "";
}

}  // namespace

int os_last_error() {
    return static_cast<int>(GetLastError());
}

void os_set_last_error(int code) {
    SetLastError(static_cast<DWORD>(code));
}

void os_error_text(int code, char* text, int size) {
    if (size < 1) {
        return;
    }
    const ErrnoKeeper keep_errno;
    std::string message = system_message(code);
    if (message.empty()) {
        message = "Unknown WIN32 error";
    }
    size_t length = std::min(message.size(), static_cast<size_t>(size) - 1);
    // A cut must not leave a part of a character.
    while ((message[length] & 0xc0) == 0x80) {
        --length;
    }
    std::memcpy(text, message.c_str(), length);
    text[length] = '\0';
}

long os_process_id() {
    return static_cast<long>(GetCurrentProcessId());
}

std::string os_environment(const char* name) {
    const ErrnoKeeper keep_errno;
    std::wstring utf16;
    std::string value;
    if (!to_utf16(name, &utf16)) {
        return value;
    }
    // The size that is needed, the terminating 0 included; 0 for a variable that is not set.
    const DWORD size = GetEnvironmentVariableW(utf16.c_str(), nullptr, 0);
    std::wstring text(size, L'\0');
    if (size == 0 || GetEnvironmentVariableW(utf16.c_str(), text.data(), size) >= size ||
        !to_utf8(text.c_str(), &value)) {
        value.clear();
    }
    return value;
}

void os_set_environment(const char* name, const char* value) {
    const ErrnoKeeper keep_errno;
    std::wstring utf16;
    if (to_utf16((std::string(name) + "=" + value).c_str(), &utf16)) {
        // Sets the variable of the C runtime, for those who read it with getenv, and with it that
        // of the process.
        _wputenv(utf16.c_str());
    }
}

std::FILE* os_open_file(const char* path, const char* mode) {
    std::wstring utf16_path;
    std::wstring utf16_mode;
    if (!to_utf16(path, &utf16_path) || !to_utf16(mode, &utf16_mode)) {
        errno = EILSEQ;
        return nullptr;
    }
    return _wfopen(utf16_path.c_str(), utf16_mode.c_str());
}

bool os_is_regular_file(const char* path) {
    WIN32_FILE_ATTRIBUTE_DATA attributes;
    constexpr DWORD kOther = FILE_ATTRIBUTE_DIRECTORY | FILE_ATTRIBUTE_DEVICE;
    return get_attributes(path, &attributes) && (attributes.dwFileAttributes & kOther) == 0;
}

bool os_is_directory(const char* path) {
    WIN32_FILE_ATTRIBUTE_DATA attributes;
    return get_attributes(path, &attributes) &&
           (attributes.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

long long os_file_size(const char* path) {
    WIN32_FILE_ATTRIBUTE_DATA attributes;
    if (!get_attributes(path, &attributes) ||
        (attributes.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0) {
        return -1;
    }
    return static_cast<long long>(attributes.nFileSizeHigh) << 32 | attributes.nFileSizeLow;
}

void os_sleep(int msecs) {
    Sleep(static_cast<DWORD>(msecs));
}

}  // namespace zolt
