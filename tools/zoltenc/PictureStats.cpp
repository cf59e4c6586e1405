#include "zoltenc/PictureStats.h"

#include "media/IConfigVideoAvc.h"
#include "zoltenc/slice_qp.h"

namespace zolt {
namespace {

constexpr int kNalTypeMask = 31;
constexpr int kNalTypeIdr = 5;

}  // namespace

PictureStats::PictureStats(const std::string& file_name) : file_(file_name) {
    write_row("index,time_us,type,bytes,qp");
}

void PictureStats::add(IConfigVideoAvc& stream, const unsigned char* nal, std::size_t size,
                       std::int64_t time) {
    const bool idr = size > 0 && (nal[0] & kNalTypeMask) == kNalTypeIdr;
    write_row(std::to_string(index_++) + "," + std::to_string(time) + "," + (idr ? "I" : "P") +
              "," + std::to_string(size) + "," + std::to_string(slice_qp(stream, nal, size)));
}

void PictureStats::write_row(const std::string& row) {
    const std::string line = row + "\n";
    file_.write(line.data(), line.size());
}

}  // namespace zolt
