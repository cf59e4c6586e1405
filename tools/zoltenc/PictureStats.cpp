#include "zoltenc/PictureStats.h"

#include <optional>

#include "avc/SliceHeader.h"
#include "media/IConfigVideoAvc.h"

namespace zolt {

PictureStats::PictureStats(const std::string& file_name) : file_(file_name) {
    write_row("index,time_us,type,bytes,qp");
}

void PictureStats::add(IConfigVideoAvc& stream, const unsigned char* nal, std::size_t size,
                       std::int64_t time) {
    parameter_sets_.add_seq_par_set(stream.GetSeqParSetData(), stream.GetSeqParSetSize());
    parameter_sets_.add_pic_par_set(stream.GetPicParSetData(), stream.GetPicParSetSize());
    const std::optional<SliceHeader> slice =
        SliceHeader::read(nal, static_cast<int>(size), parameter_sets_);

    std::string row = std::to_string(index_++) + "," + std::to_string(time) + ",";
    if (slice) {
        row += slice->slice_type == kSliceI ? "I" : "P";
    }
    row += "," + std::to_string(size) + ",";
    if (slice && slice->is_complete) {
        row += std::to_string(slice->slice_qp);
    }
    write_row(row);
}

void PictureStats::write_row(const std::string& row) {
    const std::string line = row + "\n";
    file_.write(line.data(), line.size());
}

}  // namespace zolt
