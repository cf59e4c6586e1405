#pragma once

#include <cstdint>
#include <optional>

#include "io/PictureQuality.h"

namespace zolt {

// What is known of one coded picture.
struct PictureRecord {
    std::int64_t index = 0;
    std::int64_t time = 0;   // microseconds
    double start = 0;        // seconds
    double duration = 0;     // seconds
    std::int64_t bytes = 0;  // of its NAL unit
    bool is_key = false;
    char type = '\0';       // I or P; nothing where the slice is damaged
    std::optional<int> qp;  // of its slice; nothing likewise
    std::optional<PictureQuality> quality;
    double last_second_kbs = 0;  // kbit/s of the second of the stream that ends with the picture
};

}  // namespace zolt
