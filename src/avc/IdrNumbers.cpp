#include "avc/IdrNumbers.h"

#include <algorithm>
#include <climits>
#include <cstddef>

#include "avc/BitStreamReader.h"
#include "avc/BitStreamWriter.h"
#include "avc/VideoAvcParser.h"
#include "avc/rbsp.h"

namespace zolt {
namespace {

constexpr int kIdrSlice = 5;  // nal_unit_type, Table 7-1
constexpr std::uint64_t kMaxIdrPicId = 65535;

// Where idr_pic_id is in the bits of a slice, and its value.
struct Place {
    long start;
    long end;
    std::uint64_t value;
};

// Reads a slice header (clause 7.3.3) of an IDR picture up to idr_pic_id.
Place find_idr_pic_id(const std::vector<unsigned char>& rbsp, const SequenceParameterSet& set) {
    constexpr int kHeaderByteBits = 8;
    BitStreamReader reader(rbsp.data(), static_cast<int>(rbsp.size()));
    reader.SkipBits(kHeaderByteBits);
    reader.SkipExpGolomb();  // first_mb_in_slice
    reader.SkipExpGolomb();  // slice_type
    reader.SkipExpGolomb();  // pic_parameter_set_id
    if (set.separate_colour_plane_flag) {
        reader.SkipBits(2);  // colour_plane_id
    }
    read_log2_field(reader, set.log2_max_frame_num_minus4);
    if (!set.frame_mbs_only_flag && reader.ReadBoolean()) {
        reader.SkipBoolean();  // bottom_field_flag
    }
    const long start = reader.GetBitPos();
    const std::uint64_t value = reader.ReadExpGolomb();
    return {start, reader.GetBitPos(), value};
}

// The slice with another value; its bits behind it, the stop bit included, stay.
std::vector<unsigned char> rewritten(const std::vector<unsigned char>& rbsp, const Place& place,
                                     std::uint64_t value) {
    BitStreamWriter bits;
    const auto copy = [&](long from, long to) {
        BitStreamReader reader(rbsp.data(), static_cast<int>(rbsp.size()));
        reader.SetBitPos(from);
        while (from < to) {
            const int count = static_cast<int>(std::min<long>(to - from, 32));
            bits.u(count, reader.ReadUnsInt4(count));
            from += count;
        }
    };
    const auto last =
        std::find_if(rbsp.rbegin(), rbsp.rend(), [](unsigned char byte) { return byte != 0; });
    long end = static_cast<long>(rbsp.rend() - last) * CHAR_BIT;
    for (unsigned byte = *last; (byte & 1U) == 0; byte >>= 1) {
        --end;
    }
    copy(0, place.start);
    bits.ue(value);
    copy(place.end, end);
    bits.u(static_cast<int>((CHAR_BIT - bits.num_bits() % CHAR_BIT) % CHAR_BIT), 0);
    return bits.escaped();
}

}  // namespace

void IdrNumbers::pass(std::vector<unsigned char>& nal, const SequenceParameterSet& set) {
    if (nal.empty() || VideoAvcParser::GetNaluType(nal.data()) != kIdrSlice) {
        last_.reset();
        return;
    }
    const auto size = static_cast<int>(nal.size());
    const std::vector<unsigned char> rbsp = rbsp_bytes(nal.data(), size, size);
    const Place place = find_idr_pic_id(rbsp, set);
    const bool is_readable = set.is_valid && place.value <= kMaxIdrPicId &&
                             place.end < static_cast<long>(rbsp.size()) * CHAR_BIT;
    if (!is_readable || place.value != last_) {
        last_ = place.value;
        return;
    }
    last_ = (place.value + 1) % (kMaxIdrPicId + 1);
    nal = rewritten(rbsp, place, *last_);
}

}  // namespace zolt
