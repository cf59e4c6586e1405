// Compiled for AVX-512 (F, BW, VL, DQ, VBMI): nothing but intrinsics and functions of this file and
// of the headers that it shares with other kernels, so that no inline function that other files
// share is emitted with instructions that an older processor lacks.
#include "kernels/avx512.h"
#include "kernels/families.h"
#include "kernels/intra4_simd.h"

namespace zolt {
namespace {

using std::int8_t;
using std::uint32_t;

struct Bytes64 {
    alignas(64) int8_t at[64];
};

// Selections of the gathered neighbours such that avg(at, avg(before, after) rounded down) is the
// table that predicted_sample indexes but for the mean: the neighbours, the averages, the filtered
// ones.
struct TableSelections {
    Bytes64 at, before, after;
};
constexpr TableSelections table_selections(bool up_right) {
    TableSelections selections{};
    for (int i = 0; i < kMean; ++i) {
        const auto from = [=](int neighbour) {
            return static_cast<int8_t>(gathered(repeat_outermost(neighbour), up_right));
        };
        const int n = i % 16;
        selections.at.at[i] = from(n);
        selections.before.at[i] = from(i < kTwo ? n : i < kThree ? n + 1 : n - 1);
        selections.after.at[i] = from(i < kTwo ? n : n + 1);
    }
    return selections;
}
constexpr TableSelections kTableSelections[2] = {table_selections(false), table_selections(true)};

// Selections from the table by predicted mode. Candidates: columns 0 and 1 of each slot's
// prediction, then columns 2 and 3, 64 bits a slot; the predicted mode in phase order.
struct PredictionSelections {
    alignas(64) int8_t candidates[kIntra4Modes][2][64];
    alignas(16) int8_t predicted[kIntra4Modes][16];
};
constexpr PredictionSelections prediction_selections() {
    PredictionSelections selections{};
    for (int p = 0; p < kIntra4Modes; ++p) {
        for (int y = 0; y < 4; ++y) {
            for (int x = 0; x < 4; ++x) {
                const int at = phase_position(x, y);
                for (int slot = 0; slot < kSlots; ++slot) {
                    selections.candidates[p][at / 8][8 * slot + at % 8] =
                        static_cast<int8_t>(predicted_sample(slot_mode(p, slot), x, y));
                }
                selections.predicted[p][at] = static_cast<int8_t>(predicted_sample(p, x, y));
            }
        }
    }
    return selections;
}
constexpr PredictionSelections kPredictionSelections = prediction_selections();

// From the predictions of slot 0 of the candidates, as above, to butterfly order.
constexpr Bytes16 butterfly_from_candidates() {
    Bytes16 selection{};
    for (int i = 0; i < 16; ++i) {
        const int at = kButterflyFromPhases.at[i];
        selection.at[i] = static_cast<int8_t>(at < 8 ? at : 64 + at - 8);
    }
    return selection;
}
constexpr Bytes16 kButterflyFromCandidates = butterfly_from_candidates();

class Avx512Search {
public:
    explicit Avx512Search(const Intra4x4& mb)
        : m_rule(mb),
          m_rates(_mm512_broadcastq_epi64(m_rule.rates)),
          m_kept(_mm_cvtsi32_si128(mb.kept)) {}

    template <int kBlocks>
    void run(const SearchInput* in, SearchResult* out) const {
        __m512i table[2];
        Predictions preds[2];
        __m128i predicted_cost[2], costs[2];
        for (int i = 0; i < kBlocks; ++i) {
            table[i] = sample_table(in[i]);
        }
        for (int i = 0; i < kBlocks; ++i) {
            preds[i] = predict(table[i], in[i].predicted);
        }
        for (int i = 0; i < kBlocks; ++i) {
            predicted_cost[i] = predicted_distortion(preds[i].predicted, *in[i].source);
        }
        for (int i = 0; i < kBlocks; ++i) {
            costs[i] = candidate_costs(preds[i], in[i], m_rule.limits(predicted_cost[i]));
        }
        for (int i = 0; i < kBlocks; ++i) {
            out[i] = choose(preds[i], in[i].predicted, predicted_cost[i], costs[i]);
        }
    }

private:
    // Columns 0 and 1, and 2 and 3 of the candidates, and the predicted mode in phase order.
    struct Predictions {
        __m512i left, right;
        __m128i predicted;
    };

    static Predictions predict(__m512i table, int mode) {
        const auto& candidates = kPredictionSelections.candidates[mode];
        const __m512i predicted =
            _mm512_castsi128_si512(load_16(kPredictionSelections.predicted[mode]));
        return {_mm512_permutexvar_epi8(load_64(candidates[0]), table),
                _mm512_permutexvar_epi8(load_64(candidates[1]), table),
                _mm512_castsi512_si128(_mm512_permutexvar_epi8(predicted, table))};
    }

