#pragma once

#include <optional>

#include "io/OutputFile.h"
#include "zoltenc/JsonObject.h"

namespace zolt {

// What programs read of a run: one JSON object a line, on standard output, or on standard error
// where the stream itself goes to standard output.
class JsonLines {
public:
    // Takes hold of standard output: to be made before that is diverted.
    explicit JsonLines(bool on_standard_error);

    void write(const JsonObject& object);

private:
    std::optional<OutputFile> output_;  // nothing: standard error
};

}  // namespace zolt
