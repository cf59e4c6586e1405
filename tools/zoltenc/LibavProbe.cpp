#include "zoltenc/LibavProbe.h"

#include <algorithm>
#include <cstdlib>
#include <map>
#include <new>
#include <utility>

#include "io/ToolError.h"
#include "libav/QualityMeter.h"

namespace zolt {
namespace {

constexpr int kMacroblockSide = 16;
constexpr std::size_t kMostPictures = 6;
// Pictures over the whole stream from which those that the others leave room for are taken.
constexpr std::size_t kMostSpread = 8;
// Twelve of these, written in base 64, leave room for the rest in a page of 3 MB.
constexpr std::size_t kMostJpegBytes = 90000;

}  // namespace

LibavProbe::LibavProbe(const PictureFormat& format, const VideoTraits& traits, bool keep_pictures)
    : colour_(traits.colour),
      converter_(ColorConverter::GetNewColorConverter(format.width, format.height,
                                                      format.fourcc_code, ColorConverter::kIYUV,
                                                      kMacroblockSide, kMacroblockSide)),
      source_(av_frame_alloc()),
      decoder_(keep_pictures),
      keep_pictures_(keep_pictures) {
    if (!converter_ || !source_) {
        throw std::bad_alloc();
    }
    const int width = converter_->GetOutputWidth();
    const int height = converter_->GetOutputHeight();
    source_->format = AV_PIX_FMT_YUV420P;
    source_->width = width;
    source_->height = height;
    source_->linesize[0] = width;
    source_->linesize[1] = source_->linesize[2] = width / 2;
    source_->data[0] = converter_->GetOutputBuffer();
    source_->data[1] = source_->data[0] + static_cast<std::ptrdiff_t>(width) * height;
    source_->data[2] = source_->data[1] + static_cast<std::ptrdiff_t>(width / 2) * (height / 2);
}

void LibavProbe::begin(const std::vector<unsigned char>& seq_par_set,
                       const std::vector<unsigned char>& pic_par_set) {
    decoder_.begin(seq_par_set, pic_par_set);
}

void LibavProbe::look(const unsigned char* source, const CodedPicture& picture,
                      PictureRecord& record) {
    converter_->Convert(source);
    const AVFrame& decoded = decoder_.decode(picture.nal, picture.size);
    if (decoded.width != source_->width || decoded.height != source_->height ||
        decoded.format != AV_PIX_FMT_YUV420P) {
        throw ToolError("picture " + std::to_string(record.index) +
                        ": decodes to another size or format than the one that was coded");
    }
    record.quality = QualityMeter::compare(*source_, decoded);
    if (keep_pictures_) {
        keep(record, decoded);
    }
}

std::vector<ReportPicture> LibavProbe::pictures() {
    std::map<std::int64_t, std::pair<const Kept*, std::string>> chosen;  // with the reasons
    for (const auto* picture : {&first_, &worst_, &largest_}) {
        if (*picture) {
            auto& [kept, reasons] = chosen[(*picture)->record.index];
            kept = &**picture;
            reasons += (reasons.empty() ? "" : ", ") + kept->reason;
        }
    }
    // The rest are those that are furthest from any that is in already.
    const auto distance = [&chosen](const Kept& candidate) {
        std::int64_t nearest = INT64_MAX;
        for (const auto& [index, other] : chosen) {
            nearest = std::min(nearest, std::abs(candidate.record.index - index));
        }
        return nearest;
    };
    while (!spread_.empty() && chosen.size() < kMostPictures) {
        const auto furthest = std::max_element(
            spread_.begin(), spread_.end(),
            [&](const Kept& a, const Kept& b) { return distance(a) < distance(b); });
        if (distance(*furthest) == 0) {
            break;
        }
        chosen[furthest->record.index] = {&*furthest, furthest->reason};
    }
    std::vector<ReportPicture> result;
    for (const auto& [index, choice] : chosen) {
        const auto& [picture, reasons] = choice;
        result.push_back({picture->record, reasons, source_->width, source_->height,
                          picture->input.jpeg(kMostJpegBytes), picture->output.jpeg(kMostJpegBytes),
                          picture->map});
    }
    return result;
}

void LibavProbe::keep(const PictureRecord& record, const AVFrame& decoded) {
    if (!first_) {
        first_.emplace(kept(record, decoded, "the first picture"));
    }
    if (!worst_ || record.quality->mse_y > worst_->record.quality->mse_y) {
        worst_.emplace(kept(record, decoded, "the lowest PSNR"));
    }
    if (!record.is_key && (!largest_ || record.bytes > largest_->record.bytes)) {
        largest_.emplace(kept(record, decoded, "the largest predicted picture"));
    }
    if (record.index % spread_step_ != 0) {
        return;
    }
    if (spread_.size() == kMostSpread) {
        spread_step_ *= 2;
        const auto out = std::remove_if(
            spread_.begin(), spread_.end(),
            [this](const Kept& picture) { return picture.record.index % spread_step_ != 0; });
        spread_.erase(out, spread_.end());
    }
    if (record.index % spread_step_ == 0) {
        spread_.push_back(kept(record, decoded, "in between"));
    }
}

LibavProbe::Kept LibavProbe::kept(const PictureRecord& record, const AVFrame& decoded,
                                  const char* reason) const {
    return {record, reason, Thumbnail(*source_, colour_), Thumbnail(decoded, colour_),
            decoder_.map()};
}

}  // namespace zolt
