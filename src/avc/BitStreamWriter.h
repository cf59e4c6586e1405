#pragma once

#include <cstdint>
#include <vector>

namespace zolt {

// Writes bits and Exp-Golomb codes into a growing string of bytes, most significant bit first.
class BitStreamWriter {
public:
    // u(count), count 0..64: the low bits of `value`.
    BitStreamWriter& u(int count, std::uint64_t value);

    // ue(v) and se(v), clause 9.1.
    BitStreamWriter& ue(std::uint64_t value);
    BitStreamWriter& se(std::int64_t value);

    // Stop bit and alignment, clause 7.3.2.11.
    BitStreamWriter& trailing();

    long num_bits() const { return num_bits_; }
    const std::vector<unsigned char>& bytes() const { return bytes_; }

    // The bytes as a NAL unit carries them: with emulation prevention, clause 7.3.1.
    std::vector<unsigned char> escaped() const;

private:
    std::vector<unsigned char> bytes_;
    long num_bits_ = 0;
};

}  // namespace zolt
