#pragma once

#include <vector>

namespace zolt {

// The `size` bytes of a NAL unit (header byte first) without their emulation prevention bytes,
// clause 7.3.1: what the syntax of parameter sets and slice headers is read from. Stops after
// max_bytes bytes of result.
std::vector<unsigned char> rbsp_bytes(const unsigned char* nal, int size, int max_bytes);

}  // namespace zolt
