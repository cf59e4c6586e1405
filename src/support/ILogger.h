#pragma once

// The host's logger, as the object behind Logger. The host's compiler made its table of operations:
// their order and number are fixed, and there is no destructor among them. Every operation may be
// called from any thread.
class ILogger {
public:
    // Choose where log lines go; true on failure.
    virtual bool StartLoggingToFunc(void (*log)(char*)) = 0;
    virtual bool StartLoggingToFile(const char* file) = 0;
    virtual bool StartLoggingToStdout() = 0;
    virtual void EndLogging() = 0;

    // Choose what stands before the message of a log line.
    virtual void EnableLogTimeStamp(bool enable) = 0;
    virtual void EnableLogPidThreadId(bool enable) = 0;
    virtual void EnableLogClassMethod(bool enable) = 0;

    // Log a line; `cls` and `method` may be null.
    virtual void LogOsErr(int os_code, const char* cls, const char* method,
                          const char* message) = 0;
    virtual void LogErr(int a, int b, const char* cls, const char* method, const char* message) = 0;
    virtual void Log(const char* cls, const char* method, const char* message) = 0;

    // Which pairs (a domain code and a level or category, by the host's own meaning) are logged by
    // callers that ask first.
    virtual void Enable(int a, int b) = 0;
    virtual void Disable(int a, int b) = 0;
    virtual bool IsEnabled(int a, int b) = 0;

protected:
    ~ILogger() = default;
};
