#include "encoder/residual_block.h"

#include "encoder/bitops.h"

// Masks of levels are reversed here: bit 15 - n stands for scan position n, since levels are sent
// from the highest frequency down and processors find the lowest bit of a mask faster than the
// highest.
namespace {

using zolt::cavlc_tables;
using zolt::CodeWord;
using zolt::lowest_bit;

// coeff_token, signs of the trailing ones and the other levels of a block.
inline void put_levels(BitCursor& out, const std::int16_t* levels, unsigned reversed,
                       unsigned total, const CodeWord (*tokens)[4]) {
    constexpr unsigned kLongest = 28;  // of level_prefix and level_suffix
    std::uint64_t bits = 0;            // of the levels, which follow the token that tells of them
    unsigned length = 0;
    unsigned ones = 0;
    unsigned state = total > 10 ? zolt::kManyLevels : zolt::kFewLevels;
    bool token_sent = false;
    const auto put_bits = [&] {
        if (!token_sent) {
            const CodeWord token = tokens[total][ones];
            out.put(token.bits, token.length);
            token_sent = true;
        }
        out.reserve(length);
        out.put(bits, length);
    };
    do {
        if (length > BitCursor::kRoom - kLongest) {
            // So many bits are not those of trailing ones alone: their number is known by now.
            put_bits();
            bits = 0;
            length = 0;
        }
        const int level = levels[static_cast<unsigned>(lowest_bit(reversed)) ^ 15];
        reversed &= reversed - 1;
        const unsigned index = static_cast<unsigned>(level + zolt::kSmallLevel);
        const zolt::LevelCode code = index < 2 * zolt::kSmallLevel
                                         ? cavlc_tables.level[state][index]
                                         : zolt::level_code(state, level);
        bits = bits << code.length | code.bits;
        length += code.length;
        ones += code.trailing_one;
        state = code.next;
    } while (reversed != 0);
    put_bits();
}

// run_before of the levels of a block that has zeros.
inline void put_runs(BitCursor& out, unsigned nonzero, unsigned reversed, unsigned total) {
    // The levels in front of the joint codes, one by one.
    constexpr unsigned kHigh = (1u << (16 - zolt::kJointPositions)) - 1;
    while ((reversed & kHigh) != 0) {
        const unsigned place = static_cast<unsigned>(lowest_bit(reversed));
        reversed &= reversed - 1;
        if (--total == 0) {
            return;  // in front of the last level is what zeros are left
        }
        const unsigned run = static_cast<unsigned>(lowest_bit(reversed)) - place - 1;
        const CodeWord code = cavlc_tables.run_before[15 - place - total][run];
        out.put(code.bits, code.length);
    }
    const zolt::RunCodes& codes = cavlc_tables.runs[nonzero & zolt::kJointMask];
    out.put(codes.bits, codes.length);
}

}  // namespace

int zolt::put_levels_of_block(BitCursor& cursor, const std::int16_t* levels, unsigned nonzero,
                              int count, unsigned token_class) {
    BitCursor out = cursor;
    const unsigned total =
        cavlc_tables.runs[nonzero & kJointMask].levels +
        static_cast<unsigned>(cavlc_tables.runs[nonzero >> kJointPositions].levels);
    const unsigned reversed = static_cast<unsigned>(cavlc_tables.reversed[nonzero & 0xff]) << 8 |
                              cavlc_tables.reversed[nonzero >> 8];
    put_levels(out, levels, reversed, total, cavlc_tables.coeff_token[token_class]);
    if (total < static_cast<unsigned>(count)) {
        constexpr unsigned kLongestZeros = 30;  // total_zeros and all run_before
        out.reserve(kLongestZeros);
        const unsigned zeros = 16 - static_cast<unsigned>(lowest_bit(reversed)) - total;
        const CodeWord code = count == 4 ? cavlc_tables.chroma_dc_total_zeros[total][zeros]
                                         : cavlc_tables.total_zeros[total][zeros];
        out.put(code.bits, code.length);
        put_runs(out, nonzero, reversed, total);
    }
    out.flush();
    cursor = out;
    return static_cast<int>(total);
}
