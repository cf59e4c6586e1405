#pragma once

#include <filesystem>
#include <string>

namespace zolt {

// What an encoder library finds in its host: the directory of the host's own libraries, and in it
// the error manager to which encoders report.
class HostServices {
public:
    // The directory of this program.
    static std::filesystem::path directory();

    // Names that directory in the environment as the host's, unless one is named already.
    static void announce();

    // The last error that the calling thread's encoders reported; empty where none did or where the
    // error manager is not this program's.
    static std::string last_error();

    // Keeps what encoder libraries print out of this program's standard output, which may be the
    // stream: it goes to standard error when `visible`, else nowhere.
    static void divert_library_output(bool visible);
};

}  // namespace zolt
