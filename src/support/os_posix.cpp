#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "support/ErrnoKeeper.h"
#include "support/os.h"

namespace zolt {

int os_last_error() {
    return errno;
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

void os_set_environment(const char* name, const char* value) {
    const ErrnoKeeper keep_errno;
    setenv(name, value, 1);
}

std::FILE* os_open_file(const char* path, const char* mode) {
    return std::fopen(path, mode);
}

}  // namespace zolt
