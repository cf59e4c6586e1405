#include "plugin/VideoH264ZoltEncDll.h"

#include "plugin/VideoH264ZoltEnc.h"

int GetEncoderType() {
    return VideoH264ZoltEnc::Type;
}

const char* GetEncoderName() {
    return VideoH264ZoltEnc::Name;
}

IMediaEncoder* GetNewEncoder() {
    return new VideoH264ZoltEnc;
}
