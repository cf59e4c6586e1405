#include "zoltenc/EncodeRun.h"

#include <algorithm>
#include <cstdio>

#include "io/StopSignal.h"
#include "io/SyntheticSource.h"
#include "io/ToolError.h"
#include "io/os.h"
#include "media/IConfigVideoAvc.h"
#include "session/EncoderLibrary.h"
#include "session/EncoderSession.h"
#include "session/HostServices.h"
#include "zoltenc/JsonLines.h"
#include "zoltenc/Pacer.h"
#include "zoltenc/coded_traits.h"
#include "zoltenc/open_probe.h"
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

EncodeRun::EncodeRun(const Options& options, JsonLines* json, const Pass& pass)
    : options_(options),
      json_(json),
      pass_(pass),
      source_(open_source(options)),
      sink_(open_sink(options, *source_)),
      recorder_(options),
      consumer_(*sink_) {
    check_outputs();
    choose_frame_rate();
    describe_input();
    recorder_.begin(source_->format(), coded_traits(*source_), frame_rate_, time_base_);
    if (options_.raw_format && source_->states_format()) {
        first_note(source_->name() +
                   " has a size and a format of its own; --size and --format are for raw input");
    }
    if (!source_->remark().empty()) {
        first_note(source_->name() + ": " + source_->remark());
    }
    if (!options_.report.empty() && !has_probe()) {
        first_note(options_.report +
                   ": has plots alone: this zoltenc was built without libavcodec");
    }
    if (!sink_->remark().empty()) {
        first_note(sink_->name() + ": " + sink_->remark());
    }
}

void EncodeRun::run() {
    encode();
    finish(1);
}

void EncodeRun::encode() {
    skip_frames();

    // What the library prints on standard output must not enter the stream.
    os_divert_output(options_.verbose);
    const HostServices host(os_program_directory());
    host.announce();
    const EncoderLibrary library(
        options_.plugin.empty() ? os_program_directory() + ZOLT_ENCODER_LIBRARY : options_.plugin,
        "name the right one with --plugin");
    const PictureFormat format = source_->format();
    EncoderSession session(
        library, host,
        {pass_.bit_rate_kbs, options_.key_frame_interval,
         options_.threads.value_or(EncoderSession::useful_threads(format.height))},
        consumer_);
    session.begin(format, frame_rate_);
    describe(library);
    begin_summary(library);

    Progress progress({expected_frames(), options_.bit_rate_kbs, pass_.number, pass_.most, json_,
                       !options_.quiet},
                      recorder_.tally());
    try {
        encode_all(session, progress);
    } catch (const ToolError&) {
        progress.clear();
        sum_up(progress, "failed");
        if (options_.keep_partial && consumer_.pictures() > 0) {
            commit();
        }
        if (json_ != nullptr) {
            json_->write(summary_.json());
        }
        throw;
    }
    progress.clear();
    const bool stopped = StopSignal::received() != 0;
    sum_up(progress, stopped ? "stopped" : cut_.empty() ? "end" : "cut");
    if (!source_->closing_remark().empty()) {
        first_note(source_->name() + ": " + source_->closing_remark());
    }
    if (consumer_.pictures() == 0 && !stopped) {
        throw ToolError(!cut_.empty()
                            ? cut_
                            : source_->name() + ": holds no picture" +
                                  (options_.skip > 0 ? " after those left out by --skip" : ""));
    }
}

void EncodeRun::finish(int runs) {
    summary_.runs = runs;
    if (consumer_.pictures() > 0) {
        commit();
        if (StopSignal::received() != 0) {
            note("stopped by a signal; what was coded so far is in " + sink_->name());
        }
    }
    tell_summary();
    if (!cut_.empty()) {
        throw ToolError(cut_ + "; the pictures before it are in " + sink_->name());
    }
}

void EncodeRun::require_repeatable() const {
    const auto input = os_status(options_.input);
    if (!SyntheticSource::recognises(options_.input) && !(input && input->is_regular)) {
        throw UsageError("--match-rate: " + source_->name() +
                         " cannot be read again: name a file as the input");
    }
    const OutputFile* const output = sink_->file();
    const bool is_sent = output == nullptr ? writes_container(options_)  // to an address
                                           : output->is_written_directly();
    if (is_sent) {
        throw UsageError("--match-rate: " + sink_->name() +
                         " would hold every run: name a file as the output");
    }
}

