#include <algorithm>
#include <cstdlib>

#include "encoder/MacroblockCoder.h"
#include "encoder/bitops.h"
#include "encoder/errors.h"
#include "encoder/tables.h"

namespace {

// ---- Code tables: lengths and bits as in the tables of clause 9.2 ----

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

// coded_block_pattern by codeNum of me(v) (Table 9-4): intra 4x4, and inter.
constexpr std::uint8_t kIntraPatterns[48] = {
    47, 31, 15, 0,  23, 27, 29, 30, 7, 11, 13, 14, 39, 43, 45, 46, 16, 3,  5,  10, 12, 19, 21, 26,
    28, 35, 37, 42, 44, 1,  2,  4,  8, 17, 18, 20, 24, 6,  9,  22, 25, 32, 33, 34, 36, 40, 38, 41};
constexpr std::uint8_t kInterPatterns[48] = {
    0,  16, 1,  2,  4,  8,  32, 3,  5,  10, 12, 15, 47, 7,  11, 13, 14, 6,  9,  31, 35, 37, 42, 44,
    33, 34, 36, 40, 39, 43, 45, 46, 17, 18, 20, 24, 19, 21, 26, 28, 23, 27, 29, 30, 22, 25, 38, 41};

struct PatternMap {
    std::uint8_t code[48][2];
};

constexpr PatternMap make_cbp_map() {
    PatternMap map{};
    for (int code = 0; code < 48; ++code) {
        map.code[kIntraPatterns[code]][0] = static_cast<std::uint8_t>(code);
        map.code[kInterPatterns[code]][1] = static_cast<std::uint8_t>(code);
    }
    return map;
}

// codeNum by coded_block_pattern: column 0 intra 4x4, column 1 the other types.
constexpr PatternMap cbp_map = make_cbp_map();

// Magnitude above which a level raises suffixLength (clause 9.2.2.1).
constexpr int kSuffixThreshold[7] = {0, 3, 6, 12, 24, 48, 32768};

// Tables of encodeCAVLCBlock4x4: 0..2 as in coeff_token_length, and these.
constexpr int kFixedLengthTable = 3;  // nC of 8 or more
constexpr int kChromaDcTable = 4;     // nC -1

int coeff_token_table(int nC) {
    return nC < 2 ? 0 : nC < 4 ? 1 : nC < 8 ? 2 : kFixedLengthTable;
}

// nC of clause 9.2.1 for the block at `counts` in a map with `stride` entries per row.
int predicted_count(const std::uint8_t* counts, std::ptrdiff_t stride, bool left, bool up) {
    const int n_a = left ? counts[-1] : 0;
    const int n_b = up ? counts[-stride] : 0;
    return left && up ? (n_a + n_b + 1) >> 1 : n_a + n_b;
}

// Collects codes, so that the buffer is written to once for several of them.
class CodeGroup {
public:
    explicit CodeGroup(BitWriter& bits) : m_bits(bits) {}

    void put(std::uint32_t code, int length) {
        if (m_length + length > BitWriter::kMaxWrite) {
            flush();
        }
        m_codes = m_codes << length | code;
        m_length += length;
    }
    void flush() {
        m_bits.write_bits(m_codes, m_length);
        m_codes = 0;
        m_length = 0;
    }

private:
    BitWriter& m_bits;
    std::uint64_t m_codes = 0;
    int m_length = 0;
};

unsigned nonzero_mask(const std::int16_t* levels, int count) {
    unsigned mask = 0;
    for (int n = 0; n < count; ++n) {
        mask |= (levels[n] != 0 ? 1u : 0u) << n;
    }
    return mask;
}

}  // namespace

void MacroblockCoder::writeMBSyntax() {
    bits->write_uvlc_unsigned(static_cast<unsigned>(g_mb_type));
    if (g_cur_mb_mode == MB_INTRA4x4) {
        encode_I4Modes();
    }
    bits->write_uvlc_unsigned(g_chroma_mode);
    encode_coded_blocks();
}

void MacroblockCoder::writeMBSyntax_P() {
    if (encode_mb_skip()) {
        return;
    }
    if (g_cur_mb_mode == MB_P16x16) {
        bits->write_uvlc_unsigned(static_cast<unsigned>(g_mb_type));
        encode_MB_Pred_P();
        encode_coded_blocks();
    } else {
        writeMBSyntax();
    }
}