    // The costs of the slots, not below kNoCost where they are dropped or not possible.
    __m128i candidate_costs(const Predictions& preds, const SearchInput& in, __m128i limits) const {
        const __m512i costs = running_costs(preds.left, preds.right, *in.source);
        const __m512i over = _mm512_subs_epu16(costs, _mm512_broadcastq_epi64(limits));
        const __mmask8 kept = _mm512_testn_epi64_mask(over, over);
        const __m128i last = _mm512_cvtepi64_epi16(_mm512_srli_epi64(costs, 48));
        return _mm_or_si128(_mm_mask_blend_epi16(kept, _mm_set1_epi16(kNoCost), last),
                            load_16(kUnavailable.slots[in.available][in.predicted]));
    }

    SearchResult choose(const Predictions& preds, int predicted, __m128i predicted_cost,
                        __m128i costs) const {
        // The first 16 bits decide: the lowest cost against the predicted mode's.
        const __m128i best = _mm_minpos_epu16(costs);
        const __m128i reference = _mm_and_si128(predicted_cost, _mm_set1_epi16(~3));
        const __m128i other = _mm_and_si128(_mm_cmpgt_epi16(reference, best),
                                            _mm_cmpgt_epi16(predicted_cost, m_kept));
        const __m128i slot = _mm_shuffle_epi8(best, _mm_set1_epi8(2));
        const __m128i selection =
            _mm_add_epi8(_mm_slli_epi16(slot, 3), load_16(kButterflyFromCandidates.at));
        const __m128i chosen = _mm512_castsi512_si128(
            _mm512_permutex2var_epi8(preds.left, _mm512_castsi128_si512(selection), preds.right));
        const __m128i pred =
            _mm_blendv_epi8(_mm_shuffle_epi8(preds.predicted, load_16(kButterflyFromPhases.at)),
                            chosen, _mm_broadcastw_epi16(other));
        const int mode = slot_mode(predicted, _mm_extract_epi16(best, 1));
        return {one_of(_mm_cvtsi128_si32(other) & 1, mode, predicted), pred};
    }

    static __m512i sample_table(const SearchInput& in) {
        const TableSelections& selections = kTableSelections[in.up_right];
        const __m512i neighbours = _mm512_castsi128_si512(in.neighbours);
        const __m512i at = _mm512_permutexvar_epi8(load_64(selections.at.at), neighbours);
        const __m512i before = _mm512_permutexvar_epi8(load_64(selections.before.at), neighbours);
        const __m512i after = _mm512_permutexvar_epi8(load_64(selections.after.at), neighbours);
        const __m512i odd = _mm512_and_si512(_mm512_xor_si512(before, after), _mm512_set1_epi8(1));
        const __m512i rounded_down = _mm512_sub_epi8(_mm512_avg_epu8(before, after), odd);
        constexpr __mmask64 kLastLane = 0xffffULL << kMean;
        return _mm512_mask_broadcastb_epi8(_mm512_avg_epu8(at, rounded_down), kLastLane,
                                           mean_of(in.neighbours, in.available));
    }

    // The costs of every slot after each of the four phases.
    __m512i running_costs(__m512i left, __m512i right, const SourceBlock& source) const {
        const __m512i weights[2] = {_mm512_set1_epi8(2),
                                    _mm512_set1_epi16(static_cast<short>(0xfe02))};
        const std::int16_t* const pairs[2] = {source.sums, source.differences};
        __m512i larger[2];
        for (int i = 0; i < 2; ++i) {
            // Columns 0 and 1 of the source's pairs, or 2 and 3, for every slot.
            const auto magnitude = [&](__m512i pred, const std::int16_t* source_pairs) {
                return _mm512_abs_epi16(
                    _mm512_sub_epi16(_mm512_broadcastq_epi64(load_8(source_pairs)),
                                     _mm512_maddubs_epi16(pred, weights[i])));
            };
            larger[i] = _mm512_max_epi16(magnitude(left, pairs[i]), magnitude(right, pairs[i] + 4));
        }
        __m512i costs = _mm512_add_epi16(larger[0], larger[1]);
        costs = _mm512_add_epi16(costs, _mm512_slli_epi64(costs, 16));
        costs = _mm512_add_epi16(costs, _mm512_slli_epi64(costs, 32));
        return _mm512_add_epi16(costs, m_rates);
    }

    SearchRule m_rule;
    __m512i m_rates;
    __m128i m_kept;
};

uint32_t code_intra_4x4(const Intra4x4& mb) {
    return code_intra_4x4_with<Avx512Search>(mb);
}

}  // namespace

void avx512::fill_intra4(Kernels& table) {
    table.code_intra_4x4 = code_intra_4x4;
}

}  // namespace zolt
