// Bit writer, NAL units, parameter sets.

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "common/BitReader.h"
#include "common/Random.h"
#include "encoder/CEncoder.h"

namespace {

using zolt_test::BitReader;
using zolt_test::Random;
using Bytes = std::vector<std::uint8_t>;

Bytes nal_unit(const CEncoder& engine) {
    Bytes nal(static_cast<std::size_t>(engine.get_nal_size()));
    engine.copy_nal_unit(nal.data(), engine.get_nal_size());
    return nal;
}

TEST(Bits, FieldsAndExpGolombCodesReadBack) {
    CEncoder engine(64, 64);
    Random random(1);
    struct Element {
        int length;  // of u(n); 0: ue(v), -1: se(v)
        unsigned value;
    };
    std::vector<Element> elements;
    for (int i = 0; i < 2000; ++i) {
        const int length = std::max(random.between(-6, 32), -1);
        const unsigned value = random.next() >> random.between(length > 0 ? 32 - length : 2, 31);
        elements.push_back({length, value});
        if (length > 0) {
            engine.nal.write_bits(value, length);
        } else if (length == 0) {
            engine.nal.write_uvlc_unsigned(value);
        } else {
            engine.nal.write_uvlc_signed(static_cast<int>(value) - 1000);
        }
    }
    BitReader reader(engine.nal.g_nal_buf, static_cast<std::size_t>(engine.get_nal_size()));
    for (const Element& e : elements) {
        if (e.length > 0) {
            ASSERT_EQ(reader.u(e.length), e.value);
        } else if (e.length == 0) {
            ASSERT_EQ(reader.ue(), e.value);
        } else {
            ASSERT_EQ(reader.se(), static_cast<int>(e.value) - 1000);
        }
    }
    int bits = 0;
    EXPECT_EQ(engine.GetNALUnit(&bits), engine.get_nal_buffer());
    EXPECT_EQ(static_cast<std::size_t>(bits), reader.position());
    engine.ResetNALUnit();
    engine.GetNALUnit(&bits);
    EXPECT_EQ(bits, 0);
    EXPECT_EQ(
        std::count(engine.nal.g_nal_buf.data(), engine.nal.g_nal_buf + engine.g_nal_buf_size, 0),
        engine.g_nal_buf_size);
}

// Nothing but what was written counts, whatever stood in the buffer.
TEST(Bits, WritesOverOldContent) {
    CEncoder engine(16, 16);
    for (int position = 0; position < 8; ++position) {
        for (int length = 1; length <= BitWriter::kMaxWrite; ++length) {
            std::fill(engine.nal.g_nal_buf.data(), engine.nal.g_nal_buf + 32, std::uint8_t{0xff});
            engine.nal.g_nal_buf[0] = 0;
            engine.nal.g_nal_bitpos = static_cast<unsigned>(position);
            engine.nal.write_bits(0, length);
            engine.nal.write_bits(0, 9);
            engine.nal.write_bits(1, 1);
            BitReader reader(engine.nal.g_nal_buf, 32);
            ASSERT_EQ(reader.u(position), 0u);
            for (int i = 0; i < length + 9; ++i) {
                ASSERT_EQ(reader.u(1), 0u) << "bit " << i << " of " << length << " at " << position;
            }
            ASSERT_EQ(reader.u(1), 1u);
        }
    }
}

TEST(Bits, LengthsOfExpGolombCodes) {
    CEncoder engine(16, 16);
    const auto length = [&](unsigned v) {
        engine.ResetNALUnit();
        engine.nal.write_uvlc_unsigned(v);
        return engine.nal.g_nal_bitpos;
    };
    for (const auto& [v, bits] : std::vector<std::pair<unsigned, unsigned>>{
             {0, 1}, {1, 3}, {255, 17}, {256, 17}, {8190, 25}, {8191, 27}, {0xfffffffe, 63}}) {
        EXPECT_EQ(length(v), bits) << v;
    }
}

TEST(Bits, SizesOfTheNalUnit) {
    CEncoder engine(16, 16);
    engine.nal.write_bits(0x1abcd, 17);
    EXPECT_EQ(engine.get_nal_size(), 3);
    Bytes copy(3, 0xee);
    EXPECT_EQ(engine.copy_nal_unit(copy.data(), 2), 2);
    EXPECT_EQ(copy, (Bytes{0xd5, 0xe6, 0xee}));
    EXPECT_EQ(engine.copy_nal_unit(copy.data(), 9), 3);
    EXPECT_EQ(copy, (Bytes{0xd5, 0xe6, 0x80}));
    EXPECT_EQ(engine.copy_nal_unit(copy.data(), -1), 0);
}

TEST(ParameterSets, BytesForPictureSizes) {
    const struct {
        int width, height;
        Bytes sps;
    } cases[] = {
        {176, 144, {0x47, 0x4d, 0x00, 0x16, 0x8d, 0x8d, 0x41, 0x62, 0x62}},
        {320, 240, {0x47, 0x4d, 0x00, 0x16, 0x8d, 0x8d, 0x40, 0xa0, 0xf8, 0x80}},
        // The size rounded down to macroblocks counts.
        {191, 159, {0x47, 0x4d, 0x00, 0x16, 0x8d, 0x8d, 0x41, 0x62, 0x62}},
    };
    for (const auto& c : cases) {
        CEncoder engine(c.width, c.height);
        engine.initialize_encoder();
        engine.encode_sps();
        EXPECT_EQ(nal_unit(engine), c.sps);
        engine.reset_nal_buffer();
        engine.encode_pps();
        EXPECT_EQ(nal_unit(engine), (Bytes{0x48, 0xce, 0x03, 0xc1, 0x78, 0x80}));
    }
}

// Ends an RBSP whose bits stand in bytes, `spare` bits short of their end.
bool end_nal_unit(CEncoder& engine, const Bytes& bytes, unsigned spare) {
    engine.ResetNALUnit();
    std::copy(bytes.begin(), bytes.end(), engine.nal.g_nal_buf.data());
    engine.nal.g_nal_bitpos = static_cast<unsigned>(8 * bytes.size()) - spare;
    return engine.writeNALUnit();
}

TEST(EmulationPrevention, KnownCases) {
    const struct {
        Bytes rbsp;
        unsigned spare;  // bits at the end, the first of which becomes the stop bit
        Bytes nal;
    } cases[] = {
        {{0x45, 0, 0, 0}, 1, {0x45, 0, 0, 3, 1}},  // the stop bit makes the triple's last byte
        {{0x45, 0, 0, 0, 0, 1}, 0, {0x45, 0, 0, 3, 0, 0, 3, 1, 0x80}},
        {{0x45, 0, 0, 4}, 0, {0x45, 0, 0, 4, 0x80}},
        {{0x45, 0, 0, 3, 0, 0, 2}, 0, {0x45, 0, 0, 3, 3, 0, 0, 3, 2, 0x80}},
        {{0x45, 1, 0, 0}, 0, {0x45, 1, 0, 0, 0x80}},
        {{0x45, 0, 0, 0, 0, 0, 0, 0}, 0, {0x45, 0, 0, 3, 0, 0, 3, 0, 0, 3, 0, 0x80}},
    };
    CEncoder engine(16, 16);
    for (const auto& c : cases) {
        EXPECT_TRUE(end_nal_unit(engine, c.rbsp, c.spare));
        EXPECT_EQ(nal_unit(engine), c.nal);
    }
}

// What the engine writes, read as clause 7.3.1 has it, is the RBSP again, and no triple that is
// forbidden stands in it.
TEST(EmulationPrevention, IsUndone) {
    CEncoder engine(128, 128);
    Random random(2);
    for (int iteration = 0; iteration < 3000; ++iteration) {
        Bytes rbsp(static_cast<std::size_t>(random.between(1, 60)));
        for (std::uint8_t& byte : rbsp) {
            byte = static_cast<std::uint8_t>(std::max(random.between(-6, 5), 0));
        }
        rbsp[0] = 0x41;
        ASSERT_TRUE(end_nal_unit(engine, rbsp, 0));
        const Bytes nal = nal_unit(engine);
        for (std::size_t i = 0; i + 2 < nal.size(); ++i) {
            ASSERT_FALSE(nal[i] == 0 && nal[i + 1] == 0 && nal[i + 2] < 3);
        }
        BitReader reader = BitReader::of_nal(nal.data(), nal.size());
        for (std::size_t i = 1; i < rbsp.size(); ++i) {
            ASSERT_EQ(reader.u(8), rbsp[i]);
        }
        ASSERT_EQ(reader.u(8), 0x80u);
        ASSERT_EQ(reader.bits_left(), 0u);
    }
}

// Neither the list of positions nor the buffer is overrun.
TEST(EmulationPrevention, ReportsWhatDoesNotFit) {
    CEncoder engine(64, 64);
    const auto zeros = [&](int count) {
        return end_nal_unit(engine, Bytes(static_cast<std::size_t>(count)), 0);
    };
    // A byte is inserted for every two zeros after the first two.
    EXPECT_TRUE(zeros(2 * engine.g_nal_emul_size + 1));
    EXPECT_EQ(engine.get_nal_size(), 2 * engine.g_nal_emul_size + 2 + engine.g_nal_emul_size);
    EXPECT_FALSE(zeros(2 * engine.g_nal_emul_size + 3));

    Bytes full(static_cast<std::size_t>(engine.g_nal_buf_size), 0xff);
    EXPECT_TRUE(end_nal_unit(engine, full, 1));
    EXPECT_EQ(engine.get_nal_size(), engine.g_nal_buf_size);
    full[10] = full[11] = full[12] = 0;
    EXPECT_FALSE(end_nal_unit(engine, full, 1));
}

}  // namespace
