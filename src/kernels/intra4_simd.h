#pragma once

#include "kernels/Kernels.h"
#include "kernels/avx2.h"
#include "kernels/intra4_samples.h"

// Intra 4x4 coding of a macroblock, which the files compiled for AVX2 and for AVX-512 share but for
// the mode search. Its time is that of a chain: neighbours, mode, levels and reconstruction of a
// block, which is the neighbour of the next. So nothing that the next block waits for branches or
// takes a detour through more memory than one store and load, and what can be known without the
// neighbours is worked out before.
namespace zolt {
namespace {

// Two orders of a block's samples.
//
// Butterfly order: rows 0 1 3 2, of each columns 0 1 3 2. With two rows a vector the outer and the
// inner rows of a transform's first step then stand side by side, and after a transposition the
// columns do too.
//
// Phase order: for columns 0 and 1 and then for 2 and 3, the samples (x, y), (x, y + 2) of the four
// sampling phases of Kernels::phase_satd_4x4: phase 0 at (0, 0), 1 at (1, 0), 2 at (0, 1),
// 3 at (1, 1).
constexpr int kButterfly[4] = {0, 1, 3, 2};

constexpr int phase_position(int x, int y) {
    return 8 * (x >> 1) + 4 * (y & 1) + 2 * (x & 1) + (y >> 1);
}

struct Bytes16 {
    alignas(16) std::int8_t at[16];
};

// From phase order to butterfly order.
constexpr Bytes16 butterfly_from_phases() {
    Bytes16 shuffle{};
    for (int i = 0; i < 16; ++i) {
        shuffle.at[i] =
            static_cast<std::int8_t>(phase_position(kButterfly[i % 4], kButterfly[i / 4]));
    }
    return shuffle;
}
constexpr Bytes16 kButterflyFromPhases = butterfly_from_phases();

// The mode searches give the candidates slots: the modes but for the predicted one in their order.
constexpr int kSlots = 8;
constexpr int slot_mode(int predicted, int slot) {
    return slot + (slot >= predicted ? 1 : 0);
}

// Where the neighbours stand in the vector that the blocks loop gathers: A..H, then L, K, J, I,
// then M. Neighbour i of predicted_sample's row is at:
constexpr int gathered(int i, bool up_right) {
    return i < 4 ? 8 + i : i == 4 ? 12 : i < 9 || up_right ? i - 5 : 3;
}
constexpr int repeat_outermost(int i) {
    return i < 0 ? 0 : i > 12 ? 12 : i;
}

// Which of the gathered neighbours make the mean, four of them twice where the others are not
// there, and what is added to eight of them before the division by 8. By 2 * up + left.
struct MeanRule {
    alignas(16) std::int8_t from[16];
    int added;
};
constexpr MeanRule kMeanRules[4] = {
    {{-1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1}, 8 * 128},
    {{8, 9, 10, 11, 8, 9, 10, 11, -1, -1, -1, -1, -1, -1, -1, -1}, 4},
    {{0, 1, 2, 3, 0, 1, 2, 3, -1, -1, -1, -1, -1, -1, -1, -1}, 4},
    {{0, 1, 2, 3, 8, 9, 10, 11, -1, -1, -1, -1, -1, -1, -1, -1}, 4}};

// The mean in the first byte, the others 0.
inline __m128i mean_of(__m128i neighbours, int available) {
    const MeanRule& rule = kMeanRules[available];
    const __m128i used = _mm_shuffle_epi8(neighbours, load_16(rule.from));
    const __m128i sum = _mm_sad_epu8(used, _mm_setzero_si128());
    return _mm_srli_epi32(_mm_add_epi32(sum, _mm_cvtsi32_si128(rule.added)), 3);
}

// More than any cost: the slots whose mode lacks neighbours, by 2 * up + left and predicted mode.
constexpr std::int16_t kNoCost = 0x7fff;
struct Unavailable {
    alignas(16) std::int16_t slots[4][kIntra4Modes][kSlots];
};
constexpr Unavailable unavailable() {
    Unavailable table{};
    for (int available = 0; available < 4; ++available) {
        const bool up = available >= 2, left = available % 2 != 0;
        for (int predicted = 0; predicted < kIntra4Modes; ++predicted) {
            for (int slot = 0; slot < kSlots; ++slot) {
                const int mode = slot_mode(predicted, slot);
                const bool needs_up = mode != 1 && mode != 2 && mode != 8;
                const bool needs_left = mode == 1 || mode == 8 || (mode >= 4 && mode <= 6);
                const bool missing = (needs_up && !up) || (needs_left && !left);
                table.slots[available][predicted][slot] = missing ? kNoCost : std::int16_t{0};
            }
        }
    }
    return table;
}
constexpr Unavailable kUnavailable = unavailable();

// What is known of a block before its neighbours are.
struct alignas(32) SourceBlock {
    // Twice the sums and twice the differences of the sample pairs in phase order.
    std::int16_t sums[8], differences[8];
    std::uint8_t samples[16];  // in butterfly order
};

inline __m256i twice() {
    return _mm256_set1_epi8(2);
}
inline __m256i twice_difference() {
    return _mm256_set1_epi16(static_cast<short>(0xfe02));  // 2 and -2
}

// Four blocks that stand side by side.
inline void prepare_blocks(const std::uint8_t* src, std::ptrdiff_t stride, SourceBlock* blocks) {
    const __m128i swap_columns =
        _mm_setr_epi8(0, 1, 3, 2, 4, 5, 7, 6, 8, 9, 11, 10, 12, 13, 15, 14);
    __m128i rows[4];
    for (int y = 0; y < 4; ++y) {
        rows[y] = load_16(src + y * stride);
    }
    const auto pairs = [&rows](int y) {
        return join(_mm_unpacklo_epi8(rows[y], rows[y + 2]),
                    _mm_unpackhi_epi8(rows[y], rows[y + 2]));
    };
    const __m256i even = pairs(0), odd = pairs(1);
    const __m256i even_sums = _mm256_maddubs_epi16(even, twice());
    const __m256i odd_sums = _mm256_maddubs_epi16(odd, twice());
    const __m256i even_differences = _mm256_maddubs_epi16(even, twice_difference());
    const __m256i odd_differences = _mm256_maddubs_epi16(odd, twice_difference());
    const __m256i sums_02 = _mm256_unpacklo_epi32(even_sums, odd_sums);
    const __m256i sums_13 = _mm256_unpackhi_epi32(even_sums, odd_sums);
    const __m256i differences_02 = _mm256_unpacklo_epi32(even_differences, odd_differences);
    const __m256i differences_13 = _mm256_unpackhi_epi32(even_differences, odd_differences);
    for (int y = 0; y < 4; ++y) {
        rows[y] = _mm_shuffle_epi8(rows[y], swap_columns);
    }
    const __m128i upper_01 = _mm_unpacklo_epi32(rows[0], rows[1]);
    const __m128i upper_23 = _mm_unpackhi_epi32(rows[0], rows[1]);
    const __m128i lower_01 = _mm_unpacklo_epi32(rows[3], rows[2]);
    const __m128i lower_23 = _mm_unpackhi_epi32(rows[3], rows[2]);
    const auto store_block = [](SourceBlock& b, __m128i sums, __m128i differences,
                                __m128i samples) {
        store_16(b.sums, sums);
        store_16(b.differences, differences);
        store_16(b.samples, samples);
    };
    store_block(blocks[0], low_lane(sums_02), low_lane(differences_02),
                _mm_unpacklo_epi64(upper_01, lower_01));
    store_block(blocks[1], low_lane(sums_13), low_lane(differences_13),
                _mm_unpackhi_epi64(upper_01, lower_01));
    store_block(blocks[2], high_lane(sums_02), high_lane(differences_02),
                _mm_unpacklo_epi64(upper_23, lower_23));
    store_block(blocks[3], high_lane(sums_13), high_lane(differences_13),
                _mm_unpackhi_epi64(upper_23, lower_23));
}

// What a mode search knows of its block.
struct SearchInput {
    __m128i neighbours;  // as gathered() tells
    int up_right;        // 1: E..H are there; otherwise D stands in
    int available;       // 2 * up + left
    int predicted;       // mode
    const SourceBlock* source;
};

// a if condition is 1, b if it is 0, without a branch that a compiler might make of it: which of
// two modes it is cannot be foretold.
inline int one_of(int condition, int a, int b) {
    return b ^ ((a ^ b) & -condition);
}

struct SearchResult {
    int mode;
    __m128i pred;  // its prediction in butterfly order
};

// Distortion of the predicted mode in all eight lanes, from its prediction in phase order.
inline __m128i predicted_distortion(__m128i pred, const SourceBlock& source) {
    const auto larger = [](__m128i difference) {
        const __m128i magnitude = _mm_abs_epi16(difference);
        return _mm_max_epi16(magnitude, _mm_shuffle_epi32(magnitude, _MM_SHUFFLE(1, 0, 3, 2)));
    };
    const __m128i sums = _mm_maddubs_epi16(pred, low_lane(twice()));
    const __m128i differences = _mm_maddubs_epi16(pred, low_lane(twice_difference()));
    // |a + b| + |a - b| = 2 max(|a|, |b|), a and b two columns apart.
    __m128i phases = _mm_add_epi16(larger(_mm_sub_epi16(load_16(source.sums), sums)),
                                   larger(_mm_sub_epi16(load_16(source.differences), differences)));
    phases = _mm_add_epi16(phases, _mm_shuffle_epi32(phases, _MM_SHUFFLE(2, 3, 0, 1)));
    const __m128i swap = _mm_setr_epi8(2, 3, 0, 1, 6, 7, 4, 5, 10, 11, 8, 9, 14, 15, 12, 13);
    return _mm_add_epi16(phases, _mm_shuffle_epi8(phases, swap));
}

// Numbers of the mode choice in vectors; those of the four phases stand in every 64 bits.
struct SearchRule {
    __m128i rates, drop, never;
    int kept;

