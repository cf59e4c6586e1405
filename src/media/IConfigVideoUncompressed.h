#pragma once

#include "media/IConfigVideo.h"

// Description of an uncompressed video stream (media type uncv).
class IConfigVideoUncompressed : public IConfigVideo {
public:
    // Colour format of the pictures, a four-character code.
    virtual int GetColorFormat() = 0;

protected:
    ~IConfigVideoUncompressed() = default;
};
