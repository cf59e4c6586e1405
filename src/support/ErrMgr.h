#pragma once

#include "support/HostLibrary.h"
#include "support/IErrMgr.h"

// The way in which the whole system reports errors: static operations that forward to the error
// manager of the host. That is found on first use in the first library of the library directory
// (DllUtils::GetDllDir) that exports "GetErrMgr" and "DeleteErrMgr". Where there is none, reports
// are only logged (Logger), the getters return 0 or null, and the search is never repeated.
//
// Any thread may call; a call that races with Unload() is not protected. Messages are formatted as
// by printf and cut to 199 characters. cls, method and extra may be null.
class ErrMgr {
public:
    // Finds the host's error manager unless that has been done: false when there is one, true when
    // it is not available.
    static bool Load();

    // Gives a loaded error manager back to the host; the next use loads again.
    static void Unload();

    static void SetEventListener(IEventListener* listener);

    // Log an error and add it to the calling thread's trace: a plain one, or one with a domain (a
    // four-character code) and a code.
    [[gnu::format(printf, 4, 5)]] static void AddErr(const char* cls, const char* method,
                                                     const char* extra, const char* fmt, ...);
    [[gnu::format(printf, 6, 7)]] static void AddErr(int domain, int code, const char* cls,
                                                     const char* method, const char* extra,
                                                     const char* fmt, ...);

    // The same for an error with a type text, and for an error code of the domain "engi".
    [[gnu::format(printf, 5, 6)]] static void SeErr(const char* type, const char* cls,
                                                    const char* method, const char* extra,
                                                    const char* fmt, ...);
    [[gnu::format(printf, 5, 6)]] static void SeErr(int code, const char* cls, const char* method,
                                                    const char* extra, const char* fmt, ...);

    // The same with the operating system's last error code (errno), in the domain "os  ".
    [[gnu::format(printf, 4, 5)]] static void OsErr(const char* cls, const char* method,
                                                    const char* extra, const char* fmt, ...);

    // The errors kept by the host, see IErrMgr. Records belong to the host; arrays and strings
    // belong to the caller.
    static IErrData* GetError();
    static IErrData* GetErrorTraceRoot();
    static int GetErrorTrace(IErrData*** trace);
    static char* GetErrorTraceString();
    static void ClearErrorTrace();
    static int GetErrorTraceThreadIdList(long** ids);
    static IErrData* GetErrorTraceRoot(long thread_id);
    static int GetErrorTrace(long thread_id, IErrData*** trace);
    static char* GetErrorTraceString(long thread_id);
    static void ClearErrorTrace(long thread_id);

    // Copies the system's text for the last error code into `buf` (at most len - 1 characters and
    // a terminating 0; "Unknown WIN32 error" for a code without a text) and returns the code.
    static int GetOsLastErrorString(char* buf, int len);

private:
    static void add_coded_err(int domain, int code, const char* cls, const char* method,
                              const char* extra, const char* message);

    static zolt::HostLibrary<IErrMgr> errMgr;
};
