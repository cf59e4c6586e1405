#include "zoltenc/AnnexBSink.h"

#include "io/annex_b.h"

namespace zolt {

void AnnexBSink::begin(const StreamDescription& stream) {
    write_nal(stream.seq_par_set.data(), stream.seq_par_set.size());
    write_nal(stream.pic_par_set.data(), stream.pic_par_set.size());
}

void AnnexBSink::write(const CodedPicture& picture) {
    write_nal(picture.nal, picture.size);
}

void AnnexBSink::write_nal(const unsigned char* nal, std::size_t size) {
    file_.write(kStartCode, sizeof kStartCode);
    file_.write(nal, size);
    bytes_ += static_cast<std::int64_t>(sizeof kStartCode + size);
}

}  // namespace zolt
