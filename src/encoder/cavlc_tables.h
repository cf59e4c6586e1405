#pragma once

#include <cstdint>

// The codes of clause 9.2, as the writer of residual blocks looks them up.
namespace zolt {

// The ranges of nC that have codes of their own for coeff_token: 0..1, 2..3, 4..7, 8 or more, and
// -1 for chroma DC.
enum TokenClass { kNc0, kNc2, kNc4, kNc8, kNcChromaDc, kTokenClasses };

// A code of which the zeros in front are not among the bits. Length 0: nothing is sent.
struct CodeWord {
    std::uint8_t bits, length;
};

// What the code of a level depends on. A block starts in the first of the states for up to 10
// levels or for more; a trailing one, of which only the sign is sent, leads to the next of the
// three, the third one to kThreeOnes. From the first level that is none of them, coded at
// suffixLength 0 or, among more than 10 levels, 1, and with its magnitude reduced by 1 unless three
// trailing ones precede it, the other levels are coded at suffixLength 1..6.
enum LevelState {
    kFewLevels,
    kManyLevels = kFewLevels + 3,
    kThreeOnes = kManyLevels + 3,
    kSuffix1,
    kLevelStates = kSuffix1 + 6
};

// The sign of a trailing one, or level_prefix and level_suffix of another level; whether it is a
// trailing one (1) or not (0); and the LevelState of the level after it.
struct alignas(8) LevelCode {
    std::uint16_t bits;
    std::uint8_t length, trailing_one, next;
};

// Magnitude up to which level codes are looked up (the positive one of it is not).
constexpr int kSmallLevel = 32;

// The run_before codes of a block, and how many levels it has.
struct RunCodes {
    std::uint16_t bits;
    std::uint8_t length, levels;
};

// Scan positions of a block whose run_before codes are one look-up.
constexpr int kJointPositions = 10;
constexpr unsigned kJointMask = (1u << kJointPositions) - 1;

struct CavlcTables {
    // coeff_token (Table 9-5) by nC, TotalCoeff and TrailingOnes.
    CodeWord coeff_token[kTokenClasses][17][4];
    // total_zeros (Tables 9-7, 9-8) by TotalCoeff and total_zeros, and that of chroma DC (Table 9-9
    // (a)).
    CodeWord total_zeros[16][16];
    CodeWord chroma_dc_total_zeros[4][4];
    // run_before (Table 9-10) by zerosLeft and run_before; nothing is sent when no zeros are left.
    CodeWord run_before[16][16];
    // All of a block's run_before by its mask of levels, whose lowest bit is the first position.
    RunCodes runs[1 << kJointPositions];
    // A byte's bits in reverse order.
    std::uint8_t reversed[256];
    // By LevelState and level + kSmallLevel.
    LevelCode level[kLevelStates][2 * kSmallLevel];
};
extern const CavlcTables cavlc_tables;

// The code of any level (magnitude 1..kMaxLevel) in a LevelState.
LevelCode level_code(unsigned state, int level);

}  // namespace zolt
