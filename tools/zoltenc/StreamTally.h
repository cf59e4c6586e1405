#pragma once

#include <cstdint>
#include <deque>
#include <optional>

#include "zoltenc/PictureRecord.h"

namespace zolt {

// Sums over the pictures of a stream. Bit rates count the pictures' NAL units over the time that
// the pictures are shown.
class StreamTally {
public:
    // The next picture; sets its last_second_kbs.
    void add(PictureRecord& picture);

    std::int64_t frames() const { return frames_; }
    std::int64_t key_frames() const { return key_frames_; }

    double stream_seconds() const { return end_ - start_; }
    double kilobits_per_second() const;
    double last_second_kbs() const { return last_second_kbs_; }

    struct QpRange {
        int least, most;
        double mean;
    };
    // Nothing unless every picture has told.
    std::optional<QpRange> qp() const;

    // The means over the pictures; nothing unless every picture has one.
    std::optional<PictureQuality> quality() const;

private:
    struct Share {
        double start;
        std::int64_t bytes;
    };

    std::int64_t frames_ = 0;
    std::int64_t key_frames_ = 0;
    std::int64_t bytes_ = 0;
    double start_ = 0;  // seconds
    double end_ = 0;
    std::deque<Share> last_second_;
    std::int64_t last_second_bytes_ = 0;
    double last_second_kbs_ = 0;
    std::int64_t with_qp_ = 0;
    int least_qp_ = 0;
    int most_qp_ = 0;
    std::int64_t qp_sum_ = 0;
    std::int64_t with_quality_ = 0;
    PictureQuality quality_sum_;
};

}  // namespace zolt
