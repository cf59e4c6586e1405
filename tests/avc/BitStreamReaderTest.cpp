#include "avc/BitStreamReader.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cstdint>
#include <random>
#include <vector>

#include "avc/BitStreamWriter.h"

namespace {

using zolt::BitStreamWriter;
using Bytes = std::vector<unsigned char>;

BitStreamReader reader_of(const Bytes& bytes) {
    return {bytes.data(), static_cast<int>(bytes.size())};
}

TEST(BitStreamReader, ReadsExpGolombCodes) {
    struct Case {
        Bytes bytes;
        std::uint64_t value;
        long bits;
    };
    for (const Case& c : {Case{{0x80}, 0, 1}, Case{{0x40}, 1, 3}, Case{{0x60}, 2, 3},
                          Case{{0x20}, 3, 5}, Case{{0x38}, 6, 5}}) {
        BitStreamReader reader = reader_of(c.bytes);
        EXPECT_EQ(reader.ReadExpGolomb(), c.value);
        EXPECT_EQ(reader.GetBitPos(), c.bits);
    }
    const Bytes codes = BitStreamWriter().ue(1).ue(2).ue(3).ue(4).ue(0).bytes();
    BitStreamReader reader = reader_of(codes);
    for (const std::int64_t expected : {1, -1, 2, -2, 0}) {
        EXPECT_EQ(reader.ReadSignedExpGolomb(), expected);
    }
}

TEST(BitStreamReader, ReadsTheLargestCodesAndRefusesLongerOnes) {
    const std::uint64_t with_32_zeros = (std::uint64_t{1} << 33) - 2;
    const Bytes longest =
        BitStreamWriter().u(3, 5).ue(with_32_zeros).se(-2147483647).u(1, 1).bytes();
    BitStreamReader reader = reader_of(longest);
    reader.SkipBits(3);
    EXPECT_EQ(reader.ReadExpGolomb(), with_32_zeros);
    EXPECT_EQ(reader.ReadSignedExpGolomb(), -2147483647);
    EXPECT_TRUE(reader.ReadBoolean());

    const Bytes too_long = BitStreamWriter().u(33, 0).u(34, 1).u(64, ~0ULL).bytes();
    reader = reader_of(too_long);
    EXPECT_EQ(reader.ReadExpGolomb(), 0U);
    EXPECT_EQ(reader.GetNumBytesRead(), static_cast<int>(too_long.size()));
}

TEST(BitStreamReader, EndsACodeThatTheBufferCutsOff) {
    for (const Bytes& bytes :
         {Bytes{}, Bytes{0}, Bytes{0, 0, 0, 0, 0, 0}, Bytes{0x01}, Bytes{0x08}, Bytes{0, 0x80}}) {
        const long end = static_cast<long>(bytes.size()) * 8;
        BitStreamReader reader = reader_of(bytes);
        EXPECT_EQ(reader.ReadExpGolomb(), 0U);
        EXPECT_EQ(reader.GetBitPos(), end);
        EXPECT_EQ(reader.ReadSignedExpGolomb(), 0);
        EXPECT_EQ(reader.GetBitPos(), end);
        reader.SetBitPos(0);
        reader.SkipSignedExpGolomb();
        EXPECT_EQ(reader.GetBitPos(), end);
    }
}

// Any width at any position gives the bits that the definition of the reader gives, and one that
// passes the end gives 0 and does not move.
TEST(BitStreamReader, ReadsEveryWidthAtEveryPosition) {
    std::mt19937 random(1);
    Bytes bytes(11);
    for (unsigned char& byte : bytes) {
        byte = static_cast<unsigned char>(random());
    }
    const int num_bits = static_cast<int>(bytes.size()) * 8;
    const auto expected = [&](long pos, int n) {
        std::uint64_t value = 0;
        for (long i = pos; i < pos + n; ++i) {
            value = value << 1 | (bytes[static_cast<std::size_t>(i / 8)] >> (7 - i % 8) & 1U);
        }
        return value;
    };
    const auto extended = [](std::uint64_t value, int n) {
        const bool is_negative = n < 64 && value >> (n - 1) != 0;
        return static_cast<std::int64_t>(is_negative ? value - (std::uint64_t{1} << n) : value);
    };

    BitStreamReader reader = reader_of(bytes);
    for (int pos = 0; pos <= num_bits; ++pos) {
        for (int n = -1; n <= 65; ++n) {
            const auto check = [&](auto value, int max_bits, bool is_signed) {
                const bool readable = n >= 1 && n <= max_bits && pos + n <= num_bits;
                EXPECT_EQ(reader.GetBitPos(), readable ? pos + n : pos);
                const std::uint64_t bits = readable ? expected(pos, n) : 0;
                if (is_signed) {
                    EXPECT_EQ(static_cast<std::int64_t>(value), readable ? extended(bits, n) : 0);
                } else {
                    EXPECT_EQ(static_cast<std::uint64_t>(value), bits);
                }
                reader.SetBitPos(pos);
            };
            reader.SetBitPos(pos);
            check(reader.ReadUnsInt1(n), 8, false);
            check(reader.ReadUnsInt2(n), 16, false);
            check(reader.ReadUnsInt4(n), 32, false);
            check(reader.ReadUnsInt8(n), 64, false);
            check(reader.ReadInt1(n), 8, true);
            check(reader.ReadInt2(n), 16, true);
            check(reader.ReadInt4(n), 32, true);
            check(reader.ReadInt8(n), 64, true);
        }
    }
}

TEST(BitStreamReader, ReadsWholeBytes) {
    const Bytes bytes = {0xfe, 0xdc, 0xba, 0x98, 0x76, 0x54, 0x32, 0x10, 0xff};
    BitStreamReader reader = reader_of(bytes);
    EXPECT_EQ(reader.ReadUnsInt1(), 0xfe);
    EXPECT_EQ(reader.ReadInt1(), static_cast<std::int8_t>(0xdc));
    EXPECT_EQ(reader.ReadInt2(), static_cast<std::int16_t>(0xba98));
    EXPECT_EQ(reader.ReadUnsInt4(), 0x76543210U);
    EXPECT_EQ(reader.ReadUnsInt2(), 0);
    EXPECT_EQ(reader.GetBytePos(), 8);
    reader.SetBitPos(0);
    EXPECT_EQ(reader.ReadInt8(), 0xfedcba9876543210U);
    reader.SetBitPos(0);
    EXPECT_EQ(reader.ReadInt4(), static_cast<std::int32_t>(0xfedcba98));
    reader.SetBitPos(4);
    EXPECT_EQ(reader.ReadUnsInt8(), 0xedcba9876543210fU);

    reader.UseNewBuffer(bytes.data(), 3);
    reader.SetBitPos(3);
    EXPECT_EQ(reader.ReadUnsInt2(), 0xf6e5);  // bits 3 to 18
    reader.SetBitPos(9);
    EXPECT_EQ(reader.ReadUnsInt2(), 0);
    EXPECT_EQ(reader.GetBitPos(), 9);
}

TEST(BitStreamReader, SkipsWithinTheBufferOnly) {
    const Bytes bytes = {0x80, 0x01};
    struct Case {
        long pos;
        int bits_at_most;   // largest SkipBits that succeeds, -1 for none
        int bytes_at_most;  // largest SkipBytes that succeeds
    };
    for (const Case& c : {Case{0, 15, 2}, Case{1, 14, 1}, Case{8, 7, 1}, Case{9, 6, 0},
                          Case{16, -1, 0}, Case{17, -1, -1}}) {
        for (int n = -2; n <= 18; ++n) {
            BitStreamReader reader = reader_of(bytes);
            reader.SetBitPos(c.pos);
            const bool bits_fit = n >= 0 && n <= c.bits_at_most;
            EXPECT_EQ(reader.SkipBits(n), bits_fit ? 0 : 1) << c.pos << " " << n;
            EXPECT_EQ(reader.GetBitPos(), bits_fit ? c.pos + n : c.pos);

            reader.SetBitPos(c.pos);
            const bool bytes_fit = n >= 0 && n <= c.bytes_at_most;
            EXPECT_EQ(reader.SkipBytes(n), bytes_fit ? 0 : 1) << c.pos << " " << n;
            EXPECT_EQ(reader.GetBitPos(), bytes_fit ? c.pos + 8 * n : c.pos);
        }
    }
    BitStreamReader reader = reader_of(bytes);
    EXPECT_EQ(reader.SkipBits(INT32_MAX), 1);
    EXPECT_EQ(reader.SkipBytes(INT32_MAX), 1);
}

TEST(BitStreamReader, CountsAStartedByteAndAligns) {
    const Bytes bytes = {0xa5, 0x5a};
    BitStreamReader reader = reader_of(bytes);
    EXPECT_EQ(reader.GetNumBytesRead(), 0);
    EXPECT_TRUE(reader.ReadBoolean());
    EXPECT_EQ(reader.GetNumBytesRead(), 1);
    EXPECT_EQ(reader.GetBytePos(), 0);
    reader.SkipBits(7);
    EXPECT_EQ(reader.GetNumBytesRead(), 1);
    reader.AlignNextByte();
    EXPECT_EQ(reader.GetBitPos(), 8);
    reader.SkipBoolean();
    EXPECT_EQ(reader.GetNumBytesRead(), 2);
    reader.AlignNextByte();
    EXPECT_EQ(reader.GetBitPos(), 16);
    reader.SkipBoolean();
    EXPECT_FALSE(reader.ReadBoolean());
    EXPECT_EQ(reader.GetBitPos(), 16);
}

TEST(BitStreamReader, CopiesBytes) {
    const Bytes bytes = {0x12, 0x34, 0x56};
    std::array<unsigned char, 4> copy = {9, 9, 9, 9};
    BitStreamReader reader = reader_of(bytes);
    EXPECT_EQ(reader.ReadBytes(copy.data(), 2), 0);
    EXPECT_EQ(copy, (std::array<unsigned char, 4>{0x12, 0x34, 9, 9}));
    EXPECT_EQ(reader.ReadBytes(copy.data(), 3), 1);
    EXPECT_EQ(copy, (std::array<unsigned char, 4>{0, 0, 0, 9}));
    EXPECT_EQ(reader.ReadBytes(copy.data(), -1), 1);
    EXPECT_EQ(reader.GetBitPos(), 16);

    reader.SetBitPos(4);
    EXPECT_EQ(reader.ReadBytes(copy.data(), 2), 0);
    EXPECT_EQ(copy, (std::array<unsigned char, 4>{0x23, 0x45, 0, 9}));
    EXPECT_EQ(reader.ReadBytes(copy.data(), 1), 1);
    EXPECT_EQ(copy, (std::array<unsigned char, 4>{0x23, 0x45, 0, 9}));
    EXPECT_EQ(reader.GetBitPos(), 20);
}

TEST(BitStreamReader, ReadsNothingOutsideTheBuffer) {
    const Bytes bytes = {0xff};
    BitStreamReader reader(nullptr, 5);
    EXPECT_FALSE(reader.ReadBoolean());
    reader.UseNewBuffer(bytes.data(), -3);
    EXPECT_EQ(reader.ReadUnsInt1(1), 0);
    for (const long pos : {-1L, -8L, -1000L, 8L, 1L << 20, LONG_MAX, LONG_MIN}) {
        reader.UseNewBuffer(bytes.data(), 1);
        reader.SetBitPos(pos);
        std::array<unsigned char, 2> copy = {};
        EXPECT_FALSE(reader.ReadBoolean()) << pos;
        EXPECT_EQ(reader.ReadUnsInt4(5), 0U) << pos;
        EXPECT_EQ(reader.ReadBytes(copy.data(), 2), 1) << pos;
        EXPECT_EQ(reader.ReadExpGolomb(), 0U) << pos;
    }
}

TEST(BitStreamReader, ParsesBigEndianIntegers) {
    const unsigned char bytes[] = {0xff, 0xfe, 0xfd, 0xfc};
    EXPECT_EQ(BitStreamReader::ParseUnsInt2(bytes), 0xfffe);
    EXPECT_EQ(BitStreamReader::ParseInt2(bytes), -2);
    EXPECT_EQ(BitStreamReader::ParseInt4(bytes), -66052);
    for (const auto& [n, value] : {std::pair{-1, 0xff},
                                   {0, 0xff},
                                   {1, 0xff},
                                   {2, 0xfffe},
                                   {3, 0xfffefd},
                                   {4, -66052},
                                   {5, -66052}}) {
        EXPECT_EQ(BitStreamReader::ParseInt(bytes, n), value) << n;
    }
}

}  // namespace