    explicit SearchRule(const Intra4x4& mb)
        : rates(_mm_mullo_epi16(_mm_set1_epi16(static_cast<short>(mb.rate)),
                                _mm_setr_epi16(1, 2, 3, 4, 1, 2, 3, 4))),
          drop(_mm_setr_epi16(mb.drop[0], mb.drop[1], mb.drop[2], 0, mb.drop[0], mb.drop[1],
                              mb.drop[2], 0)),
          never(_mm_setr_epi16(0, 0, 0, kNoCost, 0, 0, 0, kNoCost)),
          kept(mb.kept) {}

    // The costs above which a candidate is dropped after each phase.
    __m128i limits(__m128i predicted_cost) const {
        const __m128i share = _mm_srli_epi16(predicted_cost, 2);
        return _mm_or_si128(_mm_srli_epi16(_mm_mullo_epi16(share, drop), 2), never);
    }
};

struct CodedBlocks {
    __m256i samples;        // reconstructions in raster order
    std::uint32_t nonzero;  // masks of the levels that are not 0, 16 bits each
};

// A quantiser in vectors, for two blocks at a time, one in each lane.
class BlockCoder {
public:
    explicit BlockCoder(const Quantizer& q)
        : m_forward{both(q.forward), both(q.forward + 8)},
          m_dequant{both(q.dequant), both(q.dequant + 8)},
          m_rounding(_mm256_set1_epi32(q.rounding)),
          m_largest(_mm256_set1_epi16(kMaxLevel)),
          m_shift(_mm_cvtsi32_si128(q.shift)) {}

