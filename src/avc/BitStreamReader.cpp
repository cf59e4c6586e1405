#include "avc/BitStreamReader.h"

#include <algorithm>
#include <cstring>

void BitStreamReader::UseNewBuffer(const unsigned char* bytes, int size) {
    data = bytes;
    numBytes = bytes == nullptr ? 0 : std::clamp(size, 0, kMaxBytes);
    numBits = numBytes * 8;
    bytePos = 0;
    bitInByte = 7;
}

void BitStreamReader::AlignNextByte() {
    if (!IsAligned()) {
        ++bytePos;
        bitInByte = 7;
    }
}

void BitStreamReader::SetBitPos(long pos) {
    // A position that no buffer has may as well be the nearest one that cannot overflow.
    constexpr long kFarthest = static_cast<long>(kMaxBytes) * 8;
    pos = std::clamp(pos, -kFarthest, kFarthest);
    bytePos = static_cast<int>(pos >> 3);
    bitInByte = 7 - static_cast<int>(pos & 7);
}

int BitStreamReader::SkipBits(int n) {
    if (n < 0 || n >= numBits - static_cast<long long>(GetBitPos())) {
        return 1;
    }
    SetBitPos(GetBitPos() + n);
    return 0;
}

int BitStreamReader::SkipBytes(int n) {
    const int end = IsAligned() ? numBytes : numBytes - 1;
    if (n < 0 || static_cast<long long>(bytePos) + n > end) {
        return 1;
    }
    bytePos += n;
    return 0;
}

bool BitStreamReader::ReadBoolean() {
    return ReadBits(1, 1) != 0;
}

void BitStreamReader::SkipBoolean() {
    ReadBits(1, 1);
}

std::uint64_t BitStreamReader::ReadExpGolomb() {
    constexpr int kMaxLeadingZeros = 32;
    int leading_zeros = 0;
    while (!ReadBoolean()) {
        if (++leading_zeros > kMaxLeadingZeros || !HasBit()) {
            return EndCode();
        }
    }
    if (leading_zeros > BitsLeft()) {
        return EndCode();
    }
    return (std::uint64_t{1} << leading_zeros) - 1 + TakeBits(leading_zeros);
}

std::int64_t BitStreamReader::ReadSignedExpGolomb() {
    const auto code = static_cast<std::int64_t>(ReadExpGolomb());
    return code % 2 != 0 ? (code + 1) / 2 : -(code / 2);
}

int BitStreamReader::ReadBytes(unsigned char* dst, int n) {
    if (n < 0) {
        return 1;
    }
    if (!IsAligned()) {
        if (static_cast<long long>(n) * 8 > BitsLeft()) {
            return 1;
        }
        std::generate_n(dst, n, [this] { return static_cast<unsigned char>(TakeBits(8)); });
        return 0;
    }
    const bool inside = bytePos >= 0 && n <= numBytes - bytePos;
    if (n > 0) {
        if (inside) {
            std::memcpy(dst, data + bytePos, static_cast<std::size_t>(n));
            bytePos += n;
        } else {
            std::memset(dst, 0, static_cast<std::size_t>(n));
        }
    }
    return inside ? 0 : 1;
}

std::uint16_t BitStreamReader::ParseUnsInt2(const unsigned char* p) {
    return static_cast<std::uint16_t>(p[0] * 256 + p[1]);
}

std::int16_t BitStreamReader::ParseInt2(const unsigned char* p) {
    return static_cast<std::int16_t>(ParseUnsInt2(p));
}

std::int32_t BitStreamReader::ParseInt4(const unsigned char* p) {
    return ParseInt(p, 4);
}

std::int32_t BitStreamReader::ParseInt(const unsigned char* p, int n) {
    const int count = std::clamp(n, 1, 4);
    std::uint32_t value = 0;
    for (int i = 0; i < count; ++i) {
        value = value << 8 | p[i];
    }
    return static_cast<std::int32_t>(value);
}

std::uint64_t BitStreamReader::ReadBits(int n, int max_bits) {
    if (n < 1 || n > max_bits || n > BitsLeft()) {
        return 0;
    }
    return TakeBits(n);
}

std::int64_t BitStreamReader::ReadSignedBits(int n, int max_bits) {
    const std::uint64_t value = ReadBits(n, max_bits);
    // A failed read gives 0, whose sign bit is clear whatever n was.
    const std::uint64_t sign_bit = value == 0 ? 0 : std::uint64_t{1} << (n - 1);
    return static_cast<std::int64_t>((value ^ sign_bit) - sign_bit);
}

// Takes the next n bits, 0 to 64, which the caller has seen to be there, a byte's share at a time.
std::uint64_t BitStreamReader::TakeBits(int n) {
    std::uint64_t value = 0;
    while (n > 0) {
        const int in_byte = bitInByte + 1;
        const int take = std::min(n, in_byte);
        const unsigned bits = data[bytePos] >> (in_byte - take) & ((1U << take) - 1);
        value = value << take | bits;
        n -= take;
        bitInByte -= take;
        if (bitInByte < 0) {
            bitInByte = 7;
            ++bytePos;
        }
    }
    return value;
}

// Leaves a code that cannot be decoded: the rest of the buffer cannot be trusted either.
std::uint64_t BitStreamReader::EndCode() {
    bytePos = numBytes;
    bitInByte = 7;
    return 0;
}
