#include "support/ErrMgr.h"

#include "support/ErrnoKeeper.h"
#include "support/FormattedText.h"
#include "support/Logger.h"
#include "support/os.h"

namespace {

using Message = zolt::FormattedText<200>;

// Domains: the engine's own codes, and the operating system's.
constexpr int kDomainEngine = 0x656E6769;  // "engi"
constexpr int kDomainOs = 0x6F732020;      // "os  "

}  // namespace

zolt::HostLibrary<IErrMgr> ErrMgr::errMgr("GetErrMgr", "DeleteErrMgr");

bool ErrMgr::Load() {
    return errMgr.load();
}

void ErrMgr::Unload() {
    errMgr.unload();
}

void ErrMgr::SetEventListener(IEventListener* listener) {
    if (IErrMgr* host = errMgr.get()) {
        host->SetEventListener(listener);
    }
}

void ErrMgr::AddErr(const char* cls, const char* method, const char* extra, const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    va_list args;
    va_start(args, fmt);
    const Message message(fmt, args);
    va_end(args);
    Logger::Log(cls, method, "%s", message.text);
    if (IErrMgr* host = errMgr.get()) {
        host->AddErr(cls, method, message.text, extra);
    }
}

void ErrMgr::AddErr(int domain, int code, const char* cls, const char* method, const char* extra,
                    const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    va_list args;
    va_start(args, fmt);
    const Message message(fmt, args);
    va_end(args);
    add_coded_err(domain, code, cls, method, extra, message.text);
}

void ErrMgr::SeErr(const char* type, const char* cls, const char* method, const char* extra,
                   const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    va_list args;
    va_start(args, fmt);
    const Message message(fmt, args);
    va_end(args);
    Logger::Log(cls, method, "%s: %s", type, message.text);
    if (IErrMgr* host = errMgr.get()) {
        host->AddTypedErr(type, cls, method, message.text, extra);
    }
}

void ErrMgr::SeErr(int code, const char* cls, const char* method, const char* extra,
                   const char* fmt, ...) {
    const zolt::ErrnoKeeper keep_errno;
    va_list args;
    va_start(args, fmt);
    const Message message(fmt, args);
    va_end(args);
    add_coded_err(kDomainEngine, code, cls, method, extra, message.text);
}

void ErrMgr::OsErr(const char* cls, const char* method, const char* extra, const char* fmt, ...) {
    const int code = zolt::os_last_error();
    const zolt::ErrnoKeeper keep_errno;
    va_list args;
    va_start(args, fmt);
    const Message message(fmt, args);
    va_end(args);
    Logger::LogOsErr(code, cls, method, "%s", message.text);
    if (IErrMgr* host = errMgr.get()) {
        host->AddCodedErr(kDomainOs, code, cls, method, message.text, extra);
    }
}

IErrData* ErrMgr::GetError() {
    IErrMgr* host = errMgr.get();
    return host ? host->GetError() : nullptr;
}

IErrData* ErrMgr::GetErrorTraceRoot() {
    IErrMgr* host = errMgr.get();
    return host ? host->GetErrorTraceRoot() : nullptr;
}

int ErrMgr::GetErrorTrace(IErrData*** trace) {
    IErrMgr* host = errMgr.get();
    return host ? host->GetErrorTrace(trace) : 0;
}

char* ErrMgr::GetErrorTraceString() {
    IErrMgr* host = errMgr.get();
    return host ? host->GetErrorTraceString() : nullptr;
}

void ErrMgr::ClearErrorTrace() {
    if (IErrMgr* host = errMgr.get()) {
        host->ClearErrorTrace();
    }
}

int ErrMgr::GetErrorTraceThreadIdList(long** ids) {
    IErrMgr* host = errMgr.get();
    return host ? host->GetErrorTraceThreadIdList(ids) : 0;
}

IErrData* ErrMgr::GetErrorTraceRoot(long thread_id) {
    IErrMgr* host = errMgr.get();
    return host ? host->GetThreadErrorTraceRoot(thread_id) : nullptr;
}

int ErrMgr::GetErrorTrace(long thread_id, IErrData*** trace) {
    IErrMgr* host = errMgr.get();
    return host ? host->GetThreadErrorTrace(thread_id, trace) : 0;
}

char* ErrMgr::GetErrorTraceString(long thread_id) {
    IErrMgr* host = errMgr.get();
    return host ? host->GetThreadErrorTraceString(thread_id) : nullptr;
}

void ErrMgr::ClearErrorTrace(long thread_id) {
    if (IErrMgr* host = errMgr.get()) {
        host->ClearThreadErrorTrace(thread_id);
    }
}

int ErrMgr::GetOsLastErrorString(char* buf, int len) {
    const int code = zolt::os_last_error();
    zolt::os_error_text(code, buf, len);
    return code;
}

void ErrMgr::add_coded_err(int domain, int code, const char* cls, const char* method,
                           const char* extra, const char* message) {
    Logger::LogErr(domain, code, cls, method, "%s", message);
    if (IErrMgr* host = errMgr.get()) {
        host->AddCodedErr(domain, code, cls, method, message, extra);
    }
}
