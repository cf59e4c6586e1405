#pragma once

class IErrData;
class IEventListener;

// The host's error manager, as the object behind ErrMgr. The host's compiler made its table of
// operations: their order and number are fixed, and there is no destructor among them. Errors are
// kept per thread, so every operation may be called from any thread.
class IErrMgr {
public:
    virtual void SetEventListener(IEventListener* listener) = 0;

    // Adds an error to the calling thread's trace. Domains are four-character codes; `cls`,
    // `method` and `extra` may be null. The host copies the texts.
    virtual void AddCodedErr(int domain, int code, const char* cls, const char* method,
                             const char* message, const char* extra) = 0;
    virtual void AddTypedErr(const char* type, const char* cls, const char* method,
                             const char* message, const char* extra) = 0;
    virtual void AddErr(const char* cls, const char* method, const char* message,
                        const char* extra) = 0;

    // The calling thread's errors: the current (latest) one, the first one, all of them (a count
    // and a new array), all of them as a new text.
    virtual IErrData* GetError() = 0;
    virtual IErrData* GetErrorTraceRoot() = 0;
    virtual int GetErrorTrace(IErrData*** trace) = 0;
    virtual char* GetErrorTraceString() = 0;
    virtual void ClearErrorTrace() = 0;

    // The ids of the threads that have errors (a count and a new array), and the same operations
    // for the thread of a given id. They have names of their own because a compiler may put
    // overloads side by side in the table.
    virtual int GetErrorTraceThreadIdList(long** ids) = 0;
    virtual IErrData* GetThreadErrorTraceRoot(long thread_id) = 0;
    virtual int GetThreadErrorTrace(long thread_id, IErrData*** trace) = 0;
    virtual char* GetThreadErrorTraceString(long thread_id) = 0;
    virtual void ClearThreadErrorTrace(long thread_id) = 0;

protected:
    ~IErrMgr() = default;
};
