#pragma once

#include "media/IMediaConfig.h"

// Description of a video stream.
class IConfigVideo : public IMediaConfig {
public:
    // Picture size in luma samples.
    virtual int GetWidth() = 0;
    virtual int GetHeight() = 0;
    // Frames per second; 0.0 where it is not known.
    virtual double GetFrameRate() = 0;

protected:
    ~IConfigVideo() = default;
};
