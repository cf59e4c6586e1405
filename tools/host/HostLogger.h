#pragma once

#include <cstdio>
#include <memory>
#include <set>
#include <string>
#include <utility>

#include "support/ILogger.h"
#include "support/SimpleMutex.h"

namespace zolt {

// The logger of the host's library. Logs nowhere until one of the StartLogging operations says
// where; a line has the message and, unless that is disabled, class and method before it. Safe to
// call from any thread.
class HostLogger final : public ILogger {
public:
    // Lines go to one place at a time: the last one started. The function gets a line without a
    // line break, which is its own to change, and may be called from several threads at once. A
    // file is appended to. True on failure, which changes nothing.
    bool StartLoggingToFunc(void (*log)(char*)) override;
    bool StartLoggingToFile(const char* file) override;
    bool StartLoggingToStdout() override;
    void EndLogging() override;

    // "[seconds.milliseconds] " since 1970, "[process.thread] ", "Class::Method: ".
    void EnableLogTimeStamp(bool enable) override;
    void EnableLogPidThreadId(bool enable) override;
    void EnableLogClassMethod(bool enable) override;

    void LogOsErr(int os_code, const char* cls, const char* method, const char* message) override;
    void LogErr(int a, int b, const char* cls, const char* method, const char* message) override;
    void Log(const char* cls, const char* method, const char* message) override;

    // Pairs are compared as they are; none is enabled at first.
    void Enable(int a, int b) override;
    void Disable(int a, int b) override;
    bool IsEnabled(int a, int b) override;

private:
    using File = std::unique_ptr<std::FILE, int (*)(std::FILE*)>;

    void log_line(const char* cls, const char* method, const std::string& message);

    SimpleMutex mutex;
    void (*function)(char*) = nullptr;
    File file{nullptr, std::fclose};
    bool to_stdout = false;
    bool with_time = false;
    bool with_thread = false;
    bool with_origin = true;
    std::set<std::pair<int, int>> enabled;
};

}  // namespace zolt
