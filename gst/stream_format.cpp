#include "stream_format.h"

#include <algorithm>

#include "io/annex_b.h"

namespace zolt {
namespace {

// Of a start code and of a length alike.
constexpr std::size_t kPrefixBytes = 4;
static_assert(sizeof kStartCode == kPrefixBytes);

void append_set(std::vector<unsigned char>& record, const std::vector<unsigned char>& nal) {
    record.push_back(static_cast<unsigned char>(nal.size() >> 8));
    record.push_back(static_cast<unsigned char>(nal.size()));
    record.insert(record.end(), nal.begin(), nal.end());
}

unsigned char* write_unit(StreamFormat format, const std::vector<unsigned char>& nal,
                          unsigned char* to) {
    if (format == StreamFormat::byte_stream) {
        to = std::copy_n(kStartCode, kPrefixBytes, to);
    } else {
        for (const int shift : {24, 16, 8, 0}) {
            *to++ = static_cast<unsigned char>(nal.size() >> shift);
        }
    }
    return std::copy(nal.begin(), nal.end(), to);
}

}  // namespace

std::vector<unsigned char> decoder_configuration(const ParameterSetUnits& sets) {
    constexpr unsigned char kVersion = 1;
    constexpr unsigned char kLengthsOf4 = 0xFF;  // six bits 1, lengthSizeMinusOne 3
    constexpr unsigned char kOneSeqParSet = 0xE1;
    constexpr unsigned char kOnePicParSet = 1;
    // Profile, constraint flags and level are bytes 1 to 3 of the sequence parameter set.
    std::vector<unsigned char> record = {
        kVersion,    sets.seq_par_set[1], sets.seq_par_set[2], sets.seq_par_set[3],
        kLengthsOf4, kOneSeqParSet};
    append_set(record, sets.seq_par_set);
    record.push_back(kOnePicParSet);
    append_set(record, sets.pic_par_set);
    return record;
}

std::size_t AccessUnit::bytes() const {
    const std::size_t sets =
        has_sets() ? 2 * kPrefixBytes + sets_->seq_par_set.size() + sets_->pic_par_set.size() : 0;
    return sets + kPrefixBytes + nal_.size();
}

void AccessUnit::write(unsigned char* to) const {
    if (has_sets()) {
        to = write_unit(format_, sets_->seq_par_set, to);
        to = write_unit(format_, sets_->pic_par_set, to);
    }
    write_unit(format_, nal_, to);
}

}  // namespace zolt
