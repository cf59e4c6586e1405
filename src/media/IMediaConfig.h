#pragma once

#include "media/abi.h"

// Common base of the objects that describe a stream. It has no operations: the stream's media type
// says which derived interface the object is.
class IMediaConfig : private zolt::EmptyInterface<IMediaConfig> {
protected:
    ~IMediaConfig() = default;
};
