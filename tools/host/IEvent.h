#pragma once

#include "host/IErrData.h"

// The event that the error manager sends to its listener: an error has been reported. The event and
// its record are valid during the notification.
class IEvent {
public:
    virtual IErrData* GetError() const = 0;

protected:
    ~IEvent() = default;
};
