#include "io/Md5.h"

#include <algorithm>
#include <cstring>

namespace zolt {
namespace {

// Section 3.4: the integer parts of 2^32 times |sin(i)|, i from 1.
constexpr std::uint32_t kSines[64] = {
    0xd76aa478, 0xe8c7b756, 0x242070db, 0xc1bdceee, 0xf57c0faf, 0x4787c62a, 0xa8304613, 0xfd469501,
    0x698098d8, 0x8b44f7af, 0xffff5bb1, 0x895cd7be, 0x6b901122, 0xfd987193, 0xa679438e, 0x49b40821,
    0xf61e2562, 0xc040b340, 0x265e5a51, 0xe9b6c7aa, 0xd62f105d, 0x02441453, 0xd8a1e681, 0xe7d3fbc8,
    0x21e1cde6, 0xc33707d6, 0xf4d50d87, 0x455a14ed, 0xa9e3e905, 0xfcefa3f8, 0x676f02d9, 0x8d2a4c8a,
    0xfffa3942, 0x8771f681, 0x6d9d6122, 0xfde5380c, 0xa4beea44, 0x4bdecfa9, 0xf6bb4b60, 0xbebfbc70,
    0x289b7ec6, 0xeaa127fa, 0xd4ef3085, 0x04881d05, 0xd9d4d039, 0xe6db99e5, 0x1fa27cf8, 0xc4ac5665,
    0xf4292244, 0x432aff97, 0xab9423a7, 0xfc93a039, 0x655b59c3, 0x8f0ccc92, 0xffeff47d, 0x85845dd1,
    0x6fa87e4f, 0xfe2ce6e0, 0xa3014314, 0x4e0811a1, 0xf7537e82, 0xbd3af235, 0x2ad7d2bb, 0xeb86d391,
};

constexpr int kShifts[4][4] = {{7, 12, 17, 22}, {5, 9, 14, 20}, {4, 11, 16, 23}, {6, 10, 15, 21}};

std::uint32_t rotated(std::uint32_t value, int bits) {
    return value << bits | value >> (32 - bits);
}

std::uint32_t word_at(const unsigned char* bytes) {
    return bytes[0] | bytes[1] << 8 | bytes[2] << 16 | static_cast<std::uint32_t>(bytes[3]) << 24;
}

}  // namespace

void Md5::add(const void* data, std::size_t size) {
    const auto* bytes = static_cast<const unsigned char*>(data);
    while (size > 0) {
        const std::size_t filled = bytes_ % kBlockBytes;
        const std::size_t taken = std::min(size, kBlockBytes - filled);
        std::memcpy(block_.data() + filled, bytes, taken);
        bytes_ += taken;
        bytes += taken;
        size -= taken;
        if (bytes_ % kBlockBytes == 0) {
            add_block(block_.data());
        }
    }
}

std::string Md5::hex() const {
    Md5 ended = *this;
    ended.pad();
    std::string text;
    for (const std::uint32_t word : ended.state_) {
        for (int shift = 0; shift < 32; shift += 8) {
            text += "0123456789abcdef"[word >> (shift + 4) & 15];
            text += "0123456789abcdef"[word >> shift & 15];
        }
    }
    return text;
}

void Md5::pad() {
    constexpr unsigned char kPadding[kBlockBytes] = {0x80};
    constexpr std::size_t kLengthAt = kBlockBytes - 8;
    const std::uint64_t bits = bytes_ * 8;
    add(kPadding, 1 + (kBlockBytes + kLengthAt - 1 - bytes_ % kBlockBytes) % kBlockBytes);
    unsigned char length[8];
    for (int i = 0; i < 8; ++i) {
        length[i] = static_cast<unsigned char>(bits >> (8 * i));
    }
    add(length, sizeof length);
}

void Md5::add_block(const unsigned char* block) {
    std::uint32_t a = state_[0], b = state_[1], c = state_[2], d = state_[3];
    for (int i = 0; i < 64; ++i) {
        std::uint32_t mixed = 0;
        int word = 0;
        switch (i / 16) {
            case 0:
                mixed = (b & c) | (~b & d);
                word = i;
                break;
            case 1:
                mixed = (b & d) | (c & ~d);
                word = (5 * i + 1) % 16;
                break;
            case 2:
                mixed = b ^ c ^ d;
                word = (3 * i + 5) % 16;
                break;
            default:
                mixed = c ^ (b | ~d);
                word = 7 * i % 16;
        }
        const std::uint32_t sum = a + mixed + kSines[i] + word_at(block + 4 * word);
        a = d;
        d = c;
        c = b;
        b += rotated(sum, kShifts[i / 16][i % 4]);
    }
    state_[0] += a;
    state_[1] += b;
    state_[2] += c;
    state_[3] += d;
}

}  // namespace zolt
