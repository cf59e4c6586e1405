#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "io/FrameRate.h"
#include "io/PictureTime.h"
#include "io/VideoTraits.h"

namespace zolt {

class OutputFile;

// What a sink is told of a stream before its first picture. The parameter sets are bare NAL units
// (header byte and payload with emulation prevention), as the encoder made them.
struct StreamDescription {
    std::vector<unsigned char> seq_par_set;
    std::vector<unsigned char> pic_par_set;
    int width = 0;  // of the coded pictures, luma samples
    int height = 0;
    FrameRate frame_rate;           // 0 to 0: not known
    bool is_constant_rate = false;  // pictures come at the frame rate exactly
    TimeBase time_base;             // of the pictures' times
    // What a time of the input has more than that of the same picture here, in ticks.
    std::int64_t time_offset = 0;
    VideoTraits traits;
    int bit_rate_kbs = 0;  // 0: no rate control
};

// One coded picture: a bare slice NAL unit, borrowed for the call.
struct CodedPicture {
    const unsigned char* nal = nullptr;
    std::size_t size = 0;
    PictureTime time;
    bool is_key = false;  // an IDR picture
};

// Where coded pictures go. Failures are ToolErrors that name the sink.
class PictureSink {
public:
    virtual ~PictureSink() = default;

    // What to call the output in a message.
    virtual const std::string& name() const = 0;

    // The file that `commit` leaves; null where there is none.
    virtual const OutputFile* file() const = 0;

    // What the user should know about the output, as a one-line note; empty for nothing.
    virtual std::string remark() const { return ""; }

    // The stream that follows. Comes again in mid-stream where the encoder begins anew.
    virtual void begin(const StreamDescription& stream) = 0;

    virtual void write(const CodedPicture& picture) = 0;

    // Bytes that the pictures and parameter sets have taken so far.
    virtual std::int64_t bytes() const = 0;

    // Ends the output and leaves it under its name; without it nothing is left.
    virtual void commit() = 0;
};

}  // namespace zolt
