#pragma once

#include <cstddef>
#include <string>

#include "io/Md5.h"
#include "io/PictureSink.h"

namespace zolt {

// The MD5 digest of the Annex B stream that an AnnexBSink would write.
class StreamDigest {
public:
    void add(const StreamDescription& stream);
    void add(const CodedPicture& picture);
    std::string hex() const { return md5_.hex(); }

private:
    void add_nal(const unsigned char* nal, std::size_t size);

    Md5 md5_;
};

}  // namespace zolt
