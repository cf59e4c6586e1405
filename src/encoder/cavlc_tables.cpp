#include "encoder/cavlc_tables.h"

namespace {

// Lengths and bits as in the tables of clause 9.2.

// coeff_token (Table 9-5) for 0 <= nC < 2, 2 <= nC < 4 and 4 <= nC < 8, by TotalCoeff and
// TrailingOnes.
constexpr std::uint8_t coeff_token_length[3][17][4] = {{{1, 0, 0, 0},
                                                        {6, 2, 0, 0},
                                                        {8, 6, 3, 0},
                                                        {9, 8, 7, 5},
                                                        {10, 9, 8, 6},
                                                        {11, 10, 9, 7},
                                                        {13, 11, 10, 8},
                                                        {13, 13, 11, 9},
                                                        {13, 13, 13, 10},
                                                        {14, 14, 13, 11},
                                                        {14, 14, 14, 13},
                                                        {15, 15, 14, 14},
                                                        {15, 15, 15, 14},
                                                        {16, 15, 15, 15},
                                                        {16, 16, 16, 15},
                                                        {16, 16, 16, 16},
                                                        {16, 16, 16, 16}},
                                                       {{2, 0, 0, 0},
                                                        {6, 2, 0, 0},
                                                        {6, 5, 3, 0},
                                                        {7, 6, 6, 4},
                                                        {8, 6, 6, 4},
                                                        {8, 7, 7, 5},
                                                        {9, 8, 8, 6},
                                                        {11, 9, 9, 6},
                                                        {11, 11, 11, 7},
                                                        {12, 11, 11, 9},
                                                        {12, 12, 12, 11},
                                                        {12, 12, 12, 11},
                                                        {13, 13, 13, 12},
                                                        {13, 13, 13, 13},
                                                        {13, 14, 13, 13},
                                                        {14, 14, 14, 13},
                                                        {14, 14, 14, 14}},
                                                       {{4, 0, 0, 0},
                                                        {6, 4, 0, 0},
                                                        {6, 5, 4, 0},
                                                        {6, 5, 5, 4},
                                                        {7, 5, 5, 4},
                                                        {7, 5, 5, 4},
                                                        {7, 6, 6, 4},
                                                        {7, 6, 6, 4},
                                                        {8, 7, 7, 5},
                                                        {8, 8, 7, 6},
                                                        {9, 8, 8, 7},
                                                        {9, 9, 8, 8},
                                                        {9, 9, 9, 8},
                                                        {10, 9, 9, 9},
                                                        {10, 10, 10, 10},
                                                        {10, 10, 10, 10},
                                                        {10, 10, 10, 10}}};
constexpr std::uint8_t coeff_token_bits[3][17][4] = {{{1, 0, 0, 0},
                                                      {5, 1, 0, 0},
                                                      {7, 4, 1, 0},
                                                      {7, 6, 5, 3},
                                                      {7, 6, 5, 3},
                                                      {7, 6, 5, 4},
                                                      {15, 6, 5, 4},
                                                      {11, 14, 5, 4},
                                                      {8, 10, 13, 4},
                                                      {15, 14, 9, 4},
                                                      {11, 10, 13, 12},
                                                      {15, 14, 9, 12},
                                                      {11, 10, 13, 8},
                                                      {15, 1, 9, 12},
                                                      {11, 14, 13, 8},
                                                      {7, 10, 9, 12},
                                                      {4, 6, 5, 8}},
                                                     {{3, 0, 0, 0},
                                                      {11, 2, 0, 0},
                                                      {7, 7, 3, 0},
                                                      {7, 10, 9, 5},
                                                      {7, 6, 5, 4},
                                                      {4, 6, 5, 6},
                                                      {7, 6, 5, 8},
                                                      {15, 6, 5, 4},
                                                      {11, 14, 13, 4},
                                                      {15, 10, 9, 4},
                                                      {11, 14, 13, 12},
                                                      {8, 10, 9, 8},
                                                      {15, 14, 13, 12},
                                                      {11, 10, 9, 12},
                                                      {7, 11, 6, 8},
                                                      {9, 8, 10, 1},
                                                      {7, 6, 5, 4}},
                                                     {{15, 0, 0, 0},
                                                      {15, 14, 0, 0},
                                                      {11, 15, 13, 0},
                                                      {8, 12, 14, 12},
                                                      {15, 10, 11, 11},
                                                      {11, 8, 9, 10},
                                                      {9, 14, 13, 9},
                                                      {8, 10, 9, 8},
                                                      {15, 14, 13, 13},
                                                      {11, 14, 10, 12},
                                                      {15, 10, 13, 12},
                                                      {11, 14, 9, 12},
                                                      {8, 10, 13, 8},
                                                      {13, 7, 9, 12},
                                                      {9, 12, 11, 10},
                                                      {5, 8, 7, 6},
                                                      {1, 4, 3, 2}}};

// coeff_token for chroma DC (nC -1).
constexpr std::uint8_t chroma_dc_token_length[5][4] = {
    {2, 0, 0, 0}, {6, 1, 0, 0}, {6, 6, 3, 0}, {6, 7, 7, 6}, {6, 8, 8, 7}};
constexpr std::uint8_t chroma_dc_token_bits[5][4] = {
    {1, 0, 0, 0}, {7, 1, 0, 0}, {4, 6, 1, 0}, {3, 3, 2, 5}, {2, 3, 2, 0}};

// total_zeros of 4x4 blocks (Tables 9-7, 9-8) by TotalCoeff - 1.
constexpr std::uint8_t total_zeros_length[15][16] = {
    {1, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8, 8, 9, 9, 9},
    {3, 3, 3, 3, 3, 4, 4, 4, 4, 5, 5, 6, 6, 6, 6},
    {4, 3, 3, 3, 4, 4, 3, 3, 4, 5, 5, 6, 5, 6},
    {5, 3, 4, 4, 3, 3, 3, 4, 3, 4, 5, 5, 5},
    {4, 4, 4, 3, 3, 3, 3, 3, 4, 5, 4, 5},
    {6, 5, 3, 3, 3, 3, 3, 3, 4, 3, 6},
    {6, 5, 3, 3, 3, 2, 3, 4, 3, 6},
    {6, 4, 5, 3, 2, 2, 3, 3, 6},
    {6, 6, 4, 2, 2, 3, 2, 5},
    {5, 5, 3, 2, 2, 2, 4},
    {4, 4, 3, 3, 1, 3},
    {4, 4, 2, 1, 3},
    {3, 3, 1, 2},
    {2, 2, 1},
    {1, 1}};
constexpr std::uint8_t total_zeros_bits[15][16] = {{1, 3, 2, 3, 2, 3, 2, 3, 2, 3, 2, 3, 2, 3, 2, 1},
                                                   {7, 6, 5, 4, 3, 5, 4, 3, 2, 3, 2, 3, 2, 1, 0},
                                                   {5, 7, 6, 5, 4, 3, 4, 3, 2, 3, 2, 1, 1, 0},
                                                   {3, 7, 5, 4, 6, 5, 4, 3, 3, 2, 2, 1, 0},
                                                   {5, 4, 3, 7, 6, 5, 4, 3, 2, 1, 1, 0},
                                                   {1, 1, 7, 6, 5, 4, 3, 2, 1, 1, 0},
                                                   {1, 1, 5, 4, 3, 3, 2, 1, 1, 0},
                                                   {1, 1, 1, 3, 3, 2, 2, 1, 0},
                                                   {1, 0, 1, 3, 2, 1, 1, 1},
                                                   {1, 0, 1, 3, 2, 1, 1},
                                                   {0, 1, 1, 2, 1, 3},
                                                   {0, 1, 1, 1, 1},
                                                   {0, 1, 1, 1},
                                                   {0, 1, 1},
                                                   {0, 1}};

// total_zeros of chroma DC (Table 9-9 (a)) by TotalCoeff - 1.
constexpr std::uint8_t chroma_dc_total_zeros_length[3][4] = {{1, 2, 3, 3}, {1, 2, 2}, {1, 1}};
constexpr std::uint8_t chroma_dc_total_zeros_bits[3][4] = {{1, 1, 1, 0}, {1, 1, 0}, {1, 0}};

// run_before (Table 9-10) by min(zerosLeft, 7) - 1.
constexpr std::uint8_t run_before_length[7][15] = {{1, 1},
                                                   {1, 2, 2},
                                                   {2, 2, 2, 2},
                                                   {2, 2, 2, 3, 3},
                                                   {2, 2, 3, 3, 3, 3},
                                                   {2, 3, 3, 3, 3, 3, 3},
                                                   {3, 3, 3, 3, 3, 3, 3, 4, 5, 6, 7, 8, 9, 10, 11}};
constexpr std::uint8_t run_before_bits[7][15] = {{1, 0},
                                                 {1, 1, 0},
                                                 {3, 2, 1, 0},
                                                 {3, 2, 1, 1, 0},
                                                 {3, 2, 3, 2, 1, 0},
                                                 {3, 0, 1, 3, 2, 5, 4},
                                                 {7, 6, 5, 4, 3, 2, 1, 1, 1, 1, 1, 1, 1, 1, 1}};

// Magnitude above which a level raises suffixLength (clause 9.2.2.1).
constexpr int kSuffixThreshold[7] = {0, 3, 6, 12, 24, 48, 32768};

constexpr int bit_count(unsigned mask) {
    int count = 0;
    for (; mask != 0; mask &= mask - 1) {
        ++count;
    }
    return count;
}

constexpr zolt::LevelCode make_level_code(unsigned state, int level) {
    const int magnitude = level < 0 ? -level : level;
    const int sign = level < 0 ? 1 : 0;
    const bool first = state < zolt::kSuffix1;  // but for trailing ones
    const bool many = state >= zolt::kManyLevels && state < zolt::kThreeOnes;
    const bool reduced = state < zolt::kThreeOnes;
    if (reduced && magnitude == 1) {
        unsigned next = state + 1;
        if (state == zolt::kManyLevels - 1) {
            next = zolt::kThreeOnes;
        }
        return {static_cast<std::uint16_t>(sign), 1, 1, static_cast<std::uint8_t>(next)};
    }
    const int suffix_length = first ? (many ? 1 : 0) : static_cast<int>(state) - zolt::kSuffix1 + 1;
    const int m = reduced ? magnitude - 1 : magnitude;

    int bits = 0;
    int length = 28;  // level_prefix 15 and 12 bits of level_suffix
    if (suffix_length == 0) {
        if (m <= 7) {
            bits = 1;
            length = 2 * m - 1 + sign;
        } else if (m <= 15) {
            bits = 16 | (m - 8) << 1 | sign;
            length = 19;
        } else {
            bits = 0x1000 | (m - 16) << 1 | sign;
        }
    } else {
        const int escape = (15 << (suffix_length - 1)) + 1;
        if (m < escape) {
            const int suffix = (m - 1) & ((1 << (suffix_length - 1)) - 1);
            bits = 1 << suffix_length | suffix << 1 | sign;
            length = ((m - 1) >> (suffix_length - 1)) + suffix_length + 1;
        } else {
            bits = 0x1000 | (m - escape) << 1 | sign;
        }
    }

    int next = magnitude > 3 ? 2 : 1;  // suffixLength
    if (!first) {
        next = suffix_length + (magnitude > kSuffixThreshold[suffix_length] ? 1 : 0);
    }
    return {static_cast<std::uint16_t>(bits), static_cast<std::uint8_t>(length), 0,
            static_cast<std::uint8_t>(zolt::kSuffix1 + next - 1)};
}

constexpr zolt::RunCodes make_run_codes(unsigned mask, const zolt::CodeWord (&run_before)[16][16]) {
    unsigned bits = 0;
    int length = 0;
    int position = 15;
    const int levels = bit_count(mask);
    while ((mask & (mask - 1)) != 0) {
        for (; (mask >> position & 1) == 0; --position) {}
        mask ^= 1u << position;
        int run = 0;
        for (; (mask >> (position - 1 - run) & 1) == 0; ++run) {}
        const zolt::CodeWord& code = run_before[position - bit_count(mask)][run];
        bits = bits << code.length | code.bits;
        length += code.length;
    }
    return {static_cast<std::uint16_t>(bits), static_cast<std::uint8_t>(length),
            static_cast<std::uint8_t>(levels)};
}

constexpr void fill_coeff_token(zolt::CavlcTables& t) {
    for (int total = 0; total <= 16; ++total) {
        for (int ones = 0; ones <= 3 && ones <= total; ++ones) {
            for (int table = 0; table < 3; ++table) {
                t.coeff_token[table][total][ones] = {coeff_token_bits[table][total][ones],
                                                     coeff_token_length[table][total][ones]};
            }
            const int fixed = total == 0 ? 3 : (total - 1) << 2 | ones;
            t.coeff_token[zolt::kNc8][total][ones] = {static_cast<std::uint8_t>(fixed), 6};
            if (total <= 4) {
                t.coeff_token[zolt::kNcChromaDc][total][ones] = {
                    chroma_dc_token_bits[total][ones], chroma_dc_token_length[total][ones]};
            }
        }
    }
}

constexpr void fill_zeros(zolt::CavlcTables& t) {
    for (int total = 1; total <= 15; ++total) {
        for (int zeros = 0; zeros <= 16 - total; ++zeros) {
            t.total_zeros[total][zeros] = {total_zeros_bits[total - 1][zeros],
                                           total_zeros_length[total - 1][zeros]};
        }
    }
    for (int total = 1; total <= 3; ++total) {
        for (int zeros = 0; zeros <= 4 - total; ++zeros) {
            t.chroma_dc_total_zeros[total][zeros] = {
                chroma_dc_total_zeros_bits[total - 1][zeros],
                chroma_dc_total_zeros_length[total - 1][zeros]};
        }
    }
    for (int zeros_left = 1; zeros_left <= 15; ++zeros_left) {
        for (int run = 0; run < 15 && run <= zeros_left; ++run) {
            const int row = (zeros_left < 7 ? zeros_left : 7) - 1;
            t.run_before[zeros_left][run] = {run_before_bits[row][run],
                                             run_before_length[row][run]};
        }
    }
    for (unsigned mask = 0; mask <= zolt::kJointMask; ++mask) {
        t.runs[mask] = make_run_codes(mask, t.run_before);
    }
}

constexpr void fill_levels(zolt::CavlcTables& t) {
    for (unsigned byte = 0; byte < 256; ++byte) {
        for (int bit = 0; bit < 8; ++bit) {
            t.reversed[byte] = static_cast<std::uint8_t>(t.reversed[byte] << 1 | (byte >> bit & 1));
        }
    }
    for (unsigned state = 0; state < zolt::kLevelStates; ++state) {
        for (int magnitude = 1; magnitude <= zolt::kSmallLevel; ++magnitude) {
            zolt::LevelCode* zero = t.level[state] + zolt::kSmallLevel;
            zero[-magnitude] = make_level_code(state, -magnitude);
            if (magnitude < zolt::kSmallLevel) {
                zero[magnitude] = make_level_code(state, magnitude);
            }
        }
    }
}

constexpr zolt::CavlcTables make_tables() {
    zolt::CavlcTables t{};
    fill_coeff_token(t);
    fill_zeros(t);
    fill_levels(t);
    return t;
}

}  // namespace

constexpr zolt::CavlcTables zolt::cavlc_tables = make_tables();

namespace {

constexpr bool runs_fit() {
    for (const zolt::RunCodes& codes : zolt::cavlc_tables.runs) {
        if (codes.length > 16) {
            return false;
        }
    }
    return true;
}
static_assert(runs_fit(), "the run_before codes of a mask are longer than their field");

}  // namespace

zolt::LevelCode zolt::level_code(unsigned state, int level) {
    return make_level_code(state, level);
}