// Counts a skipped macroblock and returns true, or writes the mb_skip_run before a coded one, which
// the first of a row may have to leave to the appending of its bits.
bool MacroblockCoder::encode_mb_skip() {
    if (g_skip_flag) {
        ++g_skip_run;
        return true;
    }
    if (keep_first_run && first_run < 0) {
        first_run = g_skip_run;
    } else {
        bits->write_uvlc_unsigned(static_cast<unsigned>(g_skip_run));
    }
    g_skip_run = 0;
    return false;
}

void MacroblockCoder::encode_I4Modes() {
    for (int k = 0; k < 16; ++k) {
        if (g_prev_intra4x4_pred_mode_flag[k]) {
            bits->write_bits(1, 1);
        } else {
            bits->write_bits(g_rem_intra4x4_pred_mode[k], 4);  // a flag of 0 and three bits
        }
    }
}

// mb_pred() of P_L0_16x16: with one active reference no ref_idx_l0 is sent.
void MacroblockCoder::encode_MB_Pred_P() {
    if (picture.g_num_ref_active > 1) {
        exitOnError("Unsupported Macroblock type in encode_MB_Pred_P\n", 107);
    }
    bits->write_uvlc_signed(g_mvd_x);
    bits->write_uvlc_signed(g_mvd_y);
}

// coded_block_pattern, mb_qp_delta and residual(), as far as the macroblock has them.
void MacroblockCoder::encode_coded_blocks() {
    if (g_cur_mb_mode != MB_INTRA16x16) {
        encode_CBP();
        if (g_coded_block_pattern == 0) {
            return;
        }
    }
    bits->write_uvlc_signed(0);  // mb_qp_delta: a picture has one QP
    encodeBlock();
}

void MacroblockCoder::encode_CBP() {
    bits->write_uvlc_unsigned(
        cbp_map.code[g_coded_block_pattern][g_cur_mb_mode == MB_INTRA4x4 ? 0 : 1]);
}

// residual(), clause 7.3.5.3.
void MacroblockCoder::encodeBlock() {
    encode_luma_blocks();
    const int chroma = g_coded_block_pattern >> 4;
    if (chroma != 0) {
        for (int component = 0; component < 2; ++component) {
            const std::int16_t* dc = g_chroma_dc[component];
            const bool coded = (g_chroma_dc_mask >> component & 1) != 0;
            encodeCAVLCBlock4x4(dc, coded ? nonzero_mask(dc, 4) : 0u, 4, kChromaDcTable);
        }
    }
    if (chroma == 2) {
        encode_chroma_ac_blocks(0);
        encode_chroma_ac_blocks(1);
    }
}

void MacroblockCoder::encode_luma_blocks() {
    std::uint8_t* counts = picture.g_cnum_l + first_block();
    const bool intra16x16 = g_cur_mb_mode == MB_INTRA16x16;
    if (intra16x16) {
        const int nC = predicted_count(counts, picture.g_blk_width, g_mb_left, g_mb_up);
        encodeCAVLCBlock4x4(g_luma_dc, nonzero_mask(g_luma_dc, 16), 16, coeff_token_table(nC));
    }
    const int first = intra16x16 ? 1 : 0;  // the DC levels have been sent
    for (unsigned rest = g_coded_block_pattern & 15; rest != 0; rest &= rest - 1) {
        const int start = 4 * zolt::lowest_bit(rest);
        for (int k = start; k < start + 4; ++k) {
            const int i = zolt::luma_scan_i[k];
            const int j = zolt::luma_scan_j[k];
            std::uint8_t* count = counts + j * picture.g_blk_width + i;
            const int nC =
                predicted_count(count, picture.g_blk_width, i > 0 || g_mb_left, j > 0 || g_mb_up);
            const unsigned nonzero = (g_luma_mask >> k & 1) ? g_nonzero[k] >> first : 0u;
            *count = encodeCAVLCBlock4x4(g_scan_levels + 16 * k + first, nonzero, 16 - first,
                                         coeff_token_table(nC));
        }
    }
}

void MacroblockCoder::encode_chroma_ac_blocks(int component) {
    const std::ptrdiff_t stride = picture.g_blk_width / 2;
    std::uint8_t* counts = (component == 0 ? picture.g_cnum_u : picture.g_cnum_v) +
                           static_cast<std::ptrdiff_t>(2 * g_mb_y) * stride + 2 * g_mb_x;
    for (int b = 0; b < 4; ++b) {
        const int i = b & 1;
        const int j = b >> 1;
        std::uint8_t* count = counts + j * stride + i;
        const int nC = predicted_count(count, stride, i > 0 || g_mb_left, j > 0 || g_mb_up);
        const int block = 16 + 4 * component + b;
        *count = encodeCAVLCBlock4x4(g_scan_levels + 16 * block + 1, g_nonzero[block] >> 1u, 15,
                                     coeff_token_table(nC));
    }
}

