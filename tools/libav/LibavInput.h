#pragma once

#include <atomic>
#include <exception>
#include <optional>
#include <string>

#include "io/ByteReader.h"
#include "libav/SideStreams.h"
#include "libav/libav.h"

namespace zolt {

// The packets of a file, a device or a URL: those of its first video stream for the caller, those
// of audio and subtitles for its side streams. Failures are ToolErrors that name the input.
class LibavInput {
public:
    // `input`: a file; "FORMAT:DEVICE" where FORMAT is a kind of device; or a URL.
    LibavInput(const std::string& input, bool with_side_streams);
    // Bytes that are read in order, a pipe's.
    LibavInput(ByteReader bytes, bool with_side_streams);
    ~LibavInput();
    LibavInput(const LibavInput&) = delete;
    LibavInput& operator=(const LibavInput&) = delete;

    // Whether `input` is a URL, or a device, rather than a file.
    static bool names_address(const std::string& input);

    const std::string& name() const { return name_; }
    AVFormatContext* context() const { return context_.get(); }
    AVStream* video() const { return video_; }

    // Null where there are none or they were not asked for.
    SideStreams* side_streams() { return side_streams_ ? &*side_streams_ : nullptr; }

    // Whether pictures come when somebody makes them: from a device, a pipe, a live address.
    bool is_live() const;

    // The end that a file states, in the time base of the video; 0 where none does.
    std::int64_t stated_end() const;

    // Which streams are left out, as part of a note; empty for none.
    std::string left_out() const;

    // The next packet of the video; false at the end.
    bool read(AVPacket* packet);

    // After the last packet: how the input is cut off or damaged there; empty when it is not.
    const std::string& cut() const { return cut_; }

    void interrupt();

private:
    int open(const std::string& url, const AVInputFormat* format);
    void check_opened(int result) const;
    void choose_streams(bool with_side_streams);
    void check();
    bool has_no_more_bytes() const;
    void note_time(const AVPacket& packet);
    void note_end(int result);

    static int read_bytes(void* self, std::uint8_t* buffer, int size);
    static int is_interrupted(void* self);

    std::string name_;
    std::optional<ByteReader> bytes_;
    LibavPtr<AVIOContext> io_;  // over `bytes_`
    LibavPtr<AVFormatContext> context_;
    AVStream* video_ = nullptr;
    std::optional<SideStreams> side_streams_;
    std::int64_t end_ = 0;  // of the packets so far, in AV_TIME_BASE
    std::string cut_;
    std::exception_ptr failure_;  // of `bytes_`, until the library is left
    std::atomic<bool> interrupted_{false};
};

}  // namespace zolt
