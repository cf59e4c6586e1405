#include "zoltenc/EncodeRun.h"

#include <algorithm>
#include <cstdio>

#include "io/StopSignal.h"
#include "io/ToolError.h"
#include "io/os.h"
#include "media/IConfigVideoAvc.h"
#include "zoltenc/EncoderLibrary.h"
#include "zoltenc/EncoderSession.h"
#include "zoltenc/HostServices.h"
#include "zoltenc/Pacer.h"
#include "zoltenc/Progress.h"
#include "zoltenc/coded_traits.h"
#include "zoltenc/open_sink.h"
#include "zoltenc/open_source.h"

namespace zolt {
namespace {

std::string size_text(int width, int height) {
    return std::to_string(width) + "x" + std::to_string(height);
}

std::string hex_text(const unsigned char* data, int size) {
    std::string text;
    for (int i = 0; i < size; ++i) {
        char byte[4];
        std::snprintf(byte, sizeof byte, " %02X", data[i]);
        text += byte;
    }
    return text;
}

}  // namespace

EncodeRun::EncodeRun(const Options& options)
    : options_(options),
      source_(open_source(options)),
      sink_(open_sink(options, *source_)),
      consumer_(*sink_) {
    if (!options_.stats.empty()) {
        stats_.emplace(options_.stats);
    }
    check_outputs();
    choose_frame_rate();
    describe_input();
    if (options_.raw_format && source_->states_format()) {
        note(source_->name() + " has a size and a format of its own; --size and --format are for " +
             "raw input");
    }
    if (!source_->remark().empty()) {
        note(source_->name() + ": " + source_->remark());
    }
    if (!sink_->remark().empty()) {
        note(sink_->name() + ": " + sink_->remark());
    }
}

void EncodeRun::run() {
    skip_frames();

    // What the library prints on standard output must not enter the stream.
    os_divert_output(options_.verbose);
    HostServices::announce();
    const EncoderLibrary library(
        options_.plugin.empty() ? os_program_directory() + ZOLT_ENCODER_LIBRARY : options_.plugin);
    EncoderSession session(library, source_->format(), frame_rate_,
                           {options_.bit_rate_kbs, options_.key_frame_interval}, consumer_);
    describe(library);

    Progress progress(expected_frames(), frame_rate_, !options_.quiet);
    try {
        encode_all(session, progress);
    } catch (const ToolError&) {
        progress.clear();
        if (options_.keep_partial && consumer_.pictures() > 0) {
            commit();
        }
        throw;
    }
    progress.clear();
    if (!source_->closing_remark().empty()) {
        note(source_->name() + ": " + source_->closing_remark());
    }
    if (consumer_.pictures() == 0) {
        if (StopSignal::received() != 0) {
            return;
        }
        throw ToolError(!cut_.empty()
                            ? cut_
                            : source_->name() + ": holds no picture" +
                                  (options_.skip > 0 ? " after those left out by --skip" : ""));
    }
    commit();
    if (StopSignal::received() != 0) {
        note("stopped by a signal; what was coded so far is in " + sink_->name());
    }
    if (!options_.quiet) {
        std::fprintf(stderr, "%s: %s\n", sink_->name().c_str(),
                     progress.summary(consumer_.pictures(), sink_->bytes()).c_str());
    }
    if (options_.demonstration && !options_.quiet) {
        std::fprintf(stderr, "To look at it: ffplay %s (or any player of H.264 streams)\n",
                     sink_->name().c_str());
    }
    if (!cut_.empty()) {
        throw ToolError(cut_ + "; the pictures before it are in " + sink_->name());
    }
}

void EncodeRun::check_outputs() const {
    const auto refuse_input = [this](const OutputFile& file) {
        if (file.would_replace(options_.input)) {
            throw UsageError(file.name() + ": is the input too; name another file to write");
        }
    };
    const OutputFile* const output = sink_->file();
    if (output != nullptr) {
        refuse_input(*output);
    }
    if (!stats_) {
        return;
    }
    refuse_input(stats_->file());
    if (output != nullptr && stats_->file().would_replace(*output)) {
        throw UsageError(sink_->name() + ": cannot hold both the stream and --stats");
    }
}

void EncodeRun::skip_frames() {
    std::vector<unsigned char> picture(source_->format().sample_bytes());
    for (std::int64_t frame = 0; frame < options_.skip && source_->read(picture.data()); ++frame) {}
}

void EncodeRun::choose_frame_rate() {
    const std::optional<FrameRate> stated = source_->frame_rate();
    frame_rate_ = stated ? *stated : options_.frame_rate.value_or(FrameRate{});
    if (stated && options_.frame_rate) {
        note(source_->name() + " states " + stated->to_string() +
             " frames/s; --fps is for input that states none");
    }
}

// What the consumer hands on of the input.
void EncodeRun::describe_input() {
    const std::optional<TimeBase> own_clock = source_->time_base();
    time_base_ = own_clock.value_or(TimeBase{frame_rate_.denominator, frame_rate_.numerator});
    StreamDescription input;
    input.frame_rate = frame_rate_;
    input.is_constant_rate = !own_clock;
    input.time_base = time_base_;
    input.traits = coded_traits(*source_);
    input.bit_rate_kbs = options_.bit_rate_kbs;
    consumer_.describe_input(input);
}

std::optional<std::int64_t> EncodeRun::expected_frames() const {
    const std::optional<std::int64_t> left = source_->frames_left();
    return left && options_.frames ? std::min(*left, *options_.frames)
                                   : (left ? left : options_.frames);
}

void EncodeRun::describe(const EncoderLibrary& library) const {
    const PictureFormat input = source_->format();
    IConfigVideoAvc& stream = *consumer_.stream();
    const std::string coded_size = size_text(stream.GetWidth(), stream.GetHeight());
    if (stream.GetWidth() != input.width || stream.GetHeight() != input.height) {
        note("the middle " + coded_size + " of the " + size_text(input.width, input.height) +
             " pictures are coded: sides are multiples of 16");
    }
    if (!options_.verbose) {
        return;
    }
    std::fprintf(stderr, "encoder: %s (%s)\n", library.encoder_name(), library.file_name().c_str());
    std::fprintf(stderr, "input: %s, %s, %s frames/s\n", source_->name().c_str(),
                 size_text(input.width, input.height).c_str(), frame_rate_.to_string().c_str());
    std::fprintf(stderr, "stream: %s, bit rate %d kbit/s, key-frame interval %d\n",
                 coded_size.c_str(), options_.bit_rate_kbs, options_.key_frame_interval);
    std::fprintf(stderr, "sequence parameter set:%s\npicture parameter set:%s\n",
                 hex_text(stream.GetSeqParSetData(), stream.GetSeqParSetSize()).c_str(),
                 hex_text(stream.GetPicParSetData(), stream.GetPicParSetSize()).c_str());
}

void EncodeRun::encode_all(EncoderSession& session, Progress& progress) {
    if (stats_) {
        consumer_.set_picture_listener([this](const CodedPicture& picture) {
            stats_->add(*consumer_.stream(), picture.nal, picture.size,
                        microseconds(picture.time.start, time_base_));
        });
    }
    Pacer pacer;
    std::vector<unsigned char> picture(source_->format().sample_bytes());
    for (std::int64_t frame = 0; frame != options_.frames.value_or(-1); ++frame) {
        if (!read_picture(picture)) {
            break;
        }
        const PictureTime time = picture_time(frame);
        if (options_.realtime) {
            pacer.wait_for(microseconds(time.start, time_base_));
        }
        consumer_.set_time(time);
        session.encode(picture, microseconds(time.start, time_base_));
        progress.update(consumer_.pictures(), sink_->bytes());
    }
    session.end();
}

// Reads the next picture; false at the end of the input, wherever that is, and after a stop signal.
bool EncodeRun::read_picture(std::vector<unsigned char>& picture) {
    if (StopSignal::received() != 0) {
        return false;
    }
    try {
        return source_->read(picture.data());
    } catch (const TruncatedInput& error) {
        // A stop signal cuts off the input too.
        if (StopSignal::received() == 0) {
            cut_ = error.what();
        }
        return false;
    }
}

// The time of the picture read last, which is number `frame` of those coded. Behind skipped
// pictures the first one's is 0.
PictureTime EncodeRun::picture_time(std::int64_t frame) {
    if (!source_->time_base()) {
        return {frame, 1};
    }
    PictureTime time = source_->time();
    if (frame == 0 && options_.skip > 0) {
        time_offset_ = time.start;
        consumer_.set_time_offset(time_offset_);
    }
    time.start -= time_offset_;
    return time;
}

void EncodeRun::commit() {
    sink_->commit();
    if (stats_) {
        stats_->commit();
    }
}

void EncodeRun::note(const std::string& text) const {
    if (!options_.quiet) {
        std::fprintf(stderr, "zoltenc: note: %s\n", text.c_str());
    }
}

}  // namespace zolt