    // Codes two blocks from their samples and predictions, all in butterfly order: levels in
    // zig-zag order at scan[0] and scan[1].
    CodedBlocks code(__m256i samples, __m256i pred, std::int16_t* const* scan) const {
        const __m256i zero = _mm256_setzero_si256();
        const __m256i pred_upper = _mm256_unpacklo_epi8(pred, zero);
        const __m256i pred_lower = _mm256_unpackhi_epi8(pred, zero);
        __m256i first = _mm256_sub_epi16(_mm256_unpacklo_epi8(samples, zero), pred_upper);
        __m256i last = _mm256_sub_epi16(_mm256_unpackhi_epi8(samples, zero), pred_lower);
        forward(&first, &last);
        transpose(&first, &last);
        forward(&first, &last);  // now columns 0 and 1, and 2 and 3
        const __m256i levels_01 = quantize(first, m_forward[0]);
        const __m256i levels_23 = quantize(last, m_forward[1]);
        const std::uint32_t nonzero = store_levels(levels_01, levels_23, scan);

        first = _mm256_mullo_epi16(levels_01, m_dequant[0]);
        last = _mm256_mullo_epi16(levels_23, m_dequant[1]);
        if (may_exceed_16_bits(first, last)) {
            return {reconstruct_wide(first, last, pred), nonzero};
        }
        // The rounding of every sample.
        first = _mm256_add_epi16(first, _mm256_setr_epi32(32, 0, 0, 0, 32, 0, 0, 0));
        inverse(&first, &last);
        transpose(&first, &last);
        inverse(&first, &last);
        const __m256i upper = _mm256_add_epi16(_mm256_srai_epi16(first, 6), pred_upper);
        const __m256i lower = _mm256_add_epi16(_mm256_srai_epi16(last, 6), pred_lower);
        return {_mm256_shuffle_epi8(_mm256_packus_epi16(upper, lower),
                                    _mm256_broadcastsi128_si256(raster())),
                nonzero};
    }

private:
    static __m256i both(const std::int16_t* values) {
        return _mm256_broadcastsi128_si256(load_16(values));
    }

