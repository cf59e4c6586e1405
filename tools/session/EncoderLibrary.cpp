#include "session/EncoderLibrary.h"

#include "io/ToolError.h"
#include "media/IMediaEncoder.h"
#include "media/MediaType.h"
#include "support/dl.h"

namespace zolt {
namespace {

// Without a directory in its name, dlopen would look for the file where the system's libraries are.
std::string as_path(const std::string& file_name) {
    const char separators[] = {'/', kDirSeparator, '\0'};
    return file_name.find_first_of(separators) == std::string::npos ? "./" + file_name : file_name;
}

}  // namespace

EncoderLibrary::EncoderLibrary(const std::string& file_name, const std::string& remedy, Place place)
    : file_name_(file_name),
      handle_(dlopen((place == Place::kFile ? as_path(file_name) : file_name).c_str(), RTLD_NOW),
              dlclose) {
    if (!handle_) {
        throw ToolError(file_name + ": cannot be loaded as the encoder library (" + dlerror() +
                        "); " + remedy);
    }
    const auto get_encoder_type = find<int (*)()>("GetEncoderType");
    get_encoder_name_ = find<const char* (*)()>("GetEncoderName");
    get_new_encoder_ = find<IMediaEncoder* (*)()>("GetNewEncoder");
    const int type = get_encoder_type();
    if (type != MediaType::kVideoAvc) {
        throw ToolError(file_name + ": is an encoder of type " + MediaType::ToString(type) +
                        ", not " + MediaType::ToString(MediaType::kVideoAvc));
    }
}

EncoderLibrary::~EncoderLibrary() = default;

std::unique_ptr<IMediaEncoder, Delete> EncoderLibrary::new_encoder() const {
    std::unique_ptr<IMediaEncoder, Delete> encoder(get_new_encoder_());
    if (!encoder) {
        throw ToolError(file_name_ + ": gives no encoder object");
    }
    return encoder;
}

template <class Function>
Function EncoderLibrary::find(const char* name) const {
    void* const address = dlsym(handle_.get(), name);
    if (address == nullptr) {
        throw ToolError(file_name_ + ": is no encoder library: it does not export " + name);
    }
    return reinterpret_cast<Function>(address);
}

}  // namespace zolt
