#include "zoltenc/HostServices.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>

namespace zolt {
namespace {

constexpr const char* kDirectoryVariable = "STREAMING_ENGINE_LIB";

}  // namespace

std::filesystem::path HostServices::directory() {
    return std::filesystem::read_symlink("/proc/self/exe").parent_path();
}

void HostServices::announce() {
    setenv(kDirectoryVariable, directory().c_str(), 0);
}

std::string HostServices::last_error() {
    return "";
}

void HostServices::divert_library_output(bool visible) {
    if (visible) {
        dup2(STDERR_FILENO, STDOUT_FILENO);
        return;
    }
    const int nowhere = open("/dev/null", O_WRONLY);
    if (nowhere >= 0) {
        dup2(nowhere, STDOUT_FILENO);
        close(nowhere);
    }
}

}  // namespace zolt
