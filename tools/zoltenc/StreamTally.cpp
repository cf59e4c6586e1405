#include "zoltenc/StreamTally.h"

#include <algorithm>

namespace zolt {
namespace {

double kilobits(std::int64_t bytes) {
    return static_cast<double>(bytes) * 8 / 1000;
}

}  // namespace

void StreamTally::add(PictureRecord& picture) {
    // Times are sums of rounded numbers: a picture that begins a second ago does not count.
    constexpr double kWindow = 1;
    constexpr double kRounding = 1e-6;
    if (frames_ == 0) {
        start_ = picture.start;
    }
    ++frames_;
    key_frames_ += picture.is_key ? 1 : 0;
    bytes_ += picture.bytes;
    end_ = std::max(end_, picture.start + picture.duration);

    last_second_.push_back({picture.start, picture.bytes});
    last_second_bytes_ += picture.bytes;
    while (last_second_.size() > 1 && last_second_.front().start < end_ - kWindow - kRounding) {
        last_second_bytes_ -= last_second_.front().bytes;
        last_second_.pop_front();
    }
    const double covered = end_ - last_second_.front().start;
    last_second_kbs_ = covered > 0 ? kilobits(last_second_bytes_) / covered : 0;
    picture.last_second_kbs = last_second_kbs_;

    if (picture.qp) {
        least_qp_ = with_qp_ == 0 ? *picture.qp : std::min(least_qp_, *picture.qp);
        most_qp_ = with_qp_ == 0 ? *picture.qp : std::max(most_qp_, *picture.qp);
        qp_sum_ += *picture.qp;
        ++with_qp_;
    }
    if (picture.quality) {
        quality_sum_.mse_y += picture.quality->mse_y;
        quality_sum_.mse_u += picture.quality->mse_u;
        quality_sum_.mse_v += picture.quality->mse_v;
        quality_sum_.ssim_y += picture.quality->ssim_y;
        ++with_quality_;
    }
}

double StreamTally::kilobits_per_second() const {
    return stream_seconds() > 0 ? kilobits(bytes_) / stream_seconds() : 0;
}

std::optional<StreamTally::QpRange> StreamTally::qp() const {
    if (frames_ == 0 || with_qp_ < frames_) {
        return std::nullopt;
    }
    return QpRange{least_qp_, most_qp_,
                   static_cast<double>(qp_sum_) / static_cast<double>(with_qp_)};
}

std::optional<PictureQuality> StreamTally::quality() const {
    if (frames_ == 0 || with_quality_ < frames_) {
        return std::nullopt;
    }
    const auto count = static_cast<double>(with_quality_);
    return PictureQuality{quality_sum_.mse_y / count, quality_sum_.mse_u / count,
                          quality_sum_.mse_v / count, quality_sum_.ssim_y / count};
}

}  // namespace zolt
