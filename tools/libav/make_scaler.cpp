#include "libav/make_scaler.h"

#include <string>

extern "C" {
#include <libavutil/pixdesc.h>
}

#include "io/ToolError.h"

namespace zolt {
namespace {

// The formats with "full range" in their names are the others with a declaration, for which
// libswscale has a warning.
AVPixelFormat without_range(AVPixelFormat format) {
    switch (format) {
        case AV_PIX_FMT_YUVJ411P:
            return AV_PIX_FMT_YUV411P;
        case AV_PIX_FMT_YUVJ420P:
            return AV_PIX_FMT_YUV420P;
        case AV_PIX_FMT_YUVJ422P:
            return AV_PIX_FMT_YUV422P;
        case AV_PIX_FMT_YUVJ440P:
            return AV_PIX_FMT_YUV440P;
        case AV_PIX_FMT_YUVJ444P:
            return AV_PIX_FMT_YUV444P;
        default:
            return format;
    }
}

}  // namespace

LibavPtr<SwsContext> make_scaler(const ScalerPicture& from, const ScalerPicture& to,
                                 AVColorSpace matrix) {
    constexpr int kFlags =
        SWS_BICUBIC | SWS_ACCURATE_RND | SWS_BITEXACT | SWS_FULL_CHR_H_INP | SWS_FULL_CHR_H_INT;
    LibavPtr<SwsContext> scaler(sws_getContext(from.width, from.height, without_range(from.format),
                                               to.width, to.height, without_range(to.format),
                                               kFlags, nullptr, nullptr, nullptr));
    if (!scaler) {
        const char* const name = av_get_pix_fmt_name(from.format);
        throw ToolError("pictures of the format " + std::string(name == nullptr ? "?" : name) +
                        " cannot be converted");
    }
    // The same range on both sides keeps the samples; full, because libswscale takes grey for that
    // whatever it is told. The numbers of matrices are those of libswscale's tables.
    const int* const coefficients = sws_getCoefficients(matrix);
    constexpr int kFullRange = 1;
    constexpr int kOne = 1 << 16;
    sws_setColorspaceDetails(scaler.get(), coefficients, kFullRange, coefficients, kFullRange, 0,
                             kOne, kOne);
    return scaler;
}

}  // namespace zolt
