#pragma once

#include <cstdint>
#include <vector>

class BitStreamReader;

namespace zolt {

// The `size` bytes of a NAL unit (header byte first) without their emulation prevention bytes,
// clause 7.3.1: what the syntax of parameter sets and slice headers is read from. Stops after
// max_bytes bytes of result.
std::vector<unsigned char> rbsp_bytes(const unsigned char* nal, int size, int max_bytes);

// ue(v), clause 9.1, in 32 bits; only codes that are no valid syntax element exceed them.
std::uint32_t read_ue(BitStreamReader& reader);

// A field whose width is given by a log2_..._minus4 element; 0 for a width that no stream has.
std::uint32_t read_log2_field(BitStreamReader& reader, std::uint32_t log2_minus4);

}  // namespace zolt