    // Butterfly order is its own inverse.
    static __m128i raster() {
        return _mm_setr_epi8(0, 1, 3, 2, 4, 5, 7, 6, 12, 13, 15, 14, 8, 9, 11, 10);
    }

    // Forward core transform across rows or columns 0 and 1, and 3 and 2; leaves 0 and 1, and 2
    // and 3.
    static void forward(__m256i* v01, __m256i* v32) {
        const __m256i second = _mm256_setr_epi32(0, 0, -1, -1, 0, 0, -1, -1);
        const __m256i st = _mm256_add_epi16(*v01, *v32);  // 0 + 3, 1 + 2
        const __m256i du = _mm256_sub_epi16(*v01, *v32);  // 0 - 3, 1 - 2
        const __m256i sd = _mm256_unpacklo_epi64(st, du), tu = _mm256_unpackhi_epi64(st, du);
        // s + t and 2d + u; s - t and d - 2u.
        *v01 = _mm256_add_epi16(_mm256_add_epi16(sd, tu), _mm256_and_si256(sd, second));
        *v32 = _mm256_sub_epi16(_mm256_sub_epi16(sd, tu), _mm256_and_si256(tu, second));
    }

    // Inverse core transform across rows or columns 0 and 1, and 2 and 3; leaves 0 and 1, and 3
    // and 2.
    static void inverse(__m256i* v01, __m256i* v23) {
        const auto halve_second = [](__m256i v) {
            return _mm256_blend_epi16(v, _mm256_srai_epi16(v, 1), 0xf0);
        };
        const __m256i eh = _mm256_add_epi16(*v01, halve_second(*v23));
        const __m256i fg = _mm256_sub_epi16(halve_second(*v01), *v23);
        const __m256i ef = _mm256_unpacklo_epi64(eh, fg), hg = _mm256_unpackhi_epi64(eh, fg);
        *v01 = _mm256_add_epi16(ef, hg);
        *v23 = _mm256_sub_epi16(ef, hg);
    }

