#pragma once

// Directory listing: the system's own opendir, readdir, closedir and rewinddir, or on Windows
// functions of these names.

#ifdef _WIN32

struct DIR;

constexpr unsigned char DT_DIR = 4;
constexpr unsigned char DT_REG = 8;

struct dirent {
    // DT_DIR for a directory, DT_REG for anything else.
    unsigned char d_type;
    // UTF-8: up to three bytes for each of a name's 259 UTF-16 units.
    char d_name[3 * 260];
};

// A listing of the directory of that name (UTF-8), which closedir releases. Null with errno
// ENOTDIR, EACCES or ENOENT when it cannot be listed; ENOENT for null and for a name that is not
// UTF-8 too.
DIR* opendir(const char* path);

// The next entry, valid until the next call; null at the end. Names that are not UTF-16 are left
// out: no name in UTF-8 would lead to them. Null with errno EBADF for null.
dirent* readdir(DIR* listing);

// 0; -1 with errno EBADF for null.
int closedir(DIR* listing);

// Goes back to the first entry. Sets errno to EBADF for null.
void rewinddir(DIR* listing);

#else

#include <dirent.h>

#endif
