#pragma once

#include <gst/gst.h>

// Where the element's lines of the debug log belong.
GST_DEBUG_CATEGORY_EXTERN(zolt_h264_enc_debug);
#define GST_CAT_DEFAULT zolt_h264_enc_debug
