#pragma once

#include "media/ISampleProcessor.h"
#include "media/abi.h"

class IEncCapabilities;
class IEncRunTimeControl;
class IEncSettings;

// An encoder: raw samples in, coded samples out. The three interfaces that it hands out are parts
// of the encoder and live as long as it does; their derived kind follows from the media type.
class IMediaEncoder : public ISampleProcessor {
public:
    // Media type code of the coded stream (see MediaType).
    virtual int GetEncoderMediaType() = 0;
    virtual IEncCapabilities* GetEncCapabilities() = 0;
    virtual IEncSettings* GetEncSettings() = 0;
    virtual IEncRunTimeControl* GetEncRunTimeControl() = 0;

    ZOLT_INTERFACE_DESTRUCTOR(IMediaEncoder) = default;
};
