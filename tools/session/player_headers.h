#pragma once

#include <vector>

#include "io/PictureSink.h"
#include "io/VideoTraits.h"

namespace zolt {

// How the coded samples of pictures of a colour format stand for colours, given what is known of
// the pictures.
ColourDescription coded_colour(int fourcc_code, const ColourDescription& known);

// The stream's sequence parameter set with what players want to know and the encoder does not tell;
// empty when the encoder's cannot be read.
std::vector<unsigned char> player_seq_par_set(const StreamDescription& stream);

}  // namespace zolt
