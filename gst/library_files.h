#pragma once

#include <memory>
#include <string>

#include "session/EncoderLibrary.h"
#include "session/HostServices.h"

namespace zolt {

// The services that encoder libraries find in this process: those of the library beside the
// element's file, else in its parent directory, else in the parent's folder "zolt".
const HostServices& element_services();

// The encoder library of the file `plugin_path`; for an empty name of the one beside the element's
// file, else in its parent directory, else where the system's libraries are. Throws a ToolError.
std::unique_ptr<EncoderLibrary> open_encoder_library(const std::string& plugin_path);

}  // namespace zolt
