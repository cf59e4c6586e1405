#pragma once

#include <memory>
#include <string>

#include "avcdump/UnitLister.h"

namespace zolt {

// How a listing of NAL units is written: head, then one row per unit in stream order, then tail.
class RowFormat {
public:
    virtual ~RowFormat() = default;
    virtual std::string head() const = 0;
    virtual std::string row(const UnitRow& unit) = 0;
    virtual std::string tail(const StreamSummary& summary) const = 0;

    // Columns for the eye and a summary line; what a unit lacks is "-".
    static std::unique_ptr<RowFormat> table();
    // One object: the array "units" and the object "summary"; what is lacking is null.
    static std::unique_ptr<RowFormat> json();
    // A line of names and one per unit, no summary; what a unit lacks is empty.
    static std::unique_ptr<RowFormat> csv();
};

}  // namespace zolt
