#pragma once

#include <string>

#include "io/OutputFile.h"
#include "zoltenc/PictureRecord.h"

namespace zolt {

// A CSV file with one row per coded picture: index, time in microseconds, type (I or P), bytes of
// its NAL unit, quantisation parameter of its slice, and the picture's quality where that is
// measured; what a damaged slice does not tell is left empty.
class PictureStats {
public:
    PictureStats(const std::string& file_name, bool with_quality);

    const OutputFile& file() const { return file_; }

    void add(const PictureRecord& picture);

    void commit() { file_.commit(); }

private:
    void write_row(const std::string& row);

    OutputFile file_;
};

}  // namespace zolt
