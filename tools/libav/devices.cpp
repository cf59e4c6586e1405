#include "libav/devices.h"

#include <dlfcn.h>

#include <algorithm>

#include "io/ToolError.h"

extern "C" {
#include <libavdevice/avdevice.h>
#include <libavutil/avstring.h>
}

namespace zolt {
namespace {

// libavdevice brings up more than a hundred libraries of windows, sound and cameras, which takes
// longer than to code a short clip; so it is loaded when somebody asks for devices. Never unloaded.
class DeviceLibrary {
public:
    DeviceLibrary() {
        constexpr const char* kName = "libavdevice.so." AV_STRINGIFY(LIBAVDEVICE_VERSION_MAJOR);
        handle_ = dlopen(kName, RTLD_NOW);
        if (handle_ == nullptr) {
            throw ToolError(std::string("cannot load the library of devices: ") + dlerror());
        }
        function<decltype(avdevice_register_all)>("avdevice_register_all")();
        next_video_ = function<decltype(av_input_video_device_next)>("av_input_video_device_next");
    }

    const AVInputFormat* next_video(const AVInputFormat* device) const {
        return next_video_(device);
    }

private:
    template <typename Function>
    Function* function(const char* name) const {
        void* const found = dlsym(handle_, name);
        if (found == nullptr) {
            throw ToolError(std::string("the library of devices lacks a function: ") + dlerror());
        }
        return reinterpret_cast<Function*>(found);
    }

    void* handle_ = nullptr;
    decltype(&av_input_video_device_next) next_video_ = nullptr;
};

}  // namespace

std::vector<const AVInputFormat*> devices() {
    static const DeviceLibrary library;
    std::vector<const AVInputFormat*> found;
    for (const AVInputFormat* next = library.next_video(nullptr); next != nullptr;
         next = library.next_video(next)) {
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
