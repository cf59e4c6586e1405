#include "session/HostServices.h"

#include <memory>

#include "host/IErrData.h"
#include "io/os.h"
#include "support/IErrMgr.h"
#include "support/dl.h"
#include "support/os.h"

namespace zolt {
namespace {

constexpr const char* kDirectoryVariable = "STREAMING_ENGINE_LIB";

}  // namespace

bool HostServices::are_in(const std::string& directory) {
    return os_is_regular_file((directory + ZOLT_HOST_LIBRARY).c_str());
}

void HostServices::announce() const {
    if (os_environment(kDirectoryVariable).empty()) {
        os_set_environment(kDirectoryVariable, directory_.c_str());
    }
}

std::string HostServices::take_error() const {
    // The encoder library loads the host's library with the first error that it reports. When it
    // has not loaded this one, there is nothing to ask.
    const std::unique_ptr<void, int (*)(void*)> library(
        os_loaded_library(directory_ + ZOLT_HOST_LIBRARY), dlclose);
    if (!library) {
        return "";
    }
    const auto get_err_mgr = reinterpret_cast<IErrMgr* (*)()>(dlsym(library.get(), "GetErrMgr"));
    const auto delete_err_mgr = reinterpret_cast<void (*)()>(dlsym(library.get(), "DeleteErrMgr"));
    IErrMgr* const manager = get_err_mgr();
    const IErrData* const error = manager->GetError();
    std::string message = error == nullptr ? "" : error->Message();
    manager->ClearErrorTrace();
    delete_err_mgr();
    return message;
}

}  // namespace zolt
