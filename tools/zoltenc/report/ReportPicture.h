#pragma once

#include <string>
#include <vector>

#include "io/MacroblockMap.h"
#include "zoltenc/PictureRecord.h"

namespace zolt {

// A picture of the stream that the report shows.
struct ReportPicture {
    PictureRecord record;
    std::string reason;  // why this one, such as "lowest PSNR"
    int width = 0;       // of the coded picture, luma samples
    int height = 0;
    // JPEG files, smaller than the picture where that is large: what the encoder was given, and
    // what a player shows.
    std::vector<unsigned char> input;
    std::vector<unsigned char> output;
    MacroblockMap map;
};

}  // namespace zolt
