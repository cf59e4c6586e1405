#pragma once

#include <cstdint>

// Reads bits, integers, Exp-Golomb codes and byte strings from a borrowed buffer, most significant
// bit first.
//
// Nothing is ever read outside the buffer, wherever the position is. A read or skip of a fixed
// width that would pass the end leaves the position where it was and returns 0 (a skip: 1), so a
// caller tells an error from a genuine 0 by the remaining length. Positions are bits in a `long`;
// of a buffer beyond kMaxBytes only the first kMaxBytes are seen.
class BitStreamReader {
public:
    static constexpr int kMaxBytes = INT32_MAX / 8;

    // Reads `size` bytes at `bytes`, which stay the caller's; null or a negative size is an empty
    // buffer. The position is 0.
    BitStreamReader(const unsigned char* bytes, int size) { UseNewBuffer(bytes, size); }
    void UseNewBuffer(const unsigned char* bytes, int size);

    long GetBitPos() const { return static_cast<long>(bytePos) * 8 + 7 - bitInByte; }
    int GetBytePos() const { return bytePos; }
    // A byte of which one bit was read counts.
    int GetNumBytesRead() const { return IsAligned() ? bytePos : bytePos + 1; }
    void AlignNextByte();
    // Any position is accepted; outside the buffer every read finds its end.
    void SetBitPos(long pos);

    // Return 0, or 1 without moving for a negative count and for a skip that leaves the buffer.
    // Bits must stop short of the end; bytes may reach it exactly, from a byte boundary only.
    int SkipBits(int n);
    int SkipBytes(int n);

    bool ReadBoolean();
    void SkipBoolean();

    // The next n bits, n from 1 to the width of the result; 0 without moving for any other n. The
    // signed ones take them as a two's complement number of n bits.
    std::uint8_t ReadUnsInt1(int n) { return static_cast<std::uint8_t>(ReadBits(n, 8)); }
    std::uint16_t ReadUnsInt2(int n) { return static_cast<std::uint16_t>(ReadBits(n, 16)); }
    std::uint32_t ReadUnsInt4(int n) { return static_cast<std::uint32_t>(ReadBits(n, 32)); }
    std::uint64_t ReadUnsInt8(int n) { return ReadBits(n, 64); }
    std::int8_t ReadInt1(int n) { return static_cast<std::int8_t>(ReadSignedBits(n, 8)); }
    std::int16_t ReadInt2(int n) { return static_cast<std::int16_t>(ReadSignedBits(n, 16)); }
    std::int32_t ReadInt4(int n) { return static_cast<std::int32_t>(ReadSignedBits(n, 32)); }
    std::int64_t ReadInt8(int n) { return ReadSignedBits(n, 64); }

    // The next 1, 2, 4 or 8 bytes, big-endian.
    std::uint8_t ReadUnsInt1() { return ReadUnsInt1(8); }
    std::uint16_t ReadUnsInt2() { return ReadUnsInt2(16); }
    std::uint32_t ReadUnsInt4() { return ReadUnsInt4(32); }
    std::uint64_t ReadUnsInt8() { return ReadUnsInt8(64); }
    std::int8_t ReadInt1() { return ReadInt1(8); }
    std::int16_t ReadInt2() { return ReadInt2(16); }
    std::int32_t ReadInt4() { return ReadInt4(32); }
    std::uint64_t ReadInt8() { return ReadUnsInt8(); }

    // ue(v) and se(v), clause 9.1. A code that meets the end of the buffer or has more than 32
    // leading zero bits moves to the end of the buffer and gives 0.
    std::uint64_t ReadExpGolomb();
    std::int64_t ReadSignedExpGolomb();
    void SkipExpGolomb() { ReadExpGolomb(); }
    void SkipSignedExpGolomb() { ReadExpGolomb(); }

    // Copies the next n bytes to `dst` and returns 0. Where they pass the end it returns 1 without
    // moving; `dst` is then n zero bytes at a byte boundary, and untouched elsewhere. A negative n
    // returns 1.
    int ReadBytes(unsigned char* dst, int n);

    // Big-endian integers at `p`.
    static std::uint16_t ParseUnsInt2(const unsigned char* p);
    static std::int16_t ParseInt2(const unsigned char* p);
    static std::int32_t ParseInt4(const unsigned char* p);
    // Of n bytes, unsigned for n = 2 and 3; one byte for n below 2, four for n above 3.
    static std::int32_t ParseInt(const unsigned char* p, int n);

private:
    bool IsAligned() const { return bitInByte == 7; }
    bool HasBit() const { return bytePos >= 0 && bytePos < numBytes; }
    long BitsLeft() const { return HasBit() ? numBits - GetBitPos() : 0; }
    std::uint64_t ReadBits(int n, int max_bits);
    std::int64_t ReadSignedBits(int n, int max_bits);
    std::uint64_t TakeBits(int n);
    std::uint64_t EndCode();

    const unsigned char* data = nullptr;  // the buffer, borrowed
    int numBytes = 0;                     // its length
    int numBits = 0;                      // numBytes * 8
    int bytePos = 0;                      // byte that holds the next bit
    int bitInByte = 7;                    // index of that bit, 7: most significant, i.e. aligned
};
