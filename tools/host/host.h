#pragma once

#include "support/IErrMgr.h"
#include "support/ILogger.h"

// The functions that the host's library (zolt_host) exports, for programs that load it and for its
// own definition. An encoder library finds it in the directory that STREAMING_ENGINE_LIB names, and
// reports to it; the program that runs the encoder loads the same file and reads what was reported:
//
//     IErrData* error = get_err_mgr()->GetError();  // host/IErrData.h; null: nothing was reported
//     ... error->ClassName(), error->MethodName(), error->Message() ...
//
// Errors are kept by thread. GetError() is the calling thread's latest error: the thread that
// called the encoder has to ask. Records live until the thread's trace is cleared or until 100
// later errors of the thread have pushed them out (the first one of a trace stays). Arrays and
// strings that the error manager returns belong to the caller, who releases them with delete[].
//
// The objects are shared by everyone who asks for them, and live until as many calls of the Delete
// function have given them back (for as long as the library stays loaded).
extern "C" {
[[gnu::visibility("default")]] IErrMgr* GetErrMgr();
[[gnu::visibility("default")]] void DeleteErrMgr();
[[gnu::visibility("default")]] ILogger* GetLogger();
[[gnu::visibility("default")]] void DeleteLogger();
}
