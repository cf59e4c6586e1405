#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "io/OutputFile.h"
#include "io/PictureSink.h"
#include "libav/FileContext.h"
#include "libav/SideStreams.h"
#include "libav/libav.h"

namespace zolt {

// Writes the stream into a container of libavformat, to a file or a live address, with the streams
// beside the video that the container can hold.
class ContainerSink : public PictureSink {
public:
    struct Settings {
        std::string muxer;           // libavformat's name of the container
        bool is_live = false;        // the output is an address, not a file
        bool needs_seeking = false;  // the container is not finished from front to back
        bool ends_early = false;     // the pictures may end before the input
    };

    // Opens the output. `traits` are those of the input's pictures. `side_streams` are told which
    // of them are kept and outlive the sink; null: none are there, or none are wanted.
    ContainerSink(const std::string& output, const Settings& settings, const VideoTraits& traits,
                  SideStreams* side_streams);
    ~ContainerSink() override;

    const std::string& name() const override { return name_; }
    const OutputFile* file() const override { return file_ ? &*file_ : nullptr; }
    std::string remark() const override { return remark_; }
    void begin(const StreamDescription& stream) override;
    void write(const CodedPicture& picture) override;
    std::int64_t bytes() const override { return bytes_; }
    void commit() override;

private:
    struct FreeContext {
        void operator()(AVFormatContext* context) const { avformat_free_context(context); }
    };
    struct CloseAddress {
        void operator()(AVIOContext* context) const { avio_close(context); }
    };
    // A stream beside the video that the container holds.
    struct Copy {
        SideStreams::Stream side;
        AVStream* stream;        // null until the header is written
        std::int64_t last_time;  // of a packet, in the container's ticks
    };

    void open(const std::string& output);
    void choose_copies(const VideoTraits& traits);
    void add_video();
    void add_copies();
    void write_header();
    void copy_packets(bool is_last);
    void write_copy(Copy& copy, std::int64_t offset);
    bool follows(const Copy& copy, const AVPacket& packet) const;
    void check(int result);
    void check_file();

    Settings settings_;
    std::string name_;
    std::string remark_;
    std::optional<OutputFile> file_;
    std::optional<FileContext> file_context_;
    bool is_opening_ = false;
    std::unique_ptr<AVIOContext, CloseAddress> address_;
    std::unique_ptr<AVFormatContext, FreeContext> context_;
    SideStreams* side_streams_ = nullptr;
    std::vector<Copy> copies_;
    AVStream* video_ = nullptr;
    StreamDescription stream_;
    AVRational picture_clock_ = {0, 1};  // of the pictures' times
    LibavPtr<AVPacket> packet_;
    LibavPtr<AVPacket> next_copy_;  // the packet that comes next beside the video; blank for none
    std::int64_t end_ = 0;          // of the last picture
    std::int64_t bytes_ = 0;
};

}  // namespace zolt
