#pragma once

#include <gst/video/video.h>

namespace zolt {
class H264Element;
}

// The element zolth264enc. What it does is in its H264Element.
struct GstZoltH264Enc {
    GstVideoEncoder parent;
    zolt::H264Element* impl;  // owned
};

struct GstZoltH264EncClass {
    GstVideoEncoderClass parent_class;
};

GType gst_zolt_h264_enc_get_type();
GST_ELEMENT_REGISTER_DECLARE(zolth264enc);
