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
#include "encoder/residual_block.h"
#include "encoder/tables.h"

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

// The tables of coeff_token: nC 0..1, 2..3, 4..7, 8 or more, -1.
enum Table { kNc0, kNc2, kNc4, kNc8, kChromaDc };
constexpr unsigned kTokenClass[5] = {zolt::kNc0, zolt::kNc2, zolt::kNc4, zolt::kNc8,
                                     zolt::kNcChromaDc};

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

    // Writes a block behind some other bits and expects the decoder to read it again to its last
    // bit.
    void check(const std::vector<int>& levels, Table table) {
        std::vector<std::int16_t> scan(levels.begin(), levels.end());
        unsigned nonzero = 0;
        int total = 0;
        for (std::size_t n = 0; n < levels.size(); ++n) {
            nonzero |= (levels[n] != 0 ? 1u : 0u) << n;
            total += levels[n] != 0;
        }
        const int count = static_cast<int>(levels.size());
        const int before = ++blocks_ % 8;
        writer_.reset();
        if (before > 0) {
            writer_.write_bits((1u << before) - 1, before);
        }
        BitCursor cursor(writer_);
        ASSERT_EQ(
            zolt::encodeCAVLCBlock4x4(cursor, scan.data(), nonzero, count, kTokenClass[table]),
            total);
        cursor.end(writer_);
        BitReader reader(writer_.g_nal_buf, (writer_.g_nal_bitpos + 7) / 8);
        ASSERT_EQ(reader.u(before), (1u << before) - 1);
        ASSERT_EQ(decoder_.decode(reader, table, count), levels) << "table " << table;
        ASSERT_EQ(reader.position(), writer_.g_nal_bitpos);
    }

    BitWriter writer_;
    BlockDecoder decoder_;
    int blocks_ = 0;
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

