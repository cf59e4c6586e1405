#include "Film.h"

#include <cstdlib>

#include "common/Sequence.h"

namespace zolt_bench {
namespace {

constexpr int kPictures = 16;
constexpr int kWindowWidth = 352, kWindowHeight = 288;
constexpr char kClip[] = "street";

zolt_test::Sequence load_source() {
    if (const char* folder = std::getenv("ZOLT_TEST_CLIPS")) {
        for (const zolt_test::Clip& clip : zolt_test::clips()) {
            if (clip.name == std::string(kClip)) {
                return zolt_test::load_clip(folder, clip, 0, kPictures);
            }
        }
    }
    return zolt_test::generated("zoom", kWindowWidth, kWindowHeight, kPictures);
}

// Fills a plane with copies of a window, whose first sample is at `window`.
void tile(const std::uint8_t* window, int window_stride, int window_width, int window_height,
          std::uint8_t* plane, int width, int height) {
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            plane[y * width + x] = window[y % window_height * window_stride + x % window_width];
        }
    }
}

}  // namespace

Film::Film(int width, int height)
    : picture_size_(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 3 / 2) {
    const zolt_test::Sequence source = load_source();
    std::vector<std::uint8_t> whole(source.picture_size());
    for (int n = 0; n < kPictures; ++n) {
        source.draw(n, whole.data());
        pictures_.emplace_back(picture_size_);
        const std::uint8_t* from = whole.data();
        std::uint8_t* to = pictures_.back().data();
        for (int plane = 0; plane < 3; ++plane) {
            const int scale = plane == 0 ? 1 : 2;
            const int stride = source.width / scale;
            const int left = (source.width - kWindowWidth) / 2 / scale;
            const int top = (source.height - kWindowHeight) / 2 / scale;
            tile(from + top * stride + left, stride, kWindowWidth / scale, kWindowHeight / scale,
                 to, width / scale, height / scale);
            from += stride * (source.height / scale);
            to += (width / scale) * (height / scale);
        }
    }
}

const std::uint8_t* Film::picture(int n) const {
    constexpr int kPeriod = 2 * (kPictures - 1);
    const int position = n % kPeriod;
    const int index = position < kPictures ? position : kPeriod - position;
    return pictures_[static_cast<std::size_t>(index)].data();
}

}  // namespace zolt_bench
