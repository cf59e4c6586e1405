#pragma once

#include <string>
#include <utility>

namespace zolt {

// What an encoder library finds in its host: the directory of the host's own libraries, and in it
// the error manager to which encoders report.
class HostServices {
public:
    // The directory's name ends with its separator.
    explicit HostServices(std::string directory) : directory_(std::move(directory)) {}

    // Whether the library with the error manager is in a directory, whose name ends likewise.
    static bool are_in(const std::string& directory);

    // Names the directory in the environment as the host's, unless one is named already.
    void announce() const;

    // The last error that the calling thread's encoders reported since it was asked last; empty
    // where none did or where the error manager is not this one.
    std::string take_error() const;

private:
    std::string directory_;
};

}  // namespace zolt
