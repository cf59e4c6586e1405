#pragma once

#include <cerrno>

namespace zolt {

// Puts errno back to what it was when the scope was entered, for operations that call the system
// on their way but do not report through errno.
class ErrnoKeeper {
public:
    ErrnoKeeper() : saved(errno) {}
    ~ErrnoKeeper() { errno = saved; }
    ErrnoKeeper(const ErrnoKeeper&) = delete;
    ErrnoKeeper& operator=(const ErrnoKeeper&) = delete;

private:
    const int saved;
};

}  // namespace zolt
