#include "zoltenc/JsonLines.h"

#include <cstdio>

namespace zolt {

JsonLines::JsonLines(bool on_standard_error) {
    if (!on_standard_error) {
        output_.emplace("-");
    }
}

void JsonLines::write(const JsonObject& object) {
    const std::string line = object.text() + "\n";
    if (output_) {
        output_->write(line.data(), line.size());
    } else {
        std::fputs(line.c_str(), stderr);
    }
}

}  // namespace zolt
