#pragma once

#include <string>

#include "host/IErrData.h"
#include "support/ErrMgr.h"
#include "support/os.h"

// The error manager looks for the host's library when it is first used.
inline const bool host_directory_is_set =
    (zolt::os_set_environment("STREAMING_ENGINE_LIB", ZOLT_HOST_DIRECTORY), true);

// The errors that the calling thread has reported since the last call, oldest first, each as
// "Class.Method: message" with a line break; "(no host)" when nothing can be reported at all.
inline std::string take_errors() {
    if (ErrMgr::Load()) {
        return "(no host)";
    }
    IErrData** trace = nullptr;
    const int count = ErrMgr::GetErrorTrace(&trace);
    std::string errors;
    for (int i = 0; i < count; ++i) {
        errors += std::string(trace[i]->ClassName()) + "." + trace[i]->MethodName() + ": " +
                  trace[i]->Message() + "\n";
    }
    delete[] trace;
    ErrMgr::ClearErrorTrace();
    return errors;
}
