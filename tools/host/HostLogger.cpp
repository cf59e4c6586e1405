#include "host/HostLogger.h"

#include <chrono>

#include "host/log_text.h"
#include "host/thread_id.h"
#include "support/MutexLock.h"
#include "support/Util.h"
#include "support/os.h"

namespace zolt {
namespace {

std::string time_text() {
    using namespace std::chrono;
    const auto now = system_clock::now().time_since_epoch();
    const long long msecs = duration_cast<milliseconds>(now).count();
    char text[32];
    std::snprintf(text, sizeof text, "[%lld.%03lld] ", msecs / 1000, msecs % 1000);
    return text;
}

std::string thread_text() {
    return "[" + std::to_string(os_process_id()) + "." + std::to_string(current_thread_id()) + "] ";
}

std::string text_or_nothing(const char* text) {
    return text == nullptr ? "" : text;
}

}  // namespace

bool HostLogger::StartLoggingToFunc(void (*log)(char*)) {
    if (log == nullptr) {
        return true;
    }
    const MutexLock lock(mutex);
    function = log;
    file.reset();
    to_stdout = false;
    return false;
}

bool HostLogger::StartLoggingToFile(const char* file_name) {
    File opened(file_name == nullptr ? nullptr : Util::Win32FileOpen(file_name, "a"), std::fclose);
    if (!opened) {
        return true;
    }
    const MutexLock lock(mutex);
    function = nullptr;
    file = std::move(opened);
    to_stdout = false;
    return false;
}

bool HostLogger::StartLoggingToStdout() {
    const MutexLock lock(mutex);
    function = nullptr;
    file.reset();
    to_stdout = true;
    return false;
}

void HostLogger::EndLogging() {
    const MutexLock lock(mutex);
    function = nullptr;
    file.reset();
    to_stdout = false;
}

void HostLogger::EnableLogTimeStamp(bool enable) {
    const MutexLock lock(mutex);
    with_time = enable;
}

void HostLogger::EnableLogPidThreadId(bool enable) {
    const MutexLock lock(mutex);
    with_thread = enable;
}

void HostLogger::EnableLogClassMethod(bool enable) {
    const MutexLock lock(mutex);
    with_origin = enable;
}

void HostLogger::LogOsErr(int os_code, const char* cls, const char* method, const char* message) {
    char system_text[200];
    os_error_text(os_code, system_text, sizeof system_text);
    log_line(cls, method,
             text_or_nothing(message) + " (" + system_text + ", " + std::to_string(os_code) + ")");
}

void HostLogger::LogErr(int a, int b, const char* cls, const char* method, const char* message) {
    log_line(cls, method, text_or_nothing(message) + " " + code_text(a, b));
}

void HostLogger::Log(const char* cls, const char* method, const char* message) {
    log_line(cls, method, text_or_nothing(message));
}

void HostLogger::Enable(int a, int b) {
    const MutexLock lock(mutex);
    enabled.emplace(a, b);
}

void HostLogger::Disable(int a, int b) {
    const MutexLock lock(mutex);
    enabled.erase({a, b});
}

bool HostLogger::IsEnabled(int a, int b) {
    const MutexLock lock(mutex);
    return enabled.count({a, b}) != 0;
}

void HostLogger::log_line(const char* cls, const char* method, const std::string& message) {
    void (*receiver)(char*) = nullptr;
    std::string line;
    {
        const MutexLock lock(mutex);
        line = (with_time ? time_text() : "") + (with_thread ? thread_text() : "") +
               (with_origin ? origin_text(cls, method) : "") + message;
        receiver = function;
        if (std::FILE* stream = to_stdout ? stdout : file.get()) {
            std::fprintf(stream, "%s\n", line.c_str());
            std::fflush(stream);
        }
    }
    // Without the lock, so that the function may use the logger.
    if (receiver != nullptr) {
        receiver(line.data());
    }
}

}  // namespace zolt
