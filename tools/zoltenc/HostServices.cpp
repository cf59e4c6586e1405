#include "zoltenc/HostServices.h"

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

void HostServices::announce() {
    if (os_environment(kDirectoryVariable).empty()) {
        os_set_environment(kDirectoryVariable, os_program_directory().c_str());
    }
}

std::string HostServices::last_error() {
    // The encoder library loads the host's library with the first error that it reports. When it
    // has not loaded this one, there is nothing to ask.
    const std::unique_ptr<void, int (*)(void*)> library(
        os_loaded_library(os_program_directory() + ZOLT_HOST_LIBRARY), dlclose);
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

}  // namespace zolt