// residual_block_cavlc(), clauses 7.3.5.3.2 and 9.2: count levels in scan order, of which those in
// the mask are not 0; returns the number of these. Longer than most functions because it is one
// syntax structure.
std::uint8_t MacroblockCoder::encodeCAVLCBlock4x4(const std::int16_t* levels, unsigned nonzero,
                                                  int count, int table) {
    // Levels that are not 0 and the zeros in front of each, from the highest frequency down.
    int level[16];
    int run[16];
    int total = 0;
    int total_zeros = 0;
    for (int end = zolt::bit_length(nonzero); end > 0;) {
        const int position = end - 1;
        nonzero ^= 1u << position;
        const int next_end = zolt::bit_length(nonzero);
        level[total] = levels[position];
        run[total] = position - next_end;
        total_zeros += run[total];
        ++total;
        end = next_end;
    }
    int trailing_ones = 0;
    unsigned signs = 0;
    // NOLINTNEXTLINE(clang-analyzer-core.CallAndMessage): the first `total` levels are set.
    while (trailing_ones < std::min(total, 3) && std::abs(level[trailing_ones]) == 1) {
        signs = signs << 1 | (level[trailing_ones] < 0 ? 1u : 0u);
        ++trailing_ones;
    }

    CodeGroup codes(*bits);
    if (table == kChromaDcTable) {
        codes.put(chroma_dc_token_bits[total][trailing_ones],
                  chroma_dc_token_length[total][trailing_ones]);
    } else if (table == kFixedLengthTable) {
        codes.put(total == 0 ? 3u : static_cast<unsigned>((total - 1) << 2 | trailing_ones), 6);
    } else {
        codes.put(coeff_token_bits[table][total][trailing_ones],
                  coeff_token_length[table][total][trailing_ones]);
    }
    if (total == 0) {
        codes.flush();
        return 0;
    }
    if (trailing_ones > 0) {
        codes.put(signs, trailing_ones);
    }

    int suffix_length = total > 10 && trailing_ones < 3 ? 1 : 0;
    for (int n = trailing_ones; n < total; ++n) {
        const int magnitude = std::abs(level[n]);
        const bool first = n == trailing_ones;
        const int m = first && trailing_ones < 3 ? magnitude - 1 : magnitude;
        const unsigned sign = level[n] < 0 ? 1 : 0;
        if (suffix_length == 0) {
            if (m <= 7) {
                codes.put(1, 2 * m - 1 + static_cast<int>(sign));
            } else if (m <= 15) {
                codes.put(16u | static_cast<unsigned>(m - 8) << 1 | sign, 19);
            } else {
                codes.put(0x1000u | static_cast<unsigned>(m - 16) << 1 | sign, 28);
            }
        } else {
            const int escape = (15 << (suffix_length - 1)) + 1;
            if (m < escape) {
                const unsigned suffix =
                    static_cast<unsigned>(m - 1) & ((1u << (suffix_length - 1)) - 1);
                codes.put(1u << suffix_length | suffix << 1 | sign,
                          ((m - 1) >> (suffix_length - 1)) + suffix_length + 1);
            } else {
                codes.put(0x1000u | static_cast<unsigned>(m - escape) << 1 | sign, 28);
            }
        }
        if (magnitude > kSuffixThreshold[suffix_length]) {
            ++suffix_length;
        }
        if (first && magnitude > 3) {
            suffix_length = 2;
        }
    }

    if (total < count) {
        if (table == kChromaDcTable) {
            codes.put(chroma_dc_total_zeros_bits[total - 1][total_zeros],
                      chroma_dc_total_zeros_length[total - 1][total_zeros]);
        } else {
            codes.put(total_zeros_bits[total - 1][total_zeros],
                      total_zeros_length[total - 1][total_zeros]);
        }
    }
    int zeros_left = total_zeros;
    for (int n = 0; n < total - 1 && zeros_left > 0; ++n) {
        const int row = std::min(zeros_left, 7) - 1;
        codes.put(run_before_bits[row][run[n]], run_before_length[row][run[n]]);
        zeros_left -= run[n];
    }
    codes.flush();
    return static_cast<std::uint8_t>(total);
}
