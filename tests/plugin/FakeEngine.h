#pragma once

#include <string>
#include <vector>

// An engine that codes nothing takes the place of the encoder in programs that link this: it notes
// what the session asks of it. Its NAL units are one header byte, of an IDR slice for every first
// frame of an intra period, and one byte with the frame's number.
struct FakeEngine {
    static std::vector<std::string> calls;    // "bit_rate 200000", "encode", ...
    static std::vector<unsigned char> frame;  // the picture that was last encoded
    static const void* address;               // where it stood
    static int alive;                         // engines that exist

    // The calls since the last one of this, each with a blank behind it.
    static std::string take_calls();
};
