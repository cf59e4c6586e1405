#pragma once

#include <cstdint>
#include <optional>

#include "avc/ParameterSets.h"
#include "avc/SliceHeader.h"
#include "io/FrameRate.h"

namespace zolt {

// What is known of one NAL unit of a stream.
struct UnitRow {
    std::int64_t offset = 0;  // in the stream, bytes
    int size = 0;             // bytes, with the start code
    int type = 0;             // nal_unit_type
    // Index in decoding order of the picture that the unit belongs to, and when it is due,
    // microseconds. Parameter sets and the like belong to the picture behind them.
    std::int64_t picture = 0;
    std::int64_t time = 0;
    bool is_sync = false;               // a slice of an IDR picture
    std::optional<SliceHeader> header;  // of slices whose header can be read
};

struct StreamSummary {
    std::int64_t units = 0;
    std::int64_t pictures = 0;  // a field is a picture of its own, which lasts half a frame period
    std::int64_t idr_pictures = 0;
    std::int64_t bytes = 0;
    FrameRate frame_rate;
    std::optional<double> kbits_per_second;  // nothing without pictures
};

// Describes the units of an AVC byte stream one after the other.
class UnitLister {
public:
    explicit UnitLister(FrameRate frame_rate);

    // The next unit of the stream, with its start code if it has one.
    UnitRow add(const unsigned char* unit, int size);

    StreamSummary summary() const;

    // Short name of a nal_unit_type (0..31), table 7-1.
    static const char* type_name(int type);

private:
    void add_slice(UnitRow& row);
    std::int64_t time_of(std::int64_t fields) const;

    FrameRate field_rate_;  // twice the frame rate
    ParameterSets parameter_sets_;
    StreamSummary summary_;
    std::int64_t fields_before_ = 0;            // fields of the pictures before the current one
    std::int64_t fields_ = 0;                   // fields so far, the current picture's included
    std::optional<SliceHeader> current_slice_;  // latest slice of the current picture; nothing
                                                // when the next slice starts a picture
};

}  // namespace zolt
