#include "libav/ScaledSource.h"

#include <algorithm>

#include "io/ToolError.h"
#include "libav/frames.h"
#include "libav/make_scaler.h"

namespace zolt {
namespace {

constexpr int kMultiple = 16;
int nearest_side(int side) {
    return std::max(kMultiple, (side + kMultiple / 2) / kMultiple * kMultiple);
}

}  // namespace

ScaledSource::ScaledSource(std::unique_ptr<FrameSource> source)
    : FilteredSource(std::move(source)),
      original_(this->source().format()),
      result_{original_.fourcc_code, nearest_side(original_.width), nearest_side(original_.height)},
      picture_(original_.sample_bytes()) {
    const std::string error = PictureFormat::size_error(result_.width, result_.height);
    if (!error.empty()) {
        throw ToolError(name() + ": scaled to multiples of 16, its " + error +
                        "; take --fit crop instead");
    }
    const AVPixelFormat pixels = pixel_format_of(original_.fourcc_code);
    if (pixels == AV_PIX_FMT_NONE) {
        throw ToolError(name() +
                        ": AYUV pictures cannot be scaled; take --fit pad or crop instead");
    }
    scaler_ = make_scaler({original_.width, original_.height, pixels},
                          {result_.width, result_.height, pixels}, AVCOL_SPC_UNSPECIFIED);
    frame_ = new_frame(original_);
    scaled_ = new_frame(result_);
}

VideoTraits ScaledSource::traits() const {
    VideoTraits traits = source().traits();
    const bool is_stated = traits.sar_width > 0 && traits.sar_height > 0;
    constexpr int kMaxTerm = 65535;
    av_reduce(&traits.sar_width, &traits.sar_height,
              std::int64_t{is_stated ? traits.sar_width : 1} * original_.width * result_.height,
              std::int64_t{is_stated ? traits.sar_height : 1} * original_.height * result_.width,
              kMaxTerm);
    return traits;
}

bool ScaledSource::read(std::vector<unsigned char>& sample) {
    if (!source().read(picture_)) {
        return false;
    }
    copy_picture(picture_.data(), original_, *frame_);
    sws_scale(scaler_.get(), frame_->data, frame_->linesize, 0, original_.height, scaled_->data,
              scaled_->linesize);
    copy_picture(*scaled_, result_, sample.data());
    return true;
}

}  // namespace zolt
