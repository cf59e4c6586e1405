#pragma once

#include "support/HostLibrary.h"
#include "support/ILogger.h"

// The way in which the whole system writes log lines: static operations that forward to the logger
// of the host. That is found on first use in the first library of the library directory
// (DllUtils::GetDllDir) that exports "GetLogger" and "DeleteLogger". Where there is none, nothing
// is logged, and the search is never repeated.
//
// Any thread may call; a call that races with Unload() or EndLogging() is not protected. Messages
// are formatted as by printf and cut to 7999 characters. cls and method may be null.
class Logger {
public:
    // Finds the host's logger unless that has been done: false when there is one, true when it is
    // not available.
    static bool Load();

    // Gives a loaded logger back to the host; the next use loads again.
    static void Unload();

    // Choose where log lines go; true on failure, and without a logger.
    static bool StartLoggingToFunc(void (*log)(char*));
    static bool StartLoggingToFile(const char* file);
    static bool StartLoggingToStdout();

    // Ends logging and unloads the logger.
    static void EndLogging();

    // Choose what stands before the message of a log line.
    static void EnableLogTimeStamp(bool enable);
    static void EnableLogPidThreadId(bool enable);
    static void EnableLogClassMethod(bool enable);

    [[gnu::format(printf, 4, 5)]] static void LogOsErr(int code, const char* cls,
                                                       const char* method, const char* fmt, ...);
    [[gnu::format(printf, 5, 6)]] static void LogErr(int a, int b, const char* cls,
                                                     const char* method, const char* fmt, ...);

    // Logs only when the pair is enabled.
    [[gnu::format(printf, 5, 6)]] static void Log(int a, int b, const char* cls, const char* method,
                                                  const char* fmt, ...);
    [[gnu::format(printf, 3, 4)]] static void Log(const char* cls, const char* method,
                                                  const char* fmt, ...);
    static void LogMsg(const char* cls, const char* method, const char* message);

    // Logs without class and method. A format whose first two arguments are strings would select
    // the operation above: such a line is formatted by the caller and logged with LogMsg.
    [[gnu::format(printf, 1, 2)]] static void Log(const char* fmt, ...);

    // Pairs of a domain code and a level or category, whose meaning is the host's own. False
    // without a logger.
    static void Enable(int a, int b);
    static void Disable(int a, int b);
    static bool IsEnabled(int a, int b);

private:
    static zolt::HostLibrary<ILogger> logger;
};
