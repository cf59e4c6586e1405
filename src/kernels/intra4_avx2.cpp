// Compiled for AVX2: nothing but intrinsics and functions of this file and of the headers that it
// shares with other kernels, so that no inline function that other files share is emitted with
// instructions that an older processor lacks.
#include "kernels/families.h"
#include "kernels/intra4_simd.h"

namespace zolt {
namespace {

using std::int16_t;
using std::int8_t;
using std::uint32_t;

// Shuffles of the gathered neighbours into a row and into what stands before and after each.
struct RowShuffles {
    Bytes16 at, before, after;
};
constexpr RowShuffles row_shuffles(bool up_right) {
    RowShuffles shuffles{};
    for (int i = 0; i < 16; ++i) {
        const auto from = [=](int neighbour) {
            return static_cast<int8_t>(i > 12 ? -1
                                              : gathered(repeat_outermost(neighbour), up_right));
        };
        shuffles.at.at[i] = from(i);
        shuffles.before.at[i] = from(i - 1);
        shuffles.after.at[i] = from(i + 1);
    }
    return shuffles;
}
constexpr RowShuffles kRowShuffles[2] = {row_shuffles(false), row_shuffles(true)};

// Shuffles that make predictions in phase order: of the row, whose 14th byte is the mean, of the
// averages and of the filtered ones; their results are joined. By predicted mode: vector n of the
// candidates has slot n in its low lane and slot n + 4 in its high one.
constexpr int kMeanInRow = 13;
struct PredictionShuffles {
    alignas(32) int8_t candidates[kIntra4Modes][4][3][32];
    alignas(16) int8_t predicted[kIntra4Modes][3][16];
};

constexpr void set_shuffles(int mode, int8_t* row, int8_t* averages, int8_t* filtered) {
    for (int y = 0; y < 4; ++y) {
        for (int x = 0; x < 4; ++x) {
            const int at = phase_position(x, y);
            const int sample = predicted_sample(mode, x, y);
            const int index = sample % 16;
            row[at] = static_cast<int8_t>(sample == kMean ? kMeanInRow
                                          : sample < kTwo ? index
                                                          : -1);
            averages[at] = static_cast<int8_t>(sample >= kTwo && sample < kThree ? index : -1);
            filtered[at] = static_cast<int8_t>(sample >= kThree && sample < kMean ? index : -1);
        }
    }
}

constexpr PredictionShuffles prediction_shuffles() {
    PredictionShuffles shuffles{};
    for (int p = 0; p < kIntra4Modes; ++p) {
        for (int slot = 0; slot < kSlots; ++slot) {
            auto& vector = shuffles.candidates[p][slot % 4];
            const int lane = slot / 4 * 16;
            set_shuffles(slot_mode(p, slot), vector[0] + lane, vector[1] + lane, vector[2] + lane);
        }
        auto& own = shuffles.predicted[p];
        set_shuffles(p, own[0], own[1], own[2]);
    }
    return shuffles;
}
constexpr PredictionShuffles kPredictionShuffles = prediction_shuffles();

class Avx2Search {
public:
    explicit Avx2Search(const Intra4x4& mb)
        : m_rule(mb), m_rates(_mm256_broadcastsi128_si256(m_rule.rates)) {}

    template <int kBlocks>
    void run(const SearchInput* in, SearchResult* out) const {
        Samples samples[2];
        __m128i predicted[2], costs[2];
        // Slot n of the candidates in the low half of pair n, slot n + 4 in the high one; behind
        // them the predicted mode.
        alignas(32) std::uint8_t preds[2][10 * 16];
        for (int i = 0; i < kBlocks; ++i) {
            samples[i] = samples_of(in[i]);
        }
        for (int i = 0; i < kBlocks; ++i) {
            const __m128i pred = predicted_mode(samples[i], in[i].predicted);
            store_16(preds[i] + 8 * 16, pred);
            predicted[i] = predicted_distortion(pred, *in[i].source);
        }
        for (int i = 0; i < kBlocks; ++i) {
            costs[i] = candidate_costs(samples[i], in[i], m_rule.limits(predicted[i]), preds[i]);
        }
        for (int i = 0; i < kBlocks; ++i) {
            out[i] = choose(in[i], predicted[i], costs[i], preds[i]);
        }
    }

private:
    // What the predictions are made of, as set_shuffles() takes it.
    struct Samples {
        __m128i row, two, three;
    };

    static Samples samples_of(const SearchInput& in) {
        const RowShuffles& shuffles = kRowShuffles[in.up_right];
        const __m128i n = _mm_shuffle_epi8(in.neighbours, load_16(shuffles.at.at));
        const __m128i before = _mm_shuffle_epi8(in.neighbours, load_16(shuffles.before.at));
        const __m128i after = _mm_shuffle_epi8(in.neighbours, load_16(shuffles.after.at));
        const __m128i two = _mm_avg_epu8(n, after);  // (n[i] + n[i + 1] + 1) >> 1
        const __m128i odd = _mm_and_si128(_mm_xor_si128(before, after), _mm_set1_epi8(1));
        // (n[i - 1] + 2 n[i] + n[i + 1] + 2) >> 2
        const __m128i three = _mm_avg_epu8(n, _mm_sub_epi8(_mm_avg_epu8(before, after), odd));
        const __m128i mean = mean_of(in.neighbours, in.available);
        return {_mm_or_si128(n, _mm_slli_si128(mean, kMeanInRow)), two, three};
    }

