#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "avc/ParameterSets.h"
#include "io/OutputFile.h"
#include "io/PictureFormat.h"
#include "io/PictureSink.h"
#include "io/VideoTraits.h"
#include "zoltenc/Options.h"
#include "zoltenc/PictureProbe.h"
#include "zoltenc/PictureStats.h"
#include "zoltenc/RunSummary.h"
#include "zoltenc/StreamTally.h"

class IConfigVideoAvc;

namespace zolt {

// Keeps what a run's statistics and report tell of the coded pictures, and writes these.
class RunRecorder {
public:
    // Opens the files that the options name.
    explicit RunRecorder(const Options& options);

    // The files that `commit` leaves.
    std::vector<const OutputFile*> files() const;

    // The pictures that follow; the traits are those of the coded ones.
    void begin(const PictureFormat& format, const VideoTraits& traits, const FrameRate& frame_rate,
               const TimeBase& time_base);

    // The picture that the encoder is about to be given, in the format's layout; borrowed until
    // it was added.
    void set_source(const unsigned char* picture) { source_ = picture; }

    // The next coded picture of a stream with these parameter sets.
    void add(IConfigVideoAvc& stream, const CodedPicture& picture);

    const StreamTally& tally() const { return tally_; }

    // Writes the report, which is to be done before `commit`.
    void finish(const RunSummary& summary);

    void commit();

private:
    void take_parameter_sets(IConfigVideoAvc& stream);

    const Options& options_;
    std::optional<PictureStats> stats_;
    std::optional<OutputFile> report_;
    std::unique_ptr<PictureProbe> probe_;
    TimeBase time_base_;
    double usual_duration_ = 0;  // seconds of a picture
    const unsigned char* source_ = nullptr;
    std::vector<unsigned char> seq_par_set_;  // as they stand
    std::vector<unsigned char> pic_par_set_;
    ParameterSets parameter_sets_;
    StreamTally tally_;
    std::vector<PictureRecord> records_;  // for the report
};

}  // namespace zolt
