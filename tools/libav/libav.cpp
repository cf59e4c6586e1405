#include "libav/libav.h"

extern "C" {
#include <libavutil/log.h>
}

namespace zolt {

std::string libav_error(int result) {
    char text[AV_ERROR_MAX_STRING_SIZE] = "";
    av_strerror(result, text, sizeof text);
    return text;
}

void libav_prepare(bool verbose) {
    av_log_set_level(verbose ? AV_LOG_WARNING : AV_LOG_QUIET);
}

}  // namespace zolt
