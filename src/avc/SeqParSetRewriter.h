#pragma once

#include <cstdint>
#include <vector>

#include "avc/VuiParameters.h"

namespace zolt {

// Tells players what an encoder's sequence parameter set leaves open: the level that the stream
// needs, the part of the pictures to be shown, and the VUI parameters. Whatever slices depend on
// stays as it is.
class SeqParSetRewriter {
public:
    struct Properties {
        // The left upper part of the coded pictures that is shown, luma samples; 0: all of it. An
        // odd side of 4:2:0 pictures is shown with one more sample: that is what cropping counts.
        int shown_width = 0;
        int shown_height = 0;
        std::int64_t bit_rate_kbs = 0;  // 0: not known
        // max_dec_frame_buffering is raised to the set's max_num_ref_frames. Where the time is not
        // known, pictures of any rate are taken to fit a level.
        VuiParameters vui;
    };

    explicit SeqParSetRewriter(const Properties& properties) : properties_(properties) {}

    // Takes a NAL unit (header byte first, with emulation prevention) and gives the one to write in
    // its place; an empty one when the set is damaged.
    std::vector<unsigned char> rewrite(const unsigned char* nal, int size) const;

private:
    Properties properties_;
};

}  // namespace zolt
