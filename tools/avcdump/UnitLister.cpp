#include "avcdump/UnitLister.h"

#include <algorithm>
#include <iterator>
#include <limits>

#include "avc/VideoAvcParser.h"

namespace zolt {
namespace {

// nal_unit_type, table 7-1.
enum UnitType {
    kSlice = 1,
    kSliceDataA = 2,
    kIdrSlice = 5,
    kSeqParSet = 7,
    kPicParSet = 8,
    kPrefix = 14
};

// Clause 7.4.1.2.3: behind the slices of a picture these units are part of the next one.
bool starts_access_unit(int type) {
    return (type >= 6 && type <= 9) || (type >= 14 && type <= 18);
}

}  // namespace

UnitLister::UnitLister(FrameRate frame_rate)
    : field_rate_{frame_rate.numerator * 2, frame_rate.denominator} {
    summary_.frame_rate = frame_rate;
}

UnitRow UnitLister::add(const unsigned char* unit, int size) {
    int start_code_length = 0;
    VideoAvcParser::FindStartCode(unit, std::min(size, VideoAvcParser::StartCode4Length),
                                  &start_code_length);
    const unsigned char* const nal = unit + start_code_length;
    const int nal_size = size - start_code_length;

    UnitRow row;
    row.offset = summary_.bytes;
    row.size = size;
    row.type = nal_size > 0 ? VideoAvcParser::GetNaluType(nal) : 0;
    ++summary_.units;
    summary_.bytes += size;

    if (row.type == kSeqParSet) {
        parameter_sets_.add_seq_par_set(nal, nal_size);
    } else if (row.type == kPicParSet) {
        parameter_sets_.add_pic_par_set(nal, nal_size);
    } else if (row.type == kSlice || row.type == kSliceDataA || row.type == kIdrSlice) {
        row.is_sync = row.type == kIdrSlice;
        row.header = SliceHeader::read(nal, nal_size, parameter_sets_);
        add_slice(row);
    }
    if (starts_access_unit(row.type)) {
        // A prefix stands before every slice, not only before the first one of a picture.
        if (row.type != kPrefix) {
            current_slice_.reset();
        }
        row.picture = summary_.pictures;
        row.time = time_of(fields_);
    } else {
        row.picture = std::max<std::int64_t>(summary_.pictures - 1, 0);
        row.time = time_of(fields_before_);
    }
    return row;
}

StreamSummary UnitLister::summary() const {
    StreamSummary summary = summary_;
    if (fields_ > 0) {
        const double seconds = static_cast<double>(fields_) / field_rate_.per_second();
        summary.kbits_per_second = static_cast<double>(summary.bytes) * 8 / 1000 / seconds;
    }
    return summary;
}

const char* UnitLister::type_name(int type) {
    static constexpr const char* kNames[] = {"unspecified",
                                             "slice",
                                             "slice data A",
                                             "slice data B",
                                             "slice data C",
                                             "IDR slice",
                                             "SEI",
                                             "SPS",
                                             "PPS",
                                             "AUD",
                                             "end of sequence",
                                             "end of stream",
                                             "filler",
                                             "SPS extension",
                                             "prefix",
                                             "subset SPS",
                                             "depth PS",
                                             "reserved",
                                             "reserved",
                                             "auxiliary slice",
                                             "slice extension",
                                             "depth extension",
                                             "reserved",
                                             "reserved"};
    return type >= 0 && type < static_cast<int>(std::size(kNames)) ? kNames[type] : "unspecified";
}

// Counts the picture that the slice may start.
void UnitLister::add_slice(UnitRow& row) {
    if (!row.header) {
        return;
    }
    if (!current_slice_ || row.header->starts_picture_after(*current_slice_)) {
        ++summary_.pictures;
        summary_.idr_pictures += row.is_sync ? 1 : 0;
        fields_before_ = fields_;
        fields_ += row.header->field_pic ? 1 : 2;
    }
    current_slice_ = row.header;
}

std::int64_t UnitLister::time_of(std::int64_t fields) const {
    // What the rate's arithmetic carries; more pictures are not in a file that anyone has.
    constexpr std::int64_t kMaxIndex = std::numeric_limits<std::uint32_t>::max();
    return field_rate_.sample_time(std::min(fields, kMaxIndex));
}

}  // namespace zolt
