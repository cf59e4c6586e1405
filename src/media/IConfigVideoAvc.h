#pragma once

#include "media/IConfigVideo.h"

// Description of an AVC video stream (media type avc1). Parameter sets are bare NAL units: header
// byte and payload with emulation prevention, no start code or length prefix. The bytes belong to
// the described object.
class IConfigVideoAvc : public IConfigVideo {
public:
    virtual unsigned char* GetSeqParSetData() = 0;
    virtual int GetSeqParSetSize() = 0;
    virtual unsigned char* GetPicParSetData() = 0;
    virtual int GetPicParSetSize() = 0;

protected:
    ~IConfigVideoAvc() = default;
};
