#pragma once

#include <memory>

#include "media/ISampleStreamConfig.h"
#include "media/abi.h"

// Description of a stream: media type, the object that describes it (borrowed), and the key of an
// encrypted stream (an own copy).
class MediaStreamConfig : public ISampleStreamConfig {
public:
    MediaStreamConfig(int type, IMediaConfig* config);
    MediaStreamConfig(int type, IMediaConfig* config, bool isEncrypted);
    // Encrypted when `key` is not null; copies its `length` bytes.
    MediaStreamConfig(int type, IMediaConfig* config, unsigned char* key, int length);

    int GetMediaType() override { return mediaType; }
    IMediaConfig* GetMediaConfig() override { return mediaConfig; }
    bool IsEncrypted() override { return encrypted; }
    int GetCryptoSessionKey(unsigned char** key) override;
    void* GetBwAdaptConfig() override { return nullptr; }

    ZOLT_DESTRUCTOR(MediaStreamConfig) = default;

private:
    int mediaType;
    IMediaConfig* mediaConfig;  // borrowed
    bool encrypted;
    std::unique_ptr<unsigned char[]> cryptoSessionKey;
    int cryptoSessionKeyLength;
};
