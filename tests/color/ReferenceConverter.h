#pragma once

#include <vector>

using Picture = std::vector<unsigned char>;

struct Size {
    int width, height;
};

// The eight colour formats, in no particular order.
extern const std::vector<int> kAllFormats;

// Bytes of a picture.
int picture_size(Size size, int format);

// What a colour converter makes of `source`: one output sample at a time, each from the pixels that
// it stands for, in double arithmetic.
Picture reference_convert(const Picture& source, Size source_size, int source_format,
                          Size output_size, int result_format);
