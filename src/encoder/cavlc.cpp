#include <cstring>

#include "encoder/MacroblockCoder.h"
#include "encoder/errors.h"
#include "encoder/residual_block.h"
#include "encoder/tables.h"

namespace {

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

// What stands for TotalCoeff where there is no block.
constexpr int kNoBlock = 33;

struct ClassBySum {
    std::uint8_t token_class[2 * kNoBlock + 1];
};

// Token class by the sum of nA and nB (clause 9.2.1), of which a sum from kNoBlock shows that one
// of them, or both, are not available.
constexpr ClassBySum make_token_classes() {
    ClassBySum table{};
    for (int sum = 0; sum <= 2 * kNoBlock; ++sum) {
        const int nC = sum == 2 * kNoBlock ? 0 : sum < kNoBlock ? (sum + 1) >> 1 : sum - kNoBlock;
        table.token_class[sum] = nC < 2   ? zolt::kNc0
                                 : nC < 4 ? zolt::kNc2
                                 : nC < 8 ? zolt::kNc4
                                          : zolt::kNc8;
    }
    return table;
}

constexpr ClassBySum kClassBySum = make_token_classes();

struct BlockPlaces {
    std::uint8_t of[16];
};

// Index in BlockCounts of block k in decoding order.
constexpr BlockPlaces make_block_places(int side) {
    BlockPlaces places{};
    for (int k = 0; k < side * side; ++k) {
        places.of[k] = static_cast<std::uint8_t>((zolt::luma_scan_j[k] + 1) * 2 * side + side +
                                                 zolt::luma_scan_i[k]);
    }
    return places;
}

// TotalCoeff of the kSide x kSide blocks of a macroblock's component, 0 to begin with, and of the
// blocks above and to the left. map: the macroblock's entries in a map of the picture with `stride`
// entries per row.
template <int kSide>
class BlockCounts {
public:
    BlockCounts(const std::uint8_t* map, std::ptrdiff_t stride, bool left, bool up) {
        if (up) {
            std::memcpy(m_counts + kSide, map - stride, kSide);
        } else {
            std::memset(m_counts + kSide, kNoBlock, kSide);
        }
        for (int j = 0; j < kSide; ++j) {
            at(-1, j) = left ? map[j * stride - 1] : std::uint8_t{kNoBlock};
        }
    }

    // Of block k in decoding order.
    std::uint8_t& of_block(int k) { return m_counts[kPlaces.of[k]]; }
    unsigned token_class(int k) const {
        const std::uint8_t* count = m_counts + kPlaces.of[k];
        return kClassBySum.token_class[count[-1] + count[-kStride]];
    }
    void store(std::uint8_t* map, std::ptrdiff_t stride) {
        for (int j = 0; j < kSide; ++j) {
            std::memcpy(map + j * stride, &at(0, j), kSide);
        }
    }

private:
    std::uint8_t& at(int i, int j) { return m_counts[(j + 1) * kStride + kSide + i]; }

    // A row above and a column to the left, in rows so long that a row of blocks is aligned.
    static constexpr int kStride = 2 * kSide;
    static constexpr BlockPlaces kPlaces = make_block_places(kSide);
    alignas(kStride) std::uint8_t m_counts[(kSide + 1) * kStride] = {};
};

}  // namespace

void MacroblockCoder::writeMBSyntax() {
    encode_header();
    encodeBlock();
}

