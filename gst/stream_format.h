#pragma once

#include <cstddef>
#include <vector>

namespace zolt {

// How NAL units stand in the buffers: with start codes, parameter sets in front of every IDR
// picture (Annex B); or with lengths of four bytes, parameter sets in the caps.
enum class StreamFormat { byte_stream, avc };

// A stream's parameter sets, bare NAL units.
struct ParameterSetUnits {
    std::vector<unsigned char> seq_par_set;
    std::vector<unsigned char> pic_par_set;

    bool operator!=(const ParameterSetUnits& other) const {
        return seq_par_set != other.seq_par_set || pic_par_set != other.pic_par_set;
    }
};

// The AVC decoder configuration record of ISO/IEC 14496-15, clause 5.3.3.1, for a profile without
// chroma format fields.
std::vector<unsigned char> decoder_configuration(const ParameterSetUnits& sets);

// One picture's access unit. What it is made of is borrowed.
class AccessUnit {
public:
    // `sets` null: this picture is no IDR picture.
    AccessUnit(StreamFormat format, const ParameterSetUnits* sets,
               const std::vector<unsigned char>& nal)
        : format_(format), sets_(sets), nal_(nal) {}

    std::size_t bytes() const;
    // Writes so many bytes.
    void write(unsigned char* to) const;

private:
    bool has_sets() const { return format_ == StreamFormat::byte_stream && sets_ != nullptr; }

    StreamFormat format_;
    const ParameterSetUnits* sets_;
    const std::vector<unsigned char>& nal_;
};

}  // namespace zolt
