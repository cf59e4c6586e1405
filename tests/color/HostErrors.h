#pragma once

#include <cstdlib>
#include <string>

#include "host/IErrData.h"
#include "support/ErrMgr.h"

// The error manager looks for the host's library when it is first used.
inline const int host_directory_status = setenv("STREAMING_ENGINE_LIB", ZOLT_HOST_DIRECTORY, 1);

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
