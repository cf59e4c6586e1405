#include "host/HostErrMgr.h"

#include <algorithm>
#include <string>
#include <utility>

#include "host/IEvent.h"
#include "host/thread_id.h"
#include "support/MutexLock.h"
#include "support/Util.h"

namespace zolt {
namespace {

// The first error and the latest 100.
constexpr size_t kMaxTraceLength = 101;

class ErrorEvent final : public IEvent {
public:
    explicit ErrorEvent(IErrData* reported) : error(reported) {}
    IErrData* GetError() const override { return error; }

private:
    IErrData* const error;
};

}  // namespace

void HostErrMgr::SetEventListener(IEventListener* new_listener) {
    listener = new_listener;
}

void HostErrMgr::AddCodedErr(int domain, int code, const char* cls, const char* method,
                             const char* message, const char* extra) {
    add(std::make_shared<ErrData>(domain, code, nullptr, cls, method, message, extra));
}

void HostErrMgr::AddTypedErr(const char* type, const char* cls, const char* method,
                             const char* message, const char* extra) {
    add(std::make_shared<ErrData>(0, 0, type, cls, method, message, extra));
}

void HostErrMgr::AddErr(const char* cls, const char* method, const char* message,
                        const char* extra) {
    add(std::make_shared<ErrData>(0, 0, nullptr, cls, method, message, extra));
}

IErrData* HostErrMgr::GetError() {
    const MutexLock lock(mutex);
    const Trace* trace = find(current_thread_id());
    return trace == nullptr ? nullptr : trace->back().get();
}

IErrData* HostErrMgr::GetErrorTraceRoot() {
    return GetThreadErrorTraceRoot(current_thread_id());
}

int HostErrMgr::GetErrorTrace(IErrData*** trace) {
    return GetThreadErrorTrace(current_thread_id(), trace);
}

char* HostErrMgr::GetErrorTraceString() {
    return GetThreadErrorTraceString(current_thread_id());
}

void HostErrMgr::ClearErrorTrace() {
    ClearThreadErrorTrace(current_thread_id());
}

int HostErrMgr::GetErrorTraceThreadIdList(long** ids) {
    const MutexLock lock(mutex);
    *ids = new long[traces.size()];
    std::transform(traces.begin(), traces.end(), *ids,
                   [](const auto& entry) { return entry.first; });
    return static_cast<int>(traces.size());
}

IErrData* HostErrMgr::GetThreadErrorTraceRoot(long thread_id) {
    const MutexLock lock(mutex);
    const Trace* trace = find(thread_id);
    return trace == nullptr ? nullptr : trace->front().get();
}

int HostErrMgr::GetThreadErrorTrace(long thread_id, IErrData*** trace) {
    const MutexLock lock(mutex);
    const Trace* errors = find(thread_id);
    if (errors == nullptr) {
        *trace = nullptr;
        return 0;
    }
    *trace = new IErrData*[errors->size()];
    std::transform(errors->begin(), errors->end(), *trace,
                   [](const auto& error) { return error.get(); });
    return static_cast<int>(errors->size());
}

char* HostErrMgr::GetThreadErrorTraceString(long thread_id) {
    const MutexLock lock(mutex);
    const Trace* errors = find(thread_id);
    if (errors == nullptr) {
        return nullptr;
    }
    std::string text;
    for (const auto& error : *errors) {
        text += error->to_string() + '\n';
    }
    return Util::CopyString(text.c_str());
}

void HostErrMgr::ClearThreadErrorTrace(long thread_id) {
    const MutexLock lock(mutex);
    traces.erase(thread_id);
}

void HostErrMgr::add(const std::shared_ptr<ErrData>& error) {
    {
        const MutexLock lock(mutex);
        Trace& trace = traces[current_thread_id()];
        trace.push_back(error);
        if (trace.size() > kMaxTraceLength) {
            trace.erase(trace.begin() + 1);
        }
    }
    // Without the lock, so that the listener may look at the trace.
    if (IEventListener* receiver = listener) {
        ErrorEvent event(error.get());
        receiver->Notify(&event);
    }
}

const HostErrMgr::Trace* HostErrMgr::find(long thread_id) const {
    const auto entry = traces.find(thread_id);
    return entry == traces.end() ? nullptr : &entry->second;
}

}  // namespace zolt
