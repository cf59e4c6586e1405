#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <system_error>
#include <thread>

#include "support/ErrnoKeeper.h"
#include "support/os.h"

namespace zolt {

int os_last_error() {
    return errno;
}

void os_set_last_error(int code) {
    errno = code;
}

void os_error_text(int code, char* text, int size) {
    if (size < 1) {
        return;
    }
    const ErrnoKeeper keep_errno;
    // strerror() invents a text for codes that it does not know, so the table is asked first. Its
    // entries are constants, which makes this safe on any thread.
    const char* known = strerrordesc_np(code);
    std::snprintf(text, static_cast<size_t>(size), "%s", known ? known : "Unknown WIN32 error");
}

long os_process_id() {
    return getpid();
}

std::string os_environment(const char* name) {
    const char* value = std::getenv(name);
    return value == nullptr ? "" : value;
}

void os_set_environment(const char* name, const char* value) {
    const ErrnoKeeper keep_errno;
    setenv(name, value, 1);
}

std::FILE* os_open_file(const char* path, const char* mode) {
    return std::fopen(path, mode);
}

bool os_is_regular_file(const char* path) {
    std::error_code error;
    return std::filesystem::is_regular_file(path, error);
}

bool os_is_directory(const char* path) {
    std::error_code error;
    return std::filesystem::is_directory(path, error);
}

long long os_file_size(const char* path) {
    std::error_code error;
    const std::uintmax_t size = std::filesystem::file_size(path, error);
    return error ? -1 : static_cast<long long>(size);
}

void os_sleep(int msecs) {
    if (msecs > 0) {
        std::this_thread::sleep_for(std::chrono::milliseconds(msecs));
    } else {
        std::this_thread::yield();
    }
}

}  // namespace zolt
