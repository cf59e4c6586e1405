#pragma once

// One error as the error manager keeps it. Texts that the report did not give are null, numbers 0.
// The record and its texts belong to the error manager, see host.h for how long they live.
class IErrData {
public:
    virtual const char* ClassName() const = 0;
    virtual const char* MethodName() const = 0;

    // The message: never null.
    virtual const char* Message() const = 0;

    // What the reporter added to the message.
    virtual const char* Extra() const = 0;

    // The type text of a typed error.
    virtual const char* Type() const = 0;

    // The four-character code of the error's domain and its code there, of a coded error.
    virtual int Domain() const = 0;
    virtual int Code() const = 0;

protected:
    ~IErrData() = default;
};
