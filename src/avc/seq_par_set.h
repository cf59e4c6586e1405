#pragma once

struct VideoAvcSeqParSet;

namespace zolt {

// Reads a sequence parameter set NAL unit (clause 7.3.2.1.1), header byte first, up to
// frame_mbs_only_flag. Returns false when it is cut off before that; the fields that are missing
// are then 0.
bool read_seq_par_set(const unsigned char* nal, int size, VideoAvcSeqParSet& set);

}  // namespace zolt