    // Exchanges rows and columns. Either may stand in butterfly order before, the other does then
    // after it.
    static void transpose(__m256i* first, __m256i* last) {
        const __m256i a = _mm256_unpacklo_epi16(*first, *last);
        const __m256i b = _mm256_unpackhi_epi16(*first, *last);
        *first = _mm256_unpacklo_epi16(a, b);
        *last = _mm256_unpackhi_epi16(a, b);
    }

    __m256i quantize(__m256i c, __m256i factors) const {
        const __m256i magnitude = _mm256_abs_epi16(c);
        const __m256i low = _mm256_mullo_epi16(magnitude, factors);
        const __m256i high = _mm256_mulhi_epu16(magnitude, factors);
        const __m256i first = _mm256_srl_epi32(
            _mm256_add_epi32(_mm256_unpacklo_epi16(low, high), m_rounding), m_shift);
        const __m256i second = _mm256_srl_epi32(
            _mm256_add_epi32(_mm256_unpackhi_epi16(low, high), m_rounding), m_shift);
        return _mm256_sign_epi16(_mm256_min_epi16(_mm256_packs_epi32(first, second), m_largest), c);
    }

    static std::uint32_t store_levels(__m256i levels_01, __m256i levels_23,
                                      std::int16_t* const* scan) {
        __m128i low[2], high[2];
        zigzag(low_lane(levels_01), low_lane(levels_23), &low[0], &high[0]);
        zigzag(high_lane(levels_01), high_lane(levels_23), &low[1], &high[1]);
        for (int i = 0; i < 2; ++i) {
            store_16(scan[i], low[i]);
            store_16(scan[i] + 8, high[i]);
        }
        const __m256i bytes =
            join(_mm_packs_epi16(low[0], high[0]), _mm_packs_epi16(low[1], high[1]));
        const int zeros = _mm256_movemask_epi8(_mm256_cmpeq_epi8(bytes, _mm256_setzero_si256()));
        return ~static_cast<std::uint32_t>(zeros);
    }

    // No sum of the inverse transform, its rounding included, exceeds the sum of the magnitudes
    // and 32.
    static bool may_exceed_16_bits(__m256i first, __m256i last) {
        constexpr short kLargestPair = (32767 - 32) / 8;
        const __m256i pairs = _mm256_adds_epi16(_mm256_abs_epi16(first), _mm256_abs_epi16(last));
        return _mm256_movemask_epi8(_mm256_cmpgt_epi16(pairs, _mm256_set1_epi16(kLargestPair))) !=
               0;
    }

    [[gnu::noinline]] static __m256i reconstruct_wide(__m256i first, __m256i last, __m256i pred) {
        return join(reconstruct_wide(low_lane(first), low_lane(last), low_lane(pred)),
                    reconstruct_wide(high_lane(first), high_lane(last), high_lane(pred)));
    }
    static __m128i reconstruct_wide(__m128i first, __m128i last, __m128i pred) {
        alignas(32) std::int16_t coefs[16];
        alignas(16) std::uint8_t samples[16];
        store_16(coefs, first);
        store_16(coefs + 8, last);
        store_16(samples, _mm_shuffle_epi8(pred, raster()));
        scalar_kernels().reconstruct_4x4(coefs, samples, samples, 4);
        return load_16(samples);
    }

