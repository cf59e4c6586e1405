// Residual blocks against a decoder of clause 9.2 that has its own code tables, written as the
// standard prints them.

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "common/BitReader.h"
#include "common/Random.h"
#include "encoder/MacroblockCoder.h"

namespace {

using zolt_test::BitReader;
using zolt_test::Random;

// coeff_token, Table 9-5: codes by TotalCoeff, then TrailingOnes.
const char kToken0[] =
    "1 000101 01 00000111 000100 001 000000111 00000110 0000101 00011 0000000111 000000110 "
    "00000101 "
    "000011 00000000111 0000000110 000000101 0000100 0000000001111 00000000110 0000000101 00000100 "
    "0000000001011 0000000001110 00000000101 000000100 0000000001000 0000000001010 0000000001101 "
    "0000000100 00000000001111 00000000001110 0000000001001 00000000100 00000000001011 "
    "00000000001010 00000000001101 0000000001100 000000000001111 000000000001110 00000000001001 "
    "00000000001100 000000000001011 000000000001010 000000000001101 00000000001000 "
    "0000000000001111 000000000000001 000000000001001 000000000001100 0000000000001011 "
    "0000000000001110 0000000000001101 000000000001000 0000000000000111 0000000000001010 "
    "0000000000001001 0000000000001100 0000000000000100 0000000000000110 0000000000000101 "
    "0000000000001000";
const char kToken2[] =
    "11 001011 10 000111 00111 011 0000111 001010 001001 0101 00000111 000110 000101 0100 00000100 "
    "0000110 0000101 00110 000000111 00000110 00000101 001000 00000001111 000000110 000000101 "
    "000100 00000001011 00000001110 00000001101 0000100 000000001111 00000001010 00000001001 "
    "000000100 000000001011 000000001110 000000001101 00000001100 000000001000 000000001010 "
    "000000001001 00000001000 0000000001111 0000000001110 0000000001101 000000001100 0000000001011 "
    "0000000001010 0000000001001 0000000001100 0000000000111 00000000001011 0000000000110 "
    "0000000001000 00000000001001 00000000001000 00000000001010 0000000000001 00000000000111 "
    "00000000000110 00000000000101 00000000000100";
const char kToken4[] =
    "1111 001111 1110 001011 01111 1101 001000 01100 01110 1100 0001111 01010 01011 1011 0001011 "
    "01000 01001 1010 0001001 001110 001101 1001 0001000 001010 001001 1000 00001111 0001110 "
    "0001101 01101 00001011 00001110 0001010 001100 000001111 00001010 00001101 0001100 000001011 "
    "000001110 00001001 00001100 000001000 000001010 000001101 00001000 0000001101 000000111 "
    "000001001 000001100 0000001001 0000001100 0000001011 0000001010 0000000101 0000001000 "
    "0000000111 0000000110 0000000001 0000000100 0000000011 0000000010";
const char kTokenChromaDc[] =
    "01 000111 1 000100 000110 001 000011 0000011 0000010 000101 000010 00000011 00000010 0000000";
// total_zeros, Tables 9-7, 9-8 and 9-9 (a): codes by TotalCoeff from 1, then total_zeros.
const char* const kTotalZeros[15] = {
    ("1 011 010 0011 0010 00011 00010 000011 000010 0000011 0000010 00000011 00000010 000000011 "
     "000000010 000000001"),
    "111 110 101 100 011 0101 0100 0011 0010 00011 00010 000011 000010 000001 000000",
    "0101 111 110 101 0100 0011 100 011 0010 00011 00010 000001 00001 000000",
    "00011 111 0101 0100 110 101 100 0011 011 0010 00010 00001 00000",
    "0101 0100 0011 111 110 101 100 011 0010 00001 0001 00000",
    "000001 00001 111 110 101 100 011 010 0001 001 000000",
    "000001 00001 101 100 011 11 010 0001 001 000000",
    "000001 0001 00001 011 11 10 010 001 000000",
    "000001 000000 0001 11 10 001 01 00001",
    "00001 00000 001 11 10 01 0001",
    "0000 0001 001 010 1 011",
    "0000 0001 01 1 001",
    "000 001 1 01",
    "00 01 1",
    "0 1"};
const char* const kTotalZerosChromaDc[3] = {"1 01 001 000", "1 01 00", "1 0"};
// run_before, Table 9-10: codes by zerosLeft from 1, then run_before.
const char* const kRunBefore[7] = {
    "1 0",
    "1 01 00",
    "11 10 01 00",
    "11 10 01 001 000",
    "11 10 011 010 001 000",
    "11 000 001 011 010 101 100",
    ("111 110 101 100 011 010 001 0001 00001 000001 0000001 00000001 000000001 0000000001 "
     "00000000001")};

// A prefix code: the index of each code in its list.
class Code {
public:
    explicit Code(const char* list) {
        std::istringstream codes(list);
        for (std::string code; codes >> code;) {
            const int index = static_cast<int>(index_.size());
            index_[code] = index;
        }
    }

