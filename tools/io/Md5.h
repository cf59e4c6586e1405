#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>

namespace zolt {

// The MD5 digest of a string of bytes (RFC 1321): a name for a stream, not a protection.
class Md5 {
public:
    void add(const void* data, std::size_t size);

    // Of what was added so far, as 32 lower-case hexadecimal digits.
    std::string hex() const;

private:
    static constexpr std::size_t kBlockBytes = 64;

    void pad();
    void add_block(const unsigned char* block);

    std::array<std::uint32_t, 4> state_ = {0x67452301, 0xefcdab89, 0x98badcfe, 0x10325476};
    std::array<unsigned char, kBlockBytes> block_ = {};
    std::uint64_t bytes_ = 0;
};

}  // namespace zolt
