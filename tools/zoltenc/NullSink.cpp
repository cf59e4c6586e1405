#include "zoltenc/NullSink.h"

#include "io/annex_b.h"

namespace zolt {

void NullSink::begin(const StreamDescription& stream) {
    bytes_ += static_cast<std::int64_t>(2 * sizeof kStartCode + stream.seq_par_set.size() +
                                        stream.pic_par_set.size());
}

void NullSink::write(const CodedPicture& picture) {
    bytes_ += static_cast<std::int64_t>(sizeof kStartCode + picture.size);
}

}  // namespace zolt
