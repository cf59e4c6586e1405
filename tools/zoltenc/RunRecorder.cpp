#include "zoltenc/RunRecorder.h"

#include "avc/SliceHeader.h"
#include "media/IConfigVideoAvc.h"
#include "zoltenc/open_probe.h"
#include "zoltenc/report/ReportPage.h"

namespace zolt {

RunRecorder::RunRecorder(const Options& options) : options_(options) {
    if (!options.stats.empty()) {
        stats_.emplace(options.stats, options.psnr);
    }
    if (!options.report.empty()) {
        report_.emplace(options.report);
    }
}

std::vector<const OutputFile*> RunRecorder::files() const {
    std::vector<const OutputFile*> files;
    if (stats_) {
        files.push_back(&stats_->file());
    }
    if (report_) {
        files.push_back(&*report_);
    }
    return files;
}

void RunRecorder::begin(const PictureFormat& format, const VideoTraits& traits,
                        const FrameRate& frame_rate, const TimeBase& time_base) {
    time_base_ = time_base;
    usual_duration_ = 1 / frame_rate.per_second();
    if (options_.psnr || report_) {
        probe_ = open_probe(options_, format, traits);
    }
}

void RunRecorder::add(IConfigVideoAvc& stream, const CodedPicture& picture) {
    take_parameter_sets(stream);
    const double tick =
        static_cast<double>(time_base_.numerator) / static_cast<double>(time_base_.denominator);
    PictureRecord record;
    record.index = tally_.frames();
    record.time = microseconds(picture.time.start, time_base_);
    record.start = static_cast<double>(picture.time.start) * tick;
    record.duration = picture.time.duration > 0 ? static_cast<double>(picture.time.duration) * tick
                                                : usual_duration_;
    record.bytes = static_cast<std::int64_t>(picture.size);
    record.is_key = picture.is_key;
    const std::optional<SliceHeader> slice =
        SliceHeader::read(picture.nal, static_cast<int>(picture.size), parameter_sets_);
    if (slice) {
        record.type = slice->slice_type == kSliceI ? 'I' : 'P';
    }
    if (slice && slice->is_complete) {
        record.qp = static_cast<int>(slice->slice_qp);
    }
    if (probe_) {
        probe_->look(source_, picture, record);
    }
    tally_.add(record);
    if (stats_) {
        stats_->add(record);
    }
    if (report_) {
        records_.push_back(record);
    }
}

void RunRecorder::finish(const RunSummary& summary) {
    if (report_) {
        const std::string page =
            ReportPage(summary, records_,
                       probe_ ? probe_->pictures() : std::vector<ReportPicture>{})
                .html();
        report_->write(page.data(), page.size());
    }
}

void RunRecorder::commit() {
    if (stats_) {
        stats_->commit();
    }
    if (report_) {
        report_->commit();
    }
}

void RunRecorder::take_parameter_sets(IConfigVideoAvc& stream) {
    const unsigned char* const sps = stream.GetSeqParSetData();
    const unsigned char* const pps = stream.GetPicParSetData();
    std::vector<unsigned char> seq_par_set(sps, sps + stream.GetSeqParSetSize());
    std::vector<unsigned char> pic_par_set(pps, pps + stream.GetPicParSetSize());
    if (seq_par_set == seq_par_set_ && pic_par_set == pic_par_set_) {
        return;
    }
    seq_par_set_ = std::move(seq_par_set);
    pic_par_set_ = std::move(pic_par_set);
    parameter_sets_.add_seq_par_set(seq_par_set_.data(), static_cast<int>(seq_par_set_.size()));
    parameter_sets_.add_pic_par_set(pic_par_set_.data(), static_cast<int>(pic_par_set_.size()));
    if (probe_) {
        probe_->begin(seq_par_set_, pic_par_set_);
    }
}

}  // namespace zolt