    int read(BitReader& reader) const {
        for (std::string code; code.size() <= 16;) {
            code += reader.u(1) ? '1' : '0';
            const auto at = index_.find(code);
            if (at != index_.end()) {
                return at->second;
            }
        }
        throw std::runtime_error("no such code");
    }

    // Whether no code begins another, and the share of all bit strings that begin with a code.
    bool prefix_free() const {
        for (auto at = index_.begin(); std::next(at) != index_.end(); ++at) {
            if (std::next(at)->first.compare(0, at->first.size(), at->first) == 0) {
                return false;
            }
        }
        return true;
    }
    double kraft_sum() const {
        double sum = 0;
        for (const auto& code : index_) {
            sum += 1.0 / static_cast<double>(1 << code.first.size());
        }
        return sum;
    }

private:
    std::map<std::string, int> index_;
};

std::vector<Code> codes(const char* const* lists, int count) {
    return std::vector<Code>(lists, lists + count);
}

// The tables of encodeCAVLCBlock4x4: nC 0..1, 2..3, 4..7, 8 or more, -1.
enum Table { kNc0, kNc2, kNc4, kNc8, kChromaDc };

class BlockDecoder {
public:
    // The levels of a block of `count`, clauses 9.2.1 to 9.2.4.
    std::vector<int> decode(BitReader& reader, Table table, int count) const {
        int total, ones;
        read_token(reader, table, total, ones);
        std::vector<int> levels(static_cast<std::size_t>(count));
        if (total == 0) {
            return levels;
        }
        const std::vector<int> values = read_levels(reader, total, ones);
        int zeros_left = 0;
        if (total < count) {
            const std::vector<Code>& list = table == kChromaDc ? zeros_chroma_dc_ : zeros_;
            zeros_left = list[static_cast<std::size_t>(total - 1)].read(reader);
        }
        std::size_t position = static_cast<std::size_t>(total - 1 + zeros_left);
        for (int i = 0; i < total; ++i) {
            levels.at(position--) = values[static_cast<std::size_t>(i)];
            if (i < total - 1 && zeros_left > 0) {
                const int run =
                    run_before_[static_cast<std::size_t>(std::min(zeros_left, 7) - 1)].read(reader);
                zeros_left -= run;
                position -= static_cast<std::size_t>(run);
            }
        }
        return levels;
    }

    std::vector<const Code*> all_codes() const {
        std::vector<const Code*> all;
        for (const auto* list : {&token_, &zeros_, &zeros_chroma_dc_, &run_before_}) {
            for (const Code& code : *list) {
                all.push_back(&code);
            }
        }
        return all;
    }

private:
    void read_token(BitReader& reader, Table table, int& total, int& ones) const {
        if (table == kNc8) {
            const int code = static_cast<int>(reader.u(6));
            total = code == 3 ? 0 : (code >> 2) + 1;
            ones = code == 3 ? 0 : code & 3;
            return;
        }
        int index = token_[table == kChromaDc ? 3 : table].read(reader);
        for (total = 0; index > std::min(total, 3); ++total) {
            index -= std::min(total, 3) + 1;
        }
        ones = index;
    }

    // Clause 9.2.2, from the highest frequency down.
    static std::vector<int> read_levels(BitReader& reader, int total, int ones) {
        std::vector<int> values;
        for (int i = 0; i < ones; ++i) {
            values.push_back(reader.u(1) ? -1 : 1);
        }
        int suffix_length = total > 10 && ones < 3 ? 1 : 0;
        for (int i = ones; i < total; ++i) {
            int prefix = 0;
            while (reader.u(1) == 0) {
                ++prefix;
            }
            int level_code = std::min(15, prefix) << suffix_length;
            const int suffix_size = prefix == 14 && suffix_length == 0 ? 4
                                    : prefix >= 15                     ? prefix - 3
                                                                       : suffix_length;
            level_code += static_cast<int>(reader.u(suffix_size));
            level_code += prefix >= 15 && suffix_length == 0 ? 15 : 0;
            level_code += prefix >= 16 ? (1 << (prefix - 3)) - 4096 : 0;
            level_code += i == ones && ones < 3 ? 2 : 0;
            const int value = level_code % 2 == 0 ? (level_code + 2) >> 1 : (-level_code - 1) >> 1;
            values.push_back(value);
            suffix_length = std::max(suffix_length, 1);
            if (std::abs(value) > 3 << (suffix_length - 1) && suffix_length < 6) {
                ++suffix_length;
            }
        }
        return values;
    }

