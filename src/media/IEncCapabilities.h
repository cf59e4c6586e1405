#pragma once

#include "media/abi.h"

// What an encoder can do; the operations are those of the kind of encoder.
class IEncCapabilities : private zolt::EmptyInterface<IEncCapabilities> {
protected:
    ~IEncCapabilities() = default;
};

// What a video encoder can do.
class IVideoEncCapabilities : public IEncCapabilities {
public:
    virtual bool SupportsBframes() = 0;

protected:
    ~IVideoEncCapabilities() = default;
};
