#pragma once

#include <deque>
#include <mutex>
#include <vector>

#include "libav/libav.h"

namespace zolt {

// The streams beside the video, audio and subtitles, on their way from a source to a container. The
// source pushes packets on its thread, the sink takes them on another.
class SideStreams {
public:
    // What the source says of a stream; the pointers are good as long as the source is.
    struct Stream {
        int index;  // the packets' stream_index
        const AVCodecParameters* parameters;
        AVRational time_base;          // of the packets' times
        int disposition;               // AV_DISPOSITION_ flags
        const AVDictionary* metadata;  // null where there is none
    };

    explicit SideStreams(std::vector<Stream> streams) : streams_(std::move(streams)) {}

    const std::vector<Stream>& streams() const { return streams_; }

    // The sink's choice of a stream, to be made before the first picture is read.
    void keep(int index);

    // To be called by the source with the first picture: packets of streams that are not kept are
    // dropped, also those that were pushed before.
    void settle();

    // Takes a reference to the packet's data.
    void push(const AVPacket& packet);

    // Moves the oldest packet into `packet`, which is blank; false when none is there. After the
    // last picture all packets are.
    bool pop(AVPacket* packet);

private:
    bool is_kept(const AVPacket& packet) const;

    std::vector<Stream> streams_;
    std::mutex mutex_;  // of what follows
    std::vector<int> kept_;
    bool settled_ = false;
    std::deque<LibavPtr<AVPacket>> packets_;
};

}  // namespace zolt
