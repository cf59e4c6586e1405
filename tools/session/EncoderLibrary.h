#pragma once

#include <memory>
#include <string>

#include "media/abi.h"

class IMediaEncoder;

namespace zolt {

// An encoder plug-in: a shared library with the exports GetEncoderType, GetEncoderName and
// GetNewEncoder. Its encoders must be gone before this object is.
class EncoderLibrary {
public:
    enum class Place {
        kFile,   // the name is a file's
        kSystem  // the file is where the system's libraries are
    };

    // Throws a ToolError that names the file when it cannot be loaded or is no AVC encoder.
    // `remedy` ends the message of the former: what the user can do.
    EncoderLibrary(const std::string& file_name, const std::string& remedy,
                   Place place = Place::kFile);
    ~EncoderLibrary();
    EncoderLibrary(const EncoderLibrary&) = delete;
    EncoderLibrary& operator=(const EncoderLibrary&) = delete;

    const std::string& file_name() const { return file_name_; }

    // The encoder's display name.
    const char* encoder_name() const { return get_encoder_name_(); }

    std::unique_ptr<IMediaEncoder, Delete> new_encoder() const;

private:
    template <class Function>
    Function find(const char* name) const;

    std::string file_name_;
    std::unique_ptr<void, int (*)(void*)> handle_;
    const char* (*get_encoder_name_)() = nullptr;
    IMediaEncoder* (*get_new_encoder_)() = nullptr;
};

}  // namespace zolt