    __m256i m_forward[2], m_dequant[2];
    __m256i m_rounding, m_largest;
    __m128i m_shift;
};

// The blocks in the order of coding: two, then six pairs of which neither depends on the other,
// then two.
struct BlockPlace {
    std::uint8_t x, y;      // in blocks
    std::uint8_t k;         // index in decoding order
    std::uint8_t up_right;  // E..H are there: 0 never, 1 where the macroblocks above are, 2 always
};
constexpr BlockPlace kPlaces[16] = {{0, 0, 0, 1},  {1, 0, 1, 1},   //
                                    {2, 0, 4, 1},  {0, 1, 2, 2},   //
                                    {3, 0, 5, 1},  {1, 1, 3, 0},   //
                                    {2, 1, 6, 2},  {0, 2, 8, 2},   //
                                    {3, 1, 7, 0},  {1, 2, 9, 2},   //
                                    {2, 2, 12, 2}, {0, 3, 10, 2},  //
                                    {3, 2, 13, 0}, {1, 3, 11, 0},  //
                                    {2, 3, 14, 2}, {3, 3, 15, 0}};

// What a block has around it, by the macroblocks that are there: up + 2 * left + 4 * up right.
struct BlockNeighbours {
    std::uint8_t available[16];  // 2 * up + left
    std::uint8_t up_right[16];   // 1: E..H are there
};
struct MacroblockNeighbours {
    BlockNeighbours of[8];
};
constexpr MacroblockNeighbours macroblock_neighbours() {
    MacroblockNeighbours table{};
    for (int there = 0; there < 8; ++there) {
        for (int n = 0; n < 16; ++n) {
            const BlockPlace& place = kPlaces[n];
            const bool up = place.y > 0 || (there & 1) != 0;
            const bool left = place.x > 0 || (there & 2) != 0;
            const bool above_right = place.k == 5 ? (there & 4) != 0 : up;
            table.of[there].available[n] = static_cast<std::uint8_t>(2 * up + left);
            table.of[there].up_right[n] = place.up_right + above_right > 1 ? 1 : 0;
        }
    }
    return table;
}
constexpr MacroblockNeighbours kMacroblockNeighbours = macroblock_neighbours();

inline __m128i load_4(const void* p) {
    std::int32_t value;
    __builtin_memcpy(&value, p, sizeof value);
    return _mm_cvtsi32_si128(value);
}
inline void store_4(void* p, std::int32_t value) {
    __builtin_memcpy(p, &value, sizeof value);
}

// The macroblock while its blocks are coded.
template <typename Search>
class MacroblockBlocks {
public:
    explicit MacroblockBlocks(const Intra4x4& mb)
        : m_stride(mb.stride),
          m_modes_stride(mb.modes_stride),
          m_search(mb),
          m_coder(*mb.quantizer) {
        for (int y = 0; y < 4; ++y) {
            const std::uint8_t* row = mb.samples + 4 * y * mb.stride;
            prepare_blocks(row, mb.stride, m_sources + 4 * y);
            m_left_columns[y] =
                static_cast<std::uint32_t>(row[3 * mb.stride - 1] | row[2 * mb.stride - 1] << 8 |
                                           row[mb.stride - 1] << 16) |
                static_cast<std::uint32_t>(row[-1]) << 24;
        }
        const BlockNeighbours& neighbours =
            kMacroblockNeighbours.of[mb.up + 2 * mb.left + 4 * mb.up_right];
        for (int n = 0; n < 16; ++n) {
            const BlockPlace& place = kPlaces[n];
            m_blocks[n] = {mb.samples + 4 * place.y * mb.stride + 4 * place.x,
                           mb.modes + place.y * mb.modes_stride + place.x,
                           &m_sources[4 * place.y + place.x],
                           &m_left_columns[place.y],
                           mb.scan + 16 * place.k,
                           place.k,
                           neighbours.available[n],
                           neighbours.up_right[n]};
        }
    }

