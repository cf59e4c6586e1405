#include "libav/ScaledSource.h"

#include <algorithm>
#include <array>

#include "io/ToolError.h"
#include "libav/frames.h"
#include "libav/make_scaler.h"

namespace zolt {
namespace {

constexpr int kMultiple = 16;
// libswscale reads rows in steps of vectors.
constexpr std::size_t kOverread = 64;

int nearest_side(int side) {
    return std::max(kMultiple, (side + kMultiple / 2) / kMultiple * kMultiple);
}

// A side that the scaler takes: in 4:2:0 and 4:2:2, a sample's half pairs have no chroma.
int whole_pairs(int side, const PictureFormat& format) {
    const bool has_pairs =
        format.fourcc_code == PictureFormat::kIyuv || format.fourcc_code == PictureFormat::kYuy2;
    return has_pairs ? side / 2 * 2 : side;
}

}  // namespace

ScaledSource::ScaledSource(std::unique_ptr<FrameSource> source)
    : FilteredSource(std::move(source)),
      original_(this->source().format()),
      result_{original_.fourcc_code, nearest_side(original_.width), nearest_side(original_.height)},
      picture_(original_.sample_bytes() + kOverread) {
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
    scaler_ = make_scaler(
        {whole_pairs(original_.width, original_), whole_pairs(original_.height, original_), pixels},
        {result_.width, result_.height, pixels}, AVCOL_SPC_UNSPECIFIED);
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

bool ScaledSource::read(unsigned char* sample) {
    if (!source().read(picture_.data())) {
        return false;
    }
    std::array<const std::uint8_t*, 4> planes = {};
    std::array<int, 4> row_bytes = {};
    const unsigned char* next = picture_.data();
    int count = 0;
    for (const PictureFormat::Plane& plane : original_.planes()) {
        planes[count] = next;
        row_bytes[count++] = static_cast<int>(plane.row_bytes);
        next += plane.rows * plane.row_bytes;
    }
    sws_scale(scaler_.get(), planes.data(), row_bytes.data(), 0,
              whole_pairs(original_.height, original_), scaled_->data, scaled_->linesize);
    copy_picture(*scaled_, result_, sample);
    return true;
}

}  // namespace zolt