    static __m128i predicted_mode(const Samples& samples, int mode) {
        const auto& own = kPredictionShuffles.predicted[mode];
        return _mm_or_si128(_mm_or_si128(_mm_shuffle_epi8(samples.two, load_16(own[1])),
                                         _mm_shuffle_epi8(samples.three, load_16(own[2]))),
                            _mm_shuffle_epi8(samples.row, load_16(own[0])));
    }

    SearchResult choose(const SearchInput& in, __m128i predicted_cost, __m128i costs,
                        const std::uint8_t* preds) const {
        const auto best = static_cast<uint32_t>(_mm_cvtsi128_si32(_mm_minpos_epu16(costs)));
        const int cost = static_cast<int>(best & 0xffff);
        const int slot = static_cast<int>(best >> 16);
        const int reference = _mm_cvtsi128_si32(predicted_cost) & 0xffff;
        const int other =
            static_cast<int>(reference > m_rule.kept) & static_cast<int>(cost < (reference & ~3));
        const int at = one_of(other, 2 * (slot & 3) + (slot >> 2), 8);
        return {one_of(other, slot_mode(in.predicted, slot), in.predicted),
                _mm_shuffle_epi8(load_16(preds + 16 * at), load_16(kButterflyFromPhases.at))};
    }

    // The costs of the slots, not below kNoCost where they are dropped or not possible. Their
    // predictions go to preds.
    __m128i candidate_costs(const Samples& samples, const SearchInput& in, __m128i limits,
                            std::uint8_t* preds) const {
        const __m256i rows = _mm256_broadcastsi128_si256(samples.row);
        const __m256i twos = _mm256_broadcastsi128_si256(samples.two);
        const __m256i threes = _mm256_broadcastsi128_si256(samples.three);
        const __m256i source_sums = _mm256_broadcastsi128_si256(load_16(in.source->sums));
        const __m256i source_differences =
            _mm256_broadcastsi128_si256(load_16(in.source->differences));
        __m256i sums[4], differences[4];
        for (int n = 0; n < 4; ++n) {
            const auto& shuffles = kPredictionShuffles.candidates[in.predicted][n];
            const __m256i pred = _mm256_or_si256(
                _mm256_or_si256(_mm256_shuffle_epi8(twos, load_aligned(shuffles[1])),
                                _mm256_shuffle_epi8(threes, load_aligned(shuffles[2]))),
                _mm256_shuffle_epi8(rows, load_aligned(shuffles[0])));
            store_32(preds + 32 * n, pred);
            sums[n] = _mm256_abs_epi16(
                _mm256_sub_epi16(source_sums, _mm256_maddubs_epi16(pred, twice())));
            differences[n] = _mm256_abs_epi16(_mm256_sub_epi16(
                source_differences, _mm256_maddubs_epi16(pred, twice_difference())));
        }
        const __m256i all_limits = _mm256_broadcastq_epi64(limits);
        // |a + b| + |a - b| = 2 max(|a|, |b|), a and b two columns apart, of two slots a lane; then
        // the costs after each phase, and the last one alone.
        const auto last_costs = [&](int n) {
            const auto larger = [n](const __m256i* v) {
                return _mm256_max_epi16(_mm256_unpacklo_epi64(v[n], v[n + 1]),
                                        _mm256_unpackhi_epi64(v[n], v[n + 1]));
            };
            __m256i costs = _mm256_add_epi16(larger(sums), larger(differences));
            costs = _mm256_add_epi16(costs, _mm256_slli_epi64(costs, 16));
            costs = _mm256_add_epi16(costs, _mm256_slli_epi64(costs, 32));
            costs = _mm256_add_epi16(costs, m_rates);
            const __m256i over = _mm256_cmpgt_epi16(costs, all_limits);
            const __m256i kept = _mm256_cmpeq_epi64(over, _mm256_setzero_si256());
            return _mm256_or_si256(_mm256_srli_epi64(costs, 48),
                                   _mm256_andnot_si256(kept, _mm256_set1_epi64x(kNoCost)));
        };
        // Slots 0..3 in the low lane, 4..7 in the high one, 32 bits each.
        const __m256i all = _mm256_packus_epi32(last_costs(0), last_costs(2));
        return _mm_or_si128(_mm_packus_epi32(low_lane(all), high_lane(all)),
                            load_16(kUnavailable.slots[in.available][in.predicted]));
    }

    SearchRule m_rule;
    __m256i m_rates;
};

uint32_t code_intra_4x4(const Intra4x4& mb) {
    return code_intra_4x4_with<Avx2Search>(mb);
}

}  // namespace

void avx2::fill_intra4(Kernels& table) {
    table.code_intra_4x4 = code_intra_4x4;
}

}  // namespace zolt