void EncodeRun::check_outputs() const {
    std::vector<const OutputFile*> files = recorder_.files();
    if (sink_->file() != nullptr) {
        files.insert(files.begin(), sink_->file());
    }
    for (auto file = files.begin(); file != files.end(); ++file) {
        if ((*file)->would_replace(options_.input)) {
            throw UsageError((*file)->name() + ": is the input too; name another file to write");
        }
        for (auto other = files.begin(); other != file; ++other) {
            if ((*file)->would_replace(**other)) {
                throw UsageError((*file)->name() + ": cannot hold two of the stream, --stats and " +
                                 "--report; name different files");
            }
        }
    }
}

void EncodeRun::skip_frames() {
    std::vector<unsigned char> picture(source_->format().sample_bytes());
    for (std::int64_t frame = 0; frame < options_.skip && source_->read(picture); ++frame) {}
}

void EncodeRun::choose_frame_rate() {
    const std::optional<FrameRate> stated = source_->frame_rate();
    frame_rate_ = stated ? *stated : options_.frame_rate.value_or(FrameRate{});
    if (stated && options_.frame_rate) {
        first_note(source_->name() + " states " + stated->to_string() +
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
        first_note("the middle " + coded_size + " of the " + size_text(input.width, input.height) +
                   " pictures are coded: sides are multiples of 16");
    }
    if (!options_.verbose || pass_.number > 1) {
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
    consumer_.set_picture_listener(
        [this](const CodedPicture& picture) { recorder_.add(*consumer_.stream(), picture); });
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
        recorder_.set_source(picture.data());
        session.encode(picture.data(), picture.size(), microseconds(time.start, time_base_));
        progress.update();
    }
    session.end();
}

// Reads the next picture; false at the end of the input, wherever that is, and after a stop signal.
bool EncodeRun::read_picture(std::vector<unsigned char>& picture) {
    if (StopSignal::received() != 0) {
        return false;
    }
    try {
        return source_->read(picture);
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

void EncodeRun::begin_summary(const EncoderLibrary& library) {
    summary_.input = source_->name();
    summary_.output = sink_->name();
    summary_.encoder = library.encoder_name();
    summary_.input_format = source_->format();
    summary_.width = consumer_.stream()->GetWidth();
    summary_.height = consumer_.stream()->GetHeight();
    summary_.frame_rate = frame_rate_;
    summary_.key_frame_interval = options_.key_frame_interval;
    summary_.target_kbs = options_.bit_rate_kbs;
    summary_.controller_kbs = pass_.bit_rate_kbs;
}

void EncodeRun::sum_up(const Progress& progress, const char* exit) {
    summary_.seconds = progress.seconds();
    summary_.bytes = sink_->bytes();
    summary_.exit = exit;
    summary_.tally = recorder_.tally();
}

void EncodeRun::commit() {
    recorder_.finish(summary_);
    sink_->commit();
    recorder_.commit();
}

void EncodeRun::tell_summary() const {
    if (json_ != nullptr) {
        json_->write(summary_.json());
    } else if (!options_.quiet && consumer_.pictures() > 0) {
        std::fprintf(stderr, "%s: %s\n", sink_->name().c_str(), summary_.text().c_str());
        if (options_.psnr) {
            std::fprintf(stderr, "%s: %s\n", sink_->name().c_str(),
                         summary_.quality_text().c_str());
        }
        if (options_.demonstration) {
            std::fprintf(stderr, "To look at it: ffplay %s (or any player of H.264 streams)\n",
                         sink_->name().c_str());
        }
    }
}

void EncodeRun::note(const std::string& text) const {
    if (!options_.quiet) {
        std::fprintf(stderr, "zoltenc: note: %s\n", text.c_str());
    }
}

// A note that would be the same in every pass.
void EncodeRun::first_note(const std::string& text) const {
    if (pass_.number == 1) {
        note(text);
    }
}

}  // namespace zolt
