#pragma once

#include <optional>
#include <string>

#include "io/PictureFormat.h"
#include "libav/libav.h"

namespace zolt {

// Brings a decoder's frames to the nearest of the formats that the encoder takes, by copying rows
// where a frame is in one of them and through libswscale otherwise. Range and matrix stay: what is
// YUV is not taken for other colours, and what is RGB becomes packed RGB.
class FrameConverter {
public:
    // For frames like `first`; later ones of another size or format are made like it. Throws a
    // ToolError when the size cannot be coded.
    FrameConverter(const AVFrame& first, const std::string& name);

    const PictureFormat& format() const { return format_; }

    // Whether what the colours stand for is up to the encoder's own conversion.
    bool is_rgb() const { return is_rgb_; }

    // Whether the frame has the size of the first.
    bool has_size(const AVFrame& frame) const {
        return frame.width == format_.width && frame.height == format_.height;
    }

    // Writes the picture of a frame, format().sample_bytes() long.
    void convert(const AVFrame& frame, unsigned char* sample);

private:
    bool is_direct(const AVFrame& frame) const;
    const AVFrame& scaled(const AVFrame& frame);

    PictureFormat format_;
    bool is_rgb_;

    // What the scaler was made for.
    struct ScalerInput {
        int width;
        int height;
        int format;
        AVColorSpace matrix;
    };
    std::optional<ScalerInput> scaler_input_;
    LibavPtr<SwsContext> scaler_;
    LibavPtr<AVFrame> scaled_;
};

}  // namespace zolt
