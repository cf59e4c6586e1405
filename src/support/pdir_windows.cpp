#include <windows.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <string>

#include "support/pdir.h"
#include "support/windows_names.h"

struct DIR {
    DIR() = default;
    ~DIR() { stop(); }
    DIR(const DIR&) = delete;
    DIR& operator=(const DIR&) = delete;

    bool start() {
        search = FindFirstFileW(pattern.c_str(), &found);
        first_pending = search != INVALID_HANDLE_VALUE;
        return first_pending;
    }

    void stop() {
        if (search != INVALID_HANDLE_VALUE) {
            FindClose(search);
        }
    }

    // Puts the next of what the system lists into `found`.
    bool next() {
        if (first_pending) {
            first_pending = false;
            return true;
        }
        return search != INVALID_HANDLE_VALUE && FindNextFileW(search, &found);
    }

    std::wstring pattern;
    WIN32_FIND_DATAW found{};
    HANDLE search = INVALID_HANDLE_VALUE;
    // The search began with an entry that next() has not given yet.
    bool first_pending = false;
    dirent entry{};
};

namespace zolt {

int errno_of_listing(unsigned long error) {
    switch (error) {
        case ERROR_DIRECTORY:
            return ENOTDIR;
        case ERROR_ACCESS_DENIED:
            return EACCES;
        default:
            return ENOENT;
    }
}

}  // namespace zolt

DIR* opendir(const char* path) {
    auto listing = std::make_unique<DIR>();
    if (path == nullptr || !zolt::to_utf16(path, &listing->pattern)) {
        errno = ENOENT;
        return nullptr;
    }
    std::wstring& pattern = listing->pattern;
    const bool ends_in_separator =
        !pattern.empty() && (pattern.back() == L'/' || pattern.back() == L'\\');
    pattern += ends_in_separator ? L"*" : L"/*";
    if (!listing->start()) {
        errno = zolt::errno_of_listing(GetLastError());
        return nullptr;
    }
    return listing.release();
}

dirent* readdir(DIR* listing) {
    if (listing == nullptr) {
        errno = EBADF;
        return nullptr;
    }
    std::string name;
    while (listing->next()) {
        if (!zolt::to_utf8(listing->found.cFileName, &name)) {
            continue;
        }
        const bool is_directory = listing->found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY;
        listing->entry.d_type = is_directory ? DT_DIR : DT_REG;
        std::memcpy(listing->entry.d_name, name.c_str(), name.size() + 1);
        return &listing->entry;
    }
    return nullptr;
}

int closedir(DIR* listing) {
    if (listing == nullptr) {
        errno = EBADF;
        return -1;
    }
    delete listing;
    return 0;
}

void rewinddir(DIR* listing) {
    if (listing == nullptr) {
        errno = EBADF;
        return;
    }
    listing->stop();
    listing->start();
}
