#include "zoltenc/StreamDigest.h"

#include "io/annex_b.h"

namespace zolt {

void StreamDigest::add(const StreamDescription& stream) {
    add_nal(stream.seq_par_set.data(), stream.seq_par_set.size());
    add_nal(stream.pic_par_set.data(), stream.pic_par_set.size());
}

void StreamDigest::add(const CodedPicture& picture) {
    add_nal(picture.nal, picture.size);
}

void StreamDigest::add_nal(const unsigned char* nal, std::size_t size) {
    md5_.add(kStartCode, sizeof kStartCode);
    md5_.add(nal, size);
}

}  // namespace zolt
