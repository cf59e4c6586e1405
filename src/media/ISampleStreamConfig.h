#pragma once

class IMediaConfig;

// What a producer tells its consumer about a stream before the first sample.
class ISampleStreamConfig {
public:
    // Media type code (see MediaType).
    virtual int GetMediaType() = 0;
    // The description that belongs to the media type; owned by whoever made this object.
    virtual IMediaConfig* GetMediaConfig() = 0;
    virtual bool IsEncrypted() = 0;
    // Stores the key's address in *key and returns the key's bytes; null and 0 without a key.
    virtual int GetCryptoSessionKey(unsigned char** key) = 0;
    // Bandwidth adaptation, not used by this system.
    virtual void* GetBwAdaptConfig() = 0;

protected:
    ~ISampleStreamConfig() = default;
};
