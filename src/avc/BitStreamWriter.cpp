#include "avc/BitStreamWriter.h"

namespace zolt {

BitStreamWriter& BitStreamWriter::u(int count, std::uint64_t value) {
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

BitStreamWriter& BitStreamWriter::ue(std::uint64_t value) {
    int zeros = 0;
    while ((value + 1) >> (zeros + 1) != 0) {
        ++zeros;
    }
    return u(zeros, 0).u(1, 1).u(zeros, value + 1 - (std::uint64_t{1} << zeros));
}

BitStreamWriter& BitStreamWriter::se(std::int64_t value) {
    return ue(value > 0 ? static_cast<std::uint64_t>(2 * value - 1)
                        : static_cast<std::uint64_t>(-2 * value));
}

BitStreamWriter& BitStreamWriter::trailing() {
    u(1, 1);
    return u(static_cast<int>((8 - num_bits_ % 8) % 8), 0);
}

std::vector<unsigned char> BitStreamWriter::escaped() const {
    constexpr unsigned char kEmulationPrevention = 3;
    std::vector<unsigned char> result;
    int zeros = 0;
    for (const unsigned char byte : bytes_) {
        if (zeros == 2 && byte <= kEmulationPrevention) {
            result.push_back(kEmulationPrevention);
            zeros = 0;
        }
        zeros = byte == 0 ? zeros + 1 : 0;
        result.push_back(byte);
    }
    return result;
}

}  // namespace zolt
