#include "libav/FrameConverter.h"

#include "io/ToolError.h"
#include "libav/frames.h"
#include "libav/make_scaler.h"

namespace zolt {
FrameConverter::FrameConverter(const AVFrame& first, const std::string& name)
    : is_rgb_(holds_rgb(first.format)) {
    const std::string error = PictureFormat::size_error(first.width, first.height);
    if (!error.empty()) {
        throw ToolError(name + ": " + error);
    }
    const int converted = is_rgb_ ? fourcc("RGB ") : PictureFormat::kIyuv;
    format_ = {fourcc_of(first.format).value_or(converted), first.width, first.height};
}

void FrameConverter::convert(const AVFrame& frame, unsigned char* sample) {
    copy_picture(is_direct(frame) ? frame : scaled(frame), format_, sample);
}

bool FrameConverter::is_direct(const AVFrame& frame) const {
    return fourcc_of(frame.format) == format_.fourcc_code && has_size(frame);
}

const AVFrame& FrameConverter::scaled(const AVFrame& frame) {
    if (!scaler_input_ || scaler_input_->width != frame.width ||
        scaler_input_->height != frame.height || scaler_input_->format != frame.format ||
        scaler_input_->matrix != frame.colorspace) {
        scaler_ = make_scaler({frame.width, frame.height, static_cast<AVPixelFormat>(frame.format)},
                              {format_.width, format_.height, pixel_format_of(format_.fourcc_code)},
                              frame.colorspace);
        scaler_input_ = {frame.width, frame.height, frame.format, frame.colorspace};
    }
    if (!scaled_) {
        scaled_ = new_frame(format_);
    }
    sws_scale(scaler_.get(), frame.data, frame.linesize, 0, frame.height, scaled_->data,
              scaled_->linesize);
    return *scaled_;
}

}  // namespace zolt
