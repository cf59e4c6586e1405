#include "support/Logger.h"

#include "support/ErrnoKeeper.h"
#include "support/FormattedText.h"

namespace {

using Message = zolt::FormattedText<8000>;

}  // namespace

zolt::HostLibrary<ILogger> Logger::logger("GetLogger", "DeleteLogger");

bool Logger::Load() {
    return logger.load();
}

void Logger::Unload() {
    logger.unload();
}

bool Logger::StartLoggingToFunc(void (*log)(char*)) {
    ILogger* host = logger.get();
    return host ? host->StartLoggingToFunc(log) : true;
}

bool Logger::StartLoggingToFile(const char* file) {
    ILogger* host = logger.get();
    return host ? host->StartLoggingToFile(file) : true;
}

bool Logger::StartLoggingToStdout() {
    ILogger* host = logger.get();
    return host ? host->StartLoggingToStdout() : true;
}

void Logger::EndLogging() {
    if (zolt::HostLibrary<ILogger>::has_ended()) {
        return;
    }
    if (ILogger* host = logger.get()) {
        host->EndLogging();
        logger.unload();
    }
}

void Logger::EnableLogTimeStamp(bool enable) {
    if (ILogger* host = logger.get()) {
        host->EnableLogTimeStamp(enable);
    }
}

void Logger::EnableLogPidThreadId(bool enable) {
    if (ILogger* host = logger.get()) {
        host->EnableLogPidThreadId(enable);
    }
}

void Logger::EnableLogClassMethod(bool enable) {
    if (ILogger* host = logger.get()) {
        host->EnableLogClassMethod(enable);
    }
}

void Logger::LogOsErr(int code, const char* cls, const char* method, const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    if (ILogger* host = logger.get()) {
        va_list args;
        va_start(args, fmt);
        const Message message(fmt, args);
        va_end(args);
        host->LogOsErr(code, cls, method, message.text);
    }
}

void Logger::LogErr(int a, int b, const char* cls, const char* method, const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    if (ILogger* host = logger.get()) {
        va_list args;
        va_start(args, fmt);
        const Message message(fmt, args);
        va_end(args);
        host->LogErr(a, b, cls, method, message.text);
    }
}

void Logger::Log(int a, int b, const char* cls, const char* method, const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    ILogger* host = logger.get();
    if (host && host->IsEnabled(a, b)) {
        va_list args;
        va_start(args, fmt);
        const Message message(fmt, args);
        va_end(args);
        host->LogErr(a, b, cls, method, message.text);
    }
}

void Logger::Log(const char* cls, const char* method, const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    if (ILogger* host = logger.get()) {
        va_list args;
        va_start(args, fmt);
        const Message message(fmt, args);
        va_end(args);
        host->Log(cls, method, message.text);
    }
}

void Logger::LogMsg(const char* cls, const char* method, const char* message) {
    const zolt::ErrnoKeeper keep_errno;
    if (ILogger* host = logger.get()) {
        host->Log(cls, method, message);
    }
}

void Logger::Log(const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    if (ILogger* host = logger.get()) {
        va_list args;
        va_start(args, fmt);
        const Message message(fmt, args);
        va_end(args);
        host->Log(nullptr, nullptr, message.text);
    }
}

void Logger::Enable(int a, int b) {
    if (ILogger* host = logger.get()) {
        host->Enable(a, b);
    }
}

void Logger::Disable(int a, int b) {
    if (ILogger* host = logger.get()) {
        host->Disable(a, b);
    }
}

bool Logger::IsEnabled(int a, int b) {
    ILogger* host = logger.get();
    return host ? host->IsEnabled(a, b) : false;
}