    std::vector<Code> token_ = {Code(kToken0), Code(kToken2), Code(kToken4), Code(kTokenChromaDc)};
    std::vector<Code> zeros_ = codes(kTotalZeros, 15);
    std::vector<Code> zeros_chroma_dc_ = codes(kTotalZerosChromaDc, 3);
    std::vector<Code> run_before_ = codes(kRunBefore, 7);
};

class ResidualBlock : public testing::Test {
protected:
    ResidualBlock() { writer_.allocate(4096, "writer_"); }

    // Writes a block and expects the decoder to read it again to its last bit.
    void check(const std::vector<int>& levels, Table table) {
        std::vector<std::int16_t> scan(levels.begin(), levels.end());
        unsigned nonzero = 0;
        for (std::size_t n = 0; n < levels.size(); ++n) {
            nonzero |= (levels[n] != 0 ? 1u : 0u) << n;
        }
        const int count = static_cast<int>(levels.size());
        writer_.reset();
        coder_.encodeCAVLCBlock4x4(scan.data(), nonzero, count, table);
        BitReader reader(writer_.g_nal_buf, (writer_.g_nal_bitpos + 7) / 8);
        ASSERT_EQ(decoder_.decode(reader, table, count), levels) << "table " << table;
        ASSERT_EQ(reader.position(), writer_.g_nal_bitpos);
    }

    Picture picture_{16, 16, zolt::best_kernels()};
    MacroblockCoder coder_{picture_};
    BitWriter& writer_ = coder_.row_bits;
    BlockDecoder decoder_;
};

TEST_F(ResidualBlock, CodesOfTheDecoderArePrefixCodes) {
    for (const Code* code : decoder_.all_codes()) {
        EXPECT_TRUE(code->prefix_free());
        // The standard leaves a few long codes unused.
        EXPECT_LE(code->kraft_sum(), 1.0);
        EXPECT_GE(code->kraft_sum(), 0.96);
    }
}

// Every set of positions, which is every coeff_token, total_zeros and run_before.
TEST_F(ResidualBlock, EverySetOfPositions) {
    Random random(3);
    for (const Table table : {kNc0, kNc2, kNc4, kNc8, kChromaDc}) {
        for (const int count : {4, 15, 16}) {
            if ((count == 4) != (table == kChromaDc)) {
                continue;
            }
            for (unsigned mask = 0; mask < 1u << count; ++mask) {
                std::vector<int> levels(static_cast<std::size_t>(count));
                const int largest = random.between(1, 3);
                for (int n = 0; n < count; ++n) {
                    const int magnitude = random.between(1, largest);
                    if (mask >> n & 1) {
                        levels[static_cast<std::size_t>(n)] =
                            random.between(0, 1) ? magnitude : -magnitude;
                    }
                }
                ASSERT_NO_FATAL_FAILURE(check(levels, table));
            }
        }
    }
}

// Levels of every magnitude, alone and after levels that have raised suffixLength.
TEST_F(ResidualBlock, EveryMagnitude) {
    Random random(4);
    for (int magnitude = 1; magnitude <= zolt::kMaxLevel; ++magnitude) {
        for (const int sign : {1, -1}) {
            const int level = sign * magnitude;
            ASSERT_NO_FATAL_FAILURE(check({level, 0, 0, 0}, kChromaDc));
            ASSERT_NO_FATAL_FAILURE(
                check({0, level, 1, -1, 1, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0}, kNc0));
            std::vector<int> levels(16, level);
            for (int& other : levels) {
                if (random.between(0, 2) == 0) {
                    other = random.between(-1, 1) * (zolt::kMaxLevel >> random.between(0, 11));
                }
            }
            ASSERT_NO_FATAL_FAILURE(check(levels, kNc4));
        }
    }
}

}  // namespace
