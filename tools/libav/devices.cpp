#include "libav/devices.h"

#include <algorithm>

extern "C" {
#include <libavdevice/avdevice.h>
#include <libavutil/avstring.h>
}

namespace zolt {

std::vector<const AVInputFormat*> devices() {
    std::vector<const AVInputFormat*> found;
    for (const AVInputFormat* next = av_input_video_device_next(nullptr); next != nullptr;
         next = av_input_video_device_next(next)) {
        found.push_back(next);
    }
    return found;
}

const AVInputFormat* find_device(const std::string& name) {
    for (const AVInputFormat* const device : devices()) {
        if (av_match_name(name.c_str(), device->name) != 0) {
            return device;
        }
    }
    return nullptr;
}

}  // namespace zolt
