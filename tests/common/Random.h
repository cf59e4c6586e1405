#pragma once

#include <cstdint>

namespace zolt_test {

// Reproducible pseudo-random numbers, the same on every platform (xorshift64*).
class Random {
public:
    explicit Random(std::uint64_t seed) : state_((seed + 1) * 0x9e3779b97f4a7c15u) {}

    std::uint32_t next() {
        state_ ^= state_ >> 12;
        state_ ^= state_ << 25;
        state_ ^= state_ >> 27;
        return static_cast<std::uint32_t>((state_ * 0x2545f4914f6cdd1du) >> 32);
    }

    // A number of low..high, both included.
    int between(int low, int high) {
        return low + static_cast<int>(next() % static_cast<std::uint32_t>(high - low + 1));
    }

    std::uint8_t sample() { return static_cast<std::uint8_t>(next() >> 24); }

private:
    std::uint64_t state_;
};

}  // namespace zolt_test