void MacroblockCoder::writeMBSyntax_P() {
    if (!encode_mb_skip()) {
        encode_header();
        encodeBlock();
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

inline void MacroblockCoder::encode_I4Modes(BitCursor& out) {
    for (int k = 0; k < 16; k += 8) {
        std::uint64_t eight = 0;
        unsigned length = 0;
        for (int n = k; n < k + 8; ++n) {
            const bool predicted = g_prev_intra4x4_pred_mode_flag[n] != 0;
            const unsigned size = predicted ? 1 : 4;  // a flag of 1, or of 0 and three bits
            eight = eight << size | (predicted ? 1u : g_rem_intra4x4_pred_mode[n]);
            length += size;
        }
        out.reserve(length);
        out.put(eight, length);
    }
}

// mb_pred() of P_L0_16x16: with one active reference no ref_idx_l0 is sent.
inline void MacroblockCoder::encode_MB_Pred_P(BitCursor& out) {
    if (picture.g_num_ref_active > 1) {
        exitOnError("Unsupported Macroblock type in encode_MB_Pred_P\n", 107);
    }
    out.put_se(g_mvd_x);
    out.put_se(g_mvd_y);
}

inline void MacroblockCoder::encode_CBP(BitCursor& out) {
    out.put_ue(cbp_map.code[g_coded_block_pattern][g_cur_mb_mode == MB_INTRA4x4 ? 0 : 1]);
}

// mb_type to mb_qp_delta, as far as the macroblock has them.
void MacroblockCoder::encode_header() {
    BitCursor out(*bits);
    out.put_ue(static_cast<unsigned>(g_mb_type));
    if (g_cur_mb_mode == MB_P16x16) {
        encode_MB_Pred_P(out);
    } else {
        if (g_cur_mb_mode == MB_INTRA4x4) {
            encode_I4Modes(out);
        }
        out.put_ue(g_chroma_mode);
    }
    if (g_cur_mb_mode != MB_INTRA16x16) {
        encode_CBP(out);
    }
    if (g_cur_mb_mode == MB_INTRA16x16 || g_coded_block_pattern != 0) {
        out.put_se(0);  // mb_qp_delta: a picture has one QP
    }
    out.flush();
    out.end(*bits);
}

// residual(), clause 7.3.5.3.
void MacroblockCoder::encodeBlock() {
    const bool intra16x16 = g_cur_mb_mode == MB_INTRA16x16;
    if (g_coded_block_pattern == 0 && !intra16x16) {
        return;
    }
    BitCursor out(*bits);
    if ((g_coded_block_pattern & 15) != 0 || intra16x16) {
        encode_luma_blocks(out, intra16x16);
    }
    const int chroma = g_coded_block_pattern >> 4;
    if (chroma != 0) {
        for (int component = 0; component < 2; ++component) {
            zolt::encodeCAVLCBlock4x4(out, g_chroma_dc + 4 * component,
                                      g_chroma_dc_mask >> (4 * component) & 0xf, 4,
                                      zolt::kNcChromaDc);
        }
    }
    if (chroma == 2) {
        for (int component = 0; component < 2; ++component) {
            encode_chroma_ac_blocks(out, component);
        }
    }
    out.end(*bits);
}

inline void MacroblockCoder::encode_luma_blocks(BitCursor& out, bool intra16x16) {
    std::uint8_t* map = picture.g_cnum_l + first_block();
    BlockCounts<4> counts(map, picture.g_blk_width, g_mb_left, g_mb_up);
    if (intra16x16) {
        zolt::encodeCAVLCBlock4x4(out, g_luma_dc, g_luma_dc_nonzero, 16, counts.token_class(0));
    }
    const int first = intra16x16 ? 1 : 0;  // the DC levels have been sent
    for (unsigned rest = g_coded_block_pattern & 15; rest != 0; rest &= rest - 1) {
        const int start = 4 * zolt::lowest_bit(rest);
        for (int k = start; k < start + 4; ++k) {
            counts.of_block(k) = static_cast<std::uint8_t>(zolt::encodeCAVLCBlock4x4(
                out, g_scan_levels + 16 * k + first, g_nonzero[k] >> first, 16 - first,
                counts.token_class(k)));
        }
    }
    counts.store(map, picture.g_blk_width);
}

inline void MacroblockCoder::encode_chroma_ac_blocks(BitCursor& out, int component) {
    const std::ptrdiff_t stride = picture.g_blk_width / 2;
    std::uint8_t* map = (component == 0 ? picture.g_cnum_u : picture.g_cnum_v) +
                        static_cast<std::ptrdiff_t>(2 * g_mb_y) * stride + 2 * g_mb_x;
    BlockCounts<2> counts(map, stride, g_mb_left, g_mb_up);
    for (int b = 0; b < 4; ++b) {
        const int block = 16 + 4 * component + b;
        counts.of_block(b) = static_cast<std::uint8_t>(
            zolt::encodeCAVLCBlock4x4(out, g_scan_levels + 16 * block + 1, g_nonzero[block] >> 1u,
                                      15, counts.token_class(b)));
    }
    counts.store(map, stride);
}
