#pragma once

#include <array>
#include <cstdint>
#include <optional>

#include "avc/PictureParameterSet.h"
#include "avc/SequenceParameterSet.h"

namespace zolt {

// The parameter sets of a stream as they stand at some unit: the last one of each identifier.
class ParameterSets {
public:
    // Take a parameter set NAL unit, header byte first. One that is cut off or has values that the
    // standard does not allow is left out, and whatever had its identifier stays.
    void add_seq_par_set(const unsigned char* nal, int size);
    void add_pic_par_set(const unsigned char* nal, int size);

    // Null when there is none of that identifier.
    const SequenceParameterSet* seq_par_set(std::uint64_t id) const;
    const PictureParameterSet* pic_par_set(std::uint64_t id) const;

private:
    std::array<std::optional<SequenceParameterSet>, 32> seq_par_sets_;
    std::array<std::optional<PictureParameterSet>, 256> pic_par_sets_;
};

}  // namespace zolt
