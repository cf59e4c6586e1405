#pragma once

#include <atomic>
#include <deque>
#include <map>
#include <memory>

#include "host/ErrData.h"
#include "media/IEventListener.h"
#include "support/IErrMgr.h"
#include "support/SimpleMutex.h"

namespace zolt {

// The error manager of the host's library: keeps a trace of errors for every thread that reports
// (host.h says how long records live; the trace of a thread that has ended stays until it is
// cleared by its id) and notifies one listener of each, on the reporting thread. Safe to call from
// any thread. A listener that is replaced may still get a notification that is on its way.
class HostErrMgr final : public IErrMgr {
public:
    void SetEventListener(IEventListener* new_listener) override;

    void AddCodedErr(int domain, int code, const char* cls, const char* method, const char* message,
                     const char* extra) override;
    void AddTypedErr(const char* type, const char* cls, const char* method, const char* message,
                     const char* extra) override;
    void AddErr(const char* cls, const char* method, const char* message,
                const char* extra) override;

    IErrData* GetError() override;
    IErrData* GetErrorTraceRoot() override;
    int GetErrorTrace(IErrData*** trace) override;
    char* GetErrorTraceString() override;
    void ClearErrorTrace() override;

    int GetErrorTraceThreadIdList(long** ids) override;
    IErrData* GetThreadErrorTraceRoot(long thread_id) override;
    int GetThreadErrorTrace(long thread_id, IErrData*** trace) override;
    char* GetThreadErrorTraceString(long thread_id) override;
    void ClearThreadErrorTrace(long thread_id) override;

private:
    // Oldest first, never empty.
    using Trace = std::deque<std::shared_ptr<ErrData>>;

    void add(const std::shared_ptr<ErrData>& error);

    // Null when the thread has no errors. Called with the mutex held.
    const Trace* find(long thread_id) const;

    SimpleMutex mutex;
    std::map<long, Trace> traces;
    std::atomic<IEventListener*> listener{nullptr};
};

}  // namespace zolt
