#pragma once

#include <cerrno>

#include "support/os.h"

namespace zolt {

// Puts errno and the system's last error back to what they were when the scope was entered, for
// operations that call the system on their way but do not report through these.
class ErrnoKeeper {
public:
    ErrnoKeeper() : saved_os(os_last_error()), saved(errno) {}
    ~ErrnoKeeper() {
        errno = saved;
        os_set_last_error(saved_os);
    }
    ErrnoKeeper(const ErrnoKeeper&) = delete;
    ErrnoKeeper& operator=(const ErrnoKeeper&) = delete;

private:
    const int saved_os;
    const int saved;
};

}  // namespace zolt