// The longest total_zeros and run_before, 30 bits, at every fill of the cursor's window.
TEST_F(ResidualBlock, LongestRunsAtEveryBitPosition) {
    for (const Table table : {kNc0, kNc2, kNc4, kNc8}) {
        for (int magnitude = 1; magnitude <= 16; ++magnitude) {
            std::vector<int> levels = {magnitude, 0, 0, 0, 0, 0, 0, 0, 1, 1, 1, 1, 1, 1, 1, 1};
            for (int position = 0; position < 8; ++position) {
                ASSERT_NO_FATAL_FAILURE(check(levels, table)) << "magnitude " << magnitude;
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

// residual() of clause 7.3.5.3 read with the nC of clause 9.2.1, TotalCoeff in maps of its own.
class MacroblockDecoder {
public:
    static constexpr int kBlocks = 12;  // luma blocks in a row of the picture

    // What a macroblock holds: the levels of its blocks in the order of g_scan_levels, those of the
    // DC blocks, and which of them are coded.
    struct Levels {
        std::vector<int> blocks[24], luma_dc, chroma_dc[2];
    };

    Levels decode(BitReader& reader, int mb_x, int mb_y, bool intra16x16, int pattern) {
        Levels result;
        const int count = intra16x16 ? 15 : 16;
        if (intra16x16) {
            result.luma_dc = decoder_.decode(reader, table(0, 4 * mb_x, 4 * mb_y), 16);
        }
        for (int k = 0; k < 16; ++k) {
            const int x = 4 * mb_x + 2 * (k >> 2 & 1) + (k & 1);
            const int y = 4 * mb_y + 2 * (k >> 3) + (k >> 1 & 1);
            const bool coded = (pattern >> k / 4 & 1) != 0;
            read(reader, 0, x, y, count, coded, result.blocks[k]);
        }
        for (std::vector<int>& dc : result.chroma_dc) {
            if (pattern >= 16) {
                dc = decoder_.decode(reader, kChromaDc, 4);
            }
        }
        for (int b = 0; b < 8; ++b) {
            const int x = 2 * mb_x + b % 2;
            const int y = 2 * mb_y + b / 2 % 2;
            read(reader, 1 + b / 4, x, y, 15, pattern >= 32, result.blocks[16 + b]);
        }
        return result;
    }

private:
    Table table(int component, int x, int y) const {
        const int left = x > 0 ? counts_[component][y][x - 1] : 0;
        const int up = y > 0 ? counts_[component][y - 1][x] : 0;
        const int nC = x > 0 && y > 0 ? (left + up + 1) >> 1 : left + up;
        return nC < 2 ? kNc0 : nC < 4 ? kNc2 : nC < 8 ? kNc4 : kNc8;
    }
    void read(BitReader& reader, int component, int x, int y, int count, bool coded,
              std::vector<int>& levels) {
        levels.assign(static_cast<std::size_t>(count), 0);
        if (coded) {
            levels = decoder_.decode(reader, table(component, x, y), count);
        }
        counts_[component][y][x] = static_cast<int>(levels.size()) -
                                   static_cast<int>(std::count(levels.begin(), levels.end(), 0));
    }

    BlockDecoder decoder_;
    int counts_[3][kBlocks][kBlocks] = {};
};

class MacroblockResidual : public testing::Test {
protected:
    MacroblockResidual() {
        coder_.row_bits.allocate(MacroblockCoder::kMaxMacroblockBits / 8 + 1, "row_bits");
        picture_.g_frame = frame_;
    }

    // Gives the coder's macroblock random levels: `share` of 16 positions, magnitudes to `largest`.
    MacroblockDecoder::Levels fill(bool intra16x16, int pattern, int share, int largest) {
        MacroblockDecoder::Levels levels;
        const auto draw = [&](int count, bool coded) {
            std::vector<int> values(static_cast<std::size_t>(count));
            for (int& value : values) {
                const int level = random_.between(1, largest);
                if (coded && random_.between(0, 15) < share) {
                    value = random_.between(0, 1) ? level : -level;
                }
            }
            return values;
        };
        coder_.g_coded_block_pattern = pattern;
        coder_.g_chroma_dc_mask = 0;
        for (int k = 0; k < 24; ++k) {
            const int count = k < 16 && !intra16x16 ? 16 : 15;
            levels.blocks[k] = draw(count, k < 16 ? pattern >> k / 4 & 1 : pattern >= 32);
            std::int16_t* scan = coder_.g_scan_levels + 16 * k;
            coder_.g_nonzero[k] = 0;
            for (int n = 0; n < 16; ++n) {
                // The constant coefficient has no place among the 15.
                const int at = n - (16 - count);
                scan[n] = static_cast<std::int16_t>(
                    at < 0 ? 0 : levels.blocks[k][static_cast<std::size_t>(at)]);
                coder_.g_nonzero[k] =
                    static_cast<std::uint16_t>(coder_.g_nonzero[k] | (scan[n] != 0) << n);
            }
        }
        if (intra16x16) {
            levels.luma_dc = draw(16, true);
            std::copy(levels.luma_dc.begin(), levels.luma_dc.end(), coder_.g_luma_dc);
            coder_.g_luma_dc_nonzero = 0;
            for (int n = 0; n < 16; ++n) {
                coder_.g_luma_dc_nonzero = static_cast<std::uint16_t>(
                    coder_.g_luma_dc_nonzero | (coder_.g_luma_dc[n] != 0) << n);
            }
        }
        for (int c = 0; c < 2; ++c) {
            if (pattern >= 16) {
                levels.chroma_dc[c] = draw(4, true);
                std::copy(levels.chroma_dc[c].begin(), levels.chroma_dc[c].end(),
                          coder_.g_chroma_dc + 4 * c);
                for (int n = 4 * c; n < 4 * c + 4; ++n) {
                    coder_.g_chroma_dc_mask |= (coder_.g_chroma_dc[n] != 0 ? 1u : 0u) << n;
                }
            }
        }
        return levels;
    }

    const std::uint8_t frame_[48 * 48 * 3 / 2] = {};
    Picture picture_{48, 48, zolt::best_kernels()};
    MacroblockCoder coder_{picture_};
    Random random_{5};
};

// The blocks' order, their nC at and inside the picture's edges, and which of them are sent.
TEST_F(MacroblockResidual, MacroblocksReadBack) {
    for (int iteration = 0; iteration < 400; ++iteration) {
        MacroblockDecoder decoder;
        picture_.initFrameParams();
        for (int mb = 0; mb < 9; ++mb) {
            const bool intra16x16 = random_.between(0, 2) == 0;
            const int luma = random_.between(0, 15);
            const int pattern = (intra16x16 ? luma / 8 * 15 : luma) + 16 * random_.between(0, 2);
            coder_.g_mb_x = mb % 3;
            coder_.g_mb_y = mb / 3;
            coder_.g_mapMBNumber = mb;
            coder_.setMBOffsets();
            coder_.g_cur_mb_mode = intra16x16 ? MB_INTRA16x16 : MB_P16x16;
            const MacroblockDecoder::Levels levels =
                fill(intra16x16, pattern, random_.between(0, 16), 1 << random_.between(0, 6));
            coder_.row_bits.reset();
            coder_.encodeBlock();
            const unsigned bits = coder_.row_bits.g_nal_bitpos;
            BitReader reader(coder_.row_bits.g_nal_buf, (bits + 7) / 8);
            const MacroblockDecoder::Levels read =
                decoder.decode(reader, mb % 3, mb / 3, intra16x16, pattern);
            for (int k = 0; k < 24; ++k) {
                ASSERT_EQ(read.blocks[k], levels.blocks[k]) << "block " << k;
            }
            ASSERT_EQ(read.luma_dc, levels.luma_dc);
            ASSERT_EQ(read.chroma_dc[0], levels.chroma_dc[0]);
            ASSERT_EQ(read.chroma_dc[1], levels.chroma_dc[1]);
            ASSERT_EQ(reader.position(), bits);
        }
    }
}

// A macroblock of 28-bit levels only, with all that a header can hold, takes at most what the check
// of the NAL buffer allows for.
TEST_F(MacroblockResidual, LargestMacroblock) {
    coder_.setMBOffsets();
    coder_.g_cur_mb_mode = MB_INTRA4x4;
    coder_.g_mb_type = 5;
    coder_.g_chroma_mode = 3;
    std::fill(coder_.g_rem_intra4x4_pred_mode, coder_.g_rem_intra4x4_pred_mode + 16,
              std::uint8_t{7});
    fill(false, 47, 16, zolt::kMaxLevel);
    for (std::int16_t& level : coder_.g_scan_levels) {
        level = -zolt::kMaxLevel;
    }
    for (std::int16_t& level : coder_.g_chroma_dc) {
        level = -zolt::kMaxLevel;
    }
    coder_.g_skip_run = 139263;
    coder_.writeMBSyntax_P();
    EXPECT_LE(coder_.row_bits.g_nal_bitpos, MacroblockCoder::kMaxMacroblockBits);
    EXPECT_GE(coder_.row_bits.g_nal_bitpos, (256 + 2 * 4 + 8 * 15) * 28u);
}

}  // namespace
