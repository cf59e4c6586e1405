#include "media/MediaStreamConfig.h"

#include <algorithm>

#include "support/Util.h"

MediaStreamConfig::MediaStreamConfig(int type, IMediaConfig* config)
    : MediaStreamConfig(type, config, false) {}

MediaStreamConfig::MediaStreamConfig(int type, IMediaConfig* config, bool isEncrypted)
    : mediaType(type), mediaConfig(config), encrypted(isEncrypted), cryptoSessionKeyLength(0) {}

MediaStreamConfig::MediaStreamConfig(int type, IMediaConfig* config, unsigned char* key, int length)
    : MediaStreamConfig(type, config, key != nullptr) {
    if (key != nullptr) {
        cryptoSessionKeyLength = std::max(length, 0);
        cryptoSessionKey.reset(Util::CopyArrayByte(key, cryptoSessionKeyLength));
    }
}

int MediaStreamConfig::GetCryptoSessionKey(unsigned char** key) {
    *key = cryptoSessionKey.get();
    return cryptoSessionKeyLength;
}
