#pragma once

#include <string>

namespace zolt {

// What an encoder library finds in its host: the directory of the host's own libraries, and in it
// the error manager to which encoders report.
class HostServices {
public:
    // Names the directory of this program in the environment as the host's, unless one is named
    // already.
    static void announce();

    // The last error that the calling thread's encoders reported; empty where none did or where the
    // error manager is not this program's.
    static std::string last_error();
};

}  // namespace zolt
