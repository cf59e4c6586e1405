#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "avc/SequenceParameterSet.h"

namespace zolt {

// Gives IDR pictures that follow one another different values of idr_pic_id (clause 7.4.3) also
// where their encoder has begun anew in between and counts from 0 again.
class IdrNumbers {
public:
    // Takes the next picture's slice NAL unit, the only one of its picture, and the sequence
    // parameter set that it refers to; writes the slice anew where its value is the one of the IDR
    // picture right before it. Slices that cannot be read stay as they are.
    void pass(std::vector<unsigned char>& nal, const SequenceParameterSet& set);

private:
    std::optional<std::uint64_t> last_;  // of the last picture; nothing: it was no IDR picture
};

}  // namespace zolt
