#pragma once

#include <cstdint>
#include <vector>

namespace zolt {

// Writes bits and Exp-Golomb codes into a growing string of bytes, most significant bit first.
class BitWriter {
public:
    BitWriter& u(int count, std::uint64_t value) {
        for (int bit = count - 1; bit >= 0; --bit) {
            if (num_bits_ % 8 == 0) {
                bytes_.push_back(0);
            }
            const unsigned set = value >> bit & 1;
            bytes_.back() = static_cast<unsigned char>(bytes_.back() | set << (7 - num_bits_ % 8));
            ++num_bits_;
        }
        return *this;
    }

    BitWriter& ue(std::uint64_t value) {
        int zeros = 0;
        while ((value + 1) >> (zeros + 1) != 0) {
            ++zeros;
        }
        return u(zeros, 0).u(1, 1).u(zeros, value + 1 - (std::uint64_t{1} << zeros));
    }

    BitWriter& se(std::int64_t value) {
        return ue(value > 0 ? static_cast<std::uint64_t>(2 * value - 1)
                            : static_cast<std::uint64_t>(-2 * value));
    }

    // Stop bit and alignment.
    BitWriter& trailing() {
        u(1, 1);
        return u(static_cast<int>((8 - num_bits_ % 8) % 8), 0);
    }

    long num_bits() const { return num_bits_; }
    const std::vector<unsigned char>& bytes() const { return bytes_; }

    // The bytes as a NAL unit carries them: with emulation prevention (clause 7.3.1).
    std::vector<unsigned char> escaped() const {
        std::vector<unsigned char> result;
        int zeros = 0;
        for (const unsigned char byte : bytes_) {
            if (zeros == 2 && byte <= 3) {
                result.push_back(3);
                zeros = 0;
            }
            zeros = byte == 0 ? zeros + 1 : 0;
            result.push_back(byte);
        }
        return result;
    }

private:
    std::vector<unsigned char> bytes_;
    long num_bits_ = 0;
};

}  // namespace zolt
