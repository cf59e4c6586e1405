#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "io/FrameRate.h"
#include "io/PictureFormat.h"
#include "io/PictureTime.h"
#include "io/VideoTraits.h"

namespace zolt {

class SideStreams;

// Pictures of one size and format, one after the other.
class FrameSource {
public:
    virtual ~FrameSource() = default;

    // What to call the source in a message.
    virtual std::string name() const = 0;

    virtual PictureFormat format() const = 0;

    // Whether the input itself says what its size and format are.
    virtual bool states_format() const { return true; }

    // The rate that the source states; nothing where it states none.
    virtual std::optional<FrameRate> frame_rate() const = 0;

    virtual VideoTraits traits() const { return {}; }

    // The clock of the pictures' own times; nothing where they have none and come at the frame
    // rate.
    virtual std::optional<TimeBase> time_base() const { return std::nullopt; }

    // The time of the picture that was read last, where there is a time base.
    virtual PictureTime time() const { return {}; }

    // The audio and subtitles beside the pictures; null where the source has none. Read with the
    // pictures; the source's own.
    virtual SideStreams* side_streams() { return nullptr; }

    // What the user should know about the pictures, as part of a one-line note; empty for nothing.
    virtual std::string remark() const { return ""; }

    // The same of what was found while reading, up to the picture that was read last.
    virtual std::string closing_remark() const { return ""; }

    // About how many pictures are left to read; nothing where that cannot be known. For progress
    // reports only.
    virtual std::optional<std::int64_t> frames_left() const = 0;

    // Reads the next picture into `sample` (format().sample_bytes() long), which may become another
    // vector of that length; false at the end. Throws TruncatedInput when the input ends within a
    // picture and ToolError when it cannot be read.
    virtual bool read(std::vector<unsigned char>& sample) = 0;

    // Ends a read that waits for input on another thread, and every later one.
    virtual void interrupt() = 0;
};

}  // namespace zolt
