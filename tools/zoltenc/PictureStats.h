#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "avc/ParameterSets.h"
#include "io/OutputFile.h"

class IConfigVideoAvc;

namespace zolt {

// A CSV file with one row per coded picture: index, time in microseconds, type (I or P), bytes of
// its NAL unit, quantisation parameter of its slice; what a damaged slice does not tell is left
// empty.
class PictureStats {
public:
    explicit PictureStats(const std::string& file_name);

    const OutputFile& file() const { return file_; }

    // `nal` is a bare slice NAL unit of a stream whose parameter sets `stream` holds.
    void add(IConfigVideoAvc& stream, const unsigned char* nal, std::size_t size,
             std::int64_t time);

    void commit() { file_.commit(); }

private:
    void write_row(const std::string& row);

    OutputFile file_;
    ParameterSets parameter_sets_;
    std::int64_t index_ = 0;
};

}  // namespace zolt