    // Codes kBlocks blocks, 1 or 2, of the order of coding from n.
    template <int kBlocks>
    [[gnu::always_inline]] void code(const Intra4x4& mb, int n) {
        const Block* const blocks = m_blocks + n;
        SearchInput inputs[2];
        SearchResult results[2];
        for (int i = 0; i < kBlocks; ++i) {
            inputs[i] = gather(blocks[i]);
        }
        m_search.template run<kBlocks>(inputs, results);
        constexpr int kSecond = kBlocks - 1;
        std::int16_t* const scan[2] = {blocks[0].scan, blocks[kSecond].scan};
        const CodedBlocks coded = m_coder.code(
            join(load_16(inputs[0].source->samples), load_16(inputs[kSecond].source->samples)),
            join(results[0].pred, results[kSecond].pred), scan);
        store(mb, blocks[0], inputs[0].predicted, results[0].mode, low_lane(coded.samples),
              coded.nonzero);
        if (kBlocks == 2) {
            store(mb, blocks[1], inputs[1].predicted, results[1].mode, high_lane(coded.samples),
                  coded.nonzero >> 16);
        }
    }

private:
    struct Block {
        std::uint8_t* samples;
        std::int8_t* mode;
        const SourceBlock* source;
        std::uint32_t* left_column;
        std::int16_t* scan;
        std::uint32_t k;
        std::uint8_t available, up_right;
    };

    SearchInput gather(const Block& block) const {
        const std::uint8_t* above = block.samples - m_stride;
        const __m128i row_above = _mm_unpacklo_epi32(load_4(above), load_4(above + 4));
        const __m128i others = _mm_insert_epi8(load_4(block.left_column), above[-1], 4);
        const int mode_above = block.mode[-m_modes_stride], mode_left = block.mode[-1];
        const int smaller = mode_above < mode_left ? mode_above : mode_left;
        return {_mm_unpacklo_epi64(row_above, others), block.up_right, block.available,
                smaller >= 0 ? smaller : 2, block.source};
    }

    void store(const Intra4x4& mb, const Block& block, int predicted, int mode, __m128i samples,
               std::uint32_t nonzero) const {
        *block.mode = static_cast<std::int8_t>(mode);
        mb.predicted[block.k] = static_cast<std::uint8_t>(predicted);
        mb.chosen[block.k] = static_cast<std::uint8_t>(mode);
        mb.nonzero[block.k] = static_cast<std::uint16_t>(nonzero);
        const __m128i right_column = _mm_shuffle_epi8(
            samples, _mm_setr_epi8(15, 11, 7, 3, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1));
        store_4(block.left_column, _mm_cvtsi128_si32(right_column));
        std::uint8_t* p = block.samples;
        store_4(p, _mm_extract_epi32(samples, 0));
        store_4(p + m_stride, _mm_extract_epi32(samples, 1));
        store_4(p + 2 * m_stride, _mm_extract_epi32(samples, 2));
        store_4(p + 3 * m_stride, _mm_extract_epi32(samples, 3));
    }

    const std::ptrdiff_t m_stride, m_modes_stride;
    const Search m_search;
    const BlockCoder m_coder;
    Block m_blocks[16];               // order of coding
    SourceBlock m_sources[16];        // raster order
    std::uint32_t m_left_columns[4];  // samples left of the next block in each row of blocks
};

// Kernels::code_intra_4x4 with a mode search.
template <typename Search>
[[gnu::always_inline]] inline std::uint32_t code_intra_4x4_with(const Intra4x4& mb) {
    MacroblockBlocks<Search> blocks(mb);
    for (int n = 0; n < 2; ++n) {
        blocks.template code<1>(mb, n);
    }
    for (int n = 2; n < 14; n += 2) {
        blocks.template code<2>(mb, n);
    }
    for (int n = 14; n < 16; ++n) {
        blocks.template code<1>(mb, n);
    }
    std::uint32_t coded = 0;
    for (int k = 0; k < 16; ++k) {
        coded |= (mb.nonzero[k] != 0 ? 1u : 0u) << k;
    }
    return coded;
}

}  // namespace
}  // namespace zolt
