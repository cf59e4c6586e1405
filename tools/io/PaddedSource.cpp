#include "io/PaddedSource.h"

#include <utility>

#include "io/ToolError.h"

namespace zolt {

PaddedSource::PaddedSource(std::unique_ptr<FrameSource> source)
    : FilteredSource(std::move(source)),
      original_(this->source().format()),
      padded_(original_.padded()),
      packer_(original_, padded_),
      picture_(original_.sample_bytes()) {
    const std::string error = PictureFormat::size_error(padded_.width, padded_.height);
    if (!error.empty()) {
        throw ToolError(name() + ": padded to multiples of 16, its " + error +
                        "; take --fit crop instead");
    }
}

VideoTraits PaddedSource::traits() const {
    VideoTraits traits = source().traits();
    traits.shown_width = original_.width;
    traits.shown_height = original_.height;
    return traits;
}

bool PaddedSource::read(std::vector<unsigned char>& sample) {
    if (!source().read(picture_)) {
        return false;
    }
    std::vector<PicturePacker::Rows> planes;
    const unsigned char* row = picture_.data();
    for (const PictureFormat::Plane& plane : original_.planes()) {
        planes.push_back(
            {row, static_cast<std::ptrdiff_t>(plane.row_bytes), plane.rows, plane.row_bytes});
        row += plane.rows * plane.row_bytes;
    }
    packer_.pack(planes, sample.data());
    return true;
}

}  // namespace zolt
