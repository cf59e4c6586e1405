#include "zoltenc/HostServices.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <memory>

#include "host/IErrData.h"
#include "support/IErrMgr.h"

namespace zolt {
namespace {

constexpr const char* kDirectoryVariable = "STREAMING_ENGINE_LIB";
constexpr const char* kHostLibrary = "zolt_host.so";

}  // namespace

std::filesystem::path HostServices::directory() {
    return std::filesystem::read_symlink("/proc/self/exe").parent_path();
}

void HostServices::announce() {
    setenv(kDirectoryVariable, directory().c_str(), 0);
}

std::string HostServices::last_error() {
    // The encoder library loads the host's library with the first error that it reports. When it
    // has not loaded this one, there is nothing to ask.
    const std::unique_ptr<void, int (*)(void*)> library(
        dlopen((directory() / kHostLibrary).c_str(), RTLD_NOW | RTLD_NOLOAD), dlclose);
    if (!library) {
        return "";
    }
    const auto get_err_mgr = reinterpret_cast<IErrMgr* (*)()>(dlsym(library.get(), "GetErrMgr"));
    const auto delete_err_mgr = reinterpret_cast<void (*)()>(dlsym(library.get(), "DeleteErrMgr"));
    const IErrData* const error = get_err_mgr()->GetError();
    std::string message = error == nullptr ? "" : error->Message();
    delete_err_mgr();
    return message;
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
