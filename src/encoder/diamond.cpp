#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "encoder/MacroblockCoder.h"
#include "encoder/bitops.h"
#include "encoder/errors.h"
#include "encoder/idle.h"

namespace {

constexpr int kNoCost = 0xffffff;

// A candidate whose distortion is lower ends the search it belongs to.
constexpr int kGoodSad = 512;

// Lowest threshold of the distortion above which the spiral is walked.
constexpr int kMinSpiralSad = 2048;
constexpr int kSpiralStep = 4;

// Largest difference of two vector components in quarter pels that the rate table holds; vectors
// stay below 64 integer pels.
constexpr int kMaxDifference = 512;

struct RateTable {
    std::uint16_t bits[2 * kMaxDifference + 1];
};

// mv_rate: bits of the Exp-Golomb code (clause 9.1) of min(2 * |d|, 511) by d + kMaxDifference.
constexpr RateTable make_mv_rate() {
    RateTable table{};
    for (int d = -kMaxDifference; d <= kMaxDifference; ++d) {
        const int magnitude = d < 0 ? -d : d;
        int log2 = 0;
        for (int x = (2 * magnitude < 511 ? 2 * magnitude : 511) + 1; x > 1; x >>= 1) {
            ++log2;
        }
        table.bits[d + kMaxDifference] = static_cast<std::uint16_t>(2 * log2 + 1);
    }
    return table;
}

constexpr RateTable mv_rate = make_mv_rate();

// Rates of one vector component, to be indexed by its value in quarter pels.
const std::uint16_t* component_rates(int prediction) {
    return mv_rate.bits + (kMaxDifference - prediction);
}

template <typename T>
T median(T a, T b, T c) {
    return std::max(std::min(a, b), std::min(std::max(a, b), c));
}

// Shares of a rate that are added to the SAD of the first phases.
int first_share(int rate) {
    return (rate + 2) >> 2;
}
int second_share(int rate) {
    return (rate + 1) >> 1;
}
int third_share(int rate) {
    return (3 * rate) >> 2;
}

// Interval of vector components.
struct Range {
    int low, high;
    bool between(int v) const { return low < v && v < high; }
    bool contains(int v) const { return low <= v && v <= high; }
};

// Components that keep a block at `position` near a picture of `size` samples and a vector within
// the search range of `centre`.
Range vector_range(int position, int size, int centre, int range) {
    return {std::max(-19 - position, centre - range),
            std::min(centre + range, size - position + 2)};
}

struct Vector {
    int x, y;
};

// Half-sample candidates around the integer result, in the order of their evaluation, which is that
// of zolt::half_candidates().
constexpr Vector kHalfCandidates[8] = {{0, 1}, {0, -1}, {1, 0},  {-1, 0},
                                       {1, 1}, {-1, 1}, {1, -1}, {-1, -1}};

// Quarter-sample candidates around the half-sample result, in the order of their evaluation.
constexpr Vector kQuarterCandidates[8] = {{1, 0}, {0, 1},  {-1, 0}, {0, -1},
                                          {1, 1}, {-1, 1}, {1, -1}, {-1, -1}};

enum Plane { kFull, kVertical, kHorizontal, kCentre };
struct PlaneSample {
    Plane plane;
    int x, y;
};

// Each of them is the average of two samples (clause 8.4.2.2.1), the result's own and one of these,
// relative to it in its plane. From an integer sample G or a centre sample j that holds for the
// first four candidates only; the diagonal ones are averages of two of the four (kCrossPairs).
constexpr PlaneSample kQuarterSamples[4][8] = {
    {{kHorizontal, 0, 0}, {kVertical, 0, 0}, {kHorizontal, -1, 0}, {kVertical, 0, -1}},
    {{kFull, 1, 0},
     {kCentre, 0, 0},
     {kFull, 0, 0},
     {kCentre, 0, -1},
     {kVertical, 1, 0},
     {kVertical, 0, 0},
     {kVertical, 1, -1},
     {kVertical, 0, -1}},
    {{kCentre, 0, 0},
     {kFull, 0, 1},
     {kCentre, -1, 0},
     {kFull, 0, 0},
     {kHorizontal, 0, 1},
     {kHorizontal, -1, 1},
     {kHorizontal, 0, 0},
     {kHorizontal, -1, 0}},
    {{kVertical, 1, 0}, {kHorizontal, 0, 1}, {kVertical, 0, 0}, {kHorizontal, 0, 0}}};

// The plane of the result: G, b, h or j.
constexpr Plane kResultPlane[4] = {kFull, kHorizontal, kVertical, kCentre};

// Number of integer candidates whose first phases are measured in one go.
constexpr int kGroup = 4;

// Number of candidates of a fractional step.
constexpr int kFractions = 8;

// The motion search of one macroblock. Its stages share the thresholds, which reject a candidate by
// its cost after a part of its samples, and the best distortion. A stage ends early when a new best
// candidate has a distortion below kGoodSad.
class MotionSearch {
public:
    explicit MotionSearch(MacroblockCoder& coder);
    void integer_stage();
    void half_stage();
    void quarter_stage();
    // Writes the best candidate so far.
    void record(_mv& result) const;

private:
    bool try_zero();
    bool try_vectors(const Vector* vectors, int count);
    bool walk_spiral();
    bool walk_diamond();
    // Rate of a vector in quarter pels.
    int rate_of(int x, int y) const { return m_lambda * (m_rates_x[x] + m_rates_y[y]); }
    // The SAD of phases 0 and 1 that a candidate with this rate must stay below. Acceptance of
    // another one can only lower it.
    int first_phases_limit(int rate) const { return m_thresholds[1] - second_share(rate); }
    bool accept(const int* sums, int rate, int first_threshold);
    void set_planes(std::ptrdiff_t position);

    // The candidates of a fractional step: their directions from (x, y), `step` quarter pels long,
    // their rates, and the limits of their first phases.
    struct Fractions {
        int rates[kFractions];
        std::int32_t limits[kFractions];

        Fractions(const MotionSearch& search, const Vector* directions, int x, int y, int step) {
            for (int n = 0; n < kFractions; ++n) {
                rates[n] = search.rate_of(x + step * directions[n].x, y + step * directions[n].y);
                limits[n] = search.first_phases_limit(rates[n]);
            }
        }
    };

    const std::uint8_t* sample(const Picture::plane_offset_t& s) const {
        return m_planes[s.plane] + s.offset;
    }

    MacroblockCoder& m_coder;
    Picture& m_picture;
    const zolt::Kernels& m_kernels;
    const std::ptrdiff_t m_stride;
    const int m_px, m_py;                        // the macroblock's position, samples
    const int m_lambda;                          // rate weight
    const std::uint16_t *m_rates_x, *m_rates_y;  // of vector components in quarter pels
    const std::uint8_t* m_ref;                   // the macroblock's samples in the reference
    std::uint8_t* m_visited;                     // stamp of the zero vector
    int m_thresholds[3] = {kNoCost, kNoCost, kNoCost};
    int m_best_cost = kNoCost;
    int m_best_sad = 0;
    Vector m_best = {0, 0};                // integer pels
    Vector m_fraction = {0, 0};            // of the best candidate, quarter pels
    const std::uint8_t* m_planes[4] = {};  // samples by Plane around the candidates of a stage
    alignas(64) std::uint8_t m_block[zolt::kArrangedBlock];  // the macroblock's samples, arranged
};

}  // namespace

void Picture::initDiamond(std::uint8_t range, std::uint8_t method, std::uint8_t subpel) {
    g_search_range = range;
    g_search_method = method;
    g_subpel_enable = subpel;
    g_pad_luma = 2 * range;
    g_pad_chroma = range;
    g_stride_luma = g_width16 + 2 * g_pad_luma;
    g_stride_chroma = g_cwidth + 2 * g_pad_chroma;
    g_origin_luma = g_pad_luma * (g_stride_luma + 1);
    g_origin_chroma = g_pad_chroma * (g_stride_chroma + 1);
    g_size_Y = (g_height16 + 2 * g_pad_luma) * g_stride_luma;
    g_size_U = (g_cheight + 2 * g_pad_chroma) * g_stride_chroma;
    g_visit_dim = 8 * range;
    const auto offset = [this](const PlaneSample& s) {
        return plane_offset_t{s.plane, static_cast<std::ptrdiff_t>(s.y) * g_stride_luma + s.x};
    };
    for (int n = 0; n < 8; ++n) {
        for (int kind = 0; kind < 4; ++kind) {
            g_quarter_samples[kind][n] = offset(kQuarterSamples[kind][n]);
        }
    }
}

void Picture::framePredInitP() {
    g_kernels->extend_edges(g_ref_y, g_width16, g_height16, g_stride_luma, g_pad_luma);
    g_kernels->extend_edges(g_ref_u, g_cwidth, g_cheight, g_stride_chroma, g_pad_chroma);
    g_kernels->extend_edges(g_ref_v, g_cwidth, g_cheight, g_stride_chroma, g_pad_chroma);
    g_half_rows_end.store(-g_pad_luma, std::memory_order_relaxed);
}

// Refinement asks for rows when it needs them, so that they are still in the cache when it reads
// them.
void Picture::make_half_pixel_sds(int end) {
    zolt::Idle idle;
    while (g_half_rows_end.load(std::memory_order_acquire) < end) {
        if (g_half_rows_busy.exchange(true, std::memory_order_acquire)) {
            idle.wait();
            continue;
        }
        build_half_rows(end);
        g_half_rows_busy.store(false, std::memory_order_release);
    }
}

// Builds rows up to `end`, unless others have been faster. The centre plane is filtered from the
// rounded samples of the vertical one: an approximation that only the search reads.
void Picture::build_half_rows(int end) {
    constexpr int kMargin = 3;  // outermost rows and columns, which lack a filter tap
    const int count = g_stride_luma - 2 * kMargin;
    int y = std::max(g_half_rows_end.load(std::memory_order_relaxed), kMargin - g_pad_luma);
    for (; y < end; ++y) {
        const std::ptrdiff_t row = static_cast<std::ptrdiff_t>(y) * g_stride_luma - g_pad_luma;
        const std::ptrdiff_t inner = row + kMargin;
        g_kernels->half_vertical_row(g_ref_y + row, g_stride_luma, g_half_v_L0 + row,
                                     g_stride_luma);
        g_kernels->half_horizontal_row(g_ref_y + inner, g_half_h_L0 + inner, count);
        g_kernels->half_horizontal_row(g_half_v_L0 + inner, g_half_hv_L0 + inner, count);
    }
    g_half_rows_end.store(y, std::memory_order_release);
}

// Motion search of the current macroblock: integer, half and quarter pels.
void MacroblockCoder::generateMBPred() {
    form_mv_prediction(&g_pmv_x, &g_pmv_y, 0, 0, 0, 16, 16);
    if (++g_visit_stamp == 0) {
        std::memset(g_visit_L0, 0,
                    static_cast<std::size_t>(picture.g_visit_dim) *
                        static_cast<std::size_t>(picture.g_visit_dim));
        g_visit_stamp = 1;
    }
    MotionSearch search(*this);
    search.integer_stage();
    _mv& integer = picture.g_me_mb_L0[g_mapMBNumber];
    search.record(integer);
    if (picture.g_subpel_enable) {
        // The block, and the row below it that fractions reach.
        picture.make_half_pixel_sds(16 * g_mb_y + integer.y + 17);
        search.half_stage();
        search.quarter_stage();
    }
    search.record(picture.g_mv_array[g_mapMBNumber]);
}

namespace {

MotionSearch::MotionSearch(MacroblockCoder& coder)
    : m_coder(coder),
      m_picture(coder.picture),
      m_kernels(*coder.g_kernels),
      m_stride(m_picture.g_stride_luma),
      m_px(16 * coder.g_mb_x),
      m_py(16 * coder.g_mb_y),
      m_lambda(coder.g_sad_lambda),
      m_rates_x(component_rates(coder.g_pmv_x)),
      m_rates_y(component_rates(coder.g_pmv_y)),
      m_ref(m_picture.g_ref_y + m_py * m_stride + m_px),
      m_visited(coder.g_visit_L0 + m_picture.g_visit_dim / 2 * (m_picture.g_visit_dim + 1)) {
    m_kernels.arrange_block(coder.g_mb_src_y, m_picture.g_width, m_block);
}

void MotionSearch::record(_mv& result) const {
    result.x = static_cast<std::int16_t>(m_best.x);
    result.y = static_cast<std::int16_t>(m_best.y);
    result.dx = static_cast<std::int8_t>(m_fraction.x);
    result.dy = static_cast<std::int8_t>(m_fraction.y);
    result.sad = static_cast<std::uint32_t>(m_best_sad);
    result.cost = static_cast<std::uint32_t>(m_best_cost);
}

// Subsampled diamond search at integer pels.
void MotionSearch::integer_stage() {
    const int mb_width = m_picture.g_mb_width;
    const int range = m_picture.g_search_range;
    const int mb_x = m_coder.g_mb_x;
    const int mb_y = m_coder.g_mb_y;
    const _mv none = {};
    const _mv* record = m_picture.g_me_mb_L0 + m_coder.g_mapMBNumber;
    const _mv& top = mb_y > 0 ? record[-mb_width] : none;
    const _mv& left = mb_x > 0 ? record[-1] : none;
    const _mv& top_right = mb_y > 0 && mb_x < mb_width - 1 ? record[1 - mb_width] : none;

    const Vector predictor = {std::clamp((m_coder.g_pmv_x + 2) >> 2, -range, range),
                              std::clamp((m_coder.g_pmv_y + 2) >> 2, -range, range)};
    const Range window_x = vector_range(m_px, m_picture.g_width16, predictor.x, range);
    const Range window_y = vector_range(m_py, m_picture.g_height16, predictor.y, range);
    Vector group[kGroup];
    int count = 0;
    const auto add = [&](Vector v) {
        if (window_x.between(v.x) && window_y.between(v.y)) {
            group[count++] = v;
        }
    };
    if (window_x.between(0) && window_y.between(0) && try_zero()) {
        return;
    }
    add({median<int>(top.x, left.x, top_right.x), median<int>(top.y, left.y, top_right.y)});
    add(predictor);
    if (try_vectors(group, count)) {
        return;
    }
    const auto norm = [](const _mv& v) { return std::abs(v.x) + std::abs(v.y); };
    if (std::max({norm(top), norm(left), norm(top_right)}) > 3) {
        count = 0;
        add({top.x, top.y});
        add({left.x, left.y});
        add({top_right.x, top_right.y});
        if (try_vectors(group, count)) {
            return;
        }
    }

    int spiral_sad = 0;
    if (mb_x > 0 || mb_y > 0) {
        const auto low_bits = [](const _mv& v) { return static_cast<int>(v.sad & 0xffff); };
        spiral_sad =
            std::max(2 * median(low_bits(top), low_bits(left), low_bits(top_right)), kMinSpiralSad);
    }
    if (m_best_sad > spiral_sad && walk_spiral()) {
        return;
    }
    walk_diamond();
}

// Square spiral around the zero vector, not clipped to the window. Returns true at an early end.
bool MotionSearch::walk_spiral() {
    const int range = m_picture.g_search_range;
    Vector v = {0, 0};
    int step = kSpiralStep;
    Vector group[kGroup];
    int grouped = 0;
    for (int n = 1; n < range / 2; ++n) {
        for (int i = 0; i < 2 * n; ++i) {
            (i < n ? v.x : v.y) += step;
            if (std::max(std::abs(v.x), std::abs(v.y)) > range) {
                return try_vectors(group, grouped);
            }
            group[grouped++] = v;
            if (grouped == kGroup) {
                if (try_vectors(group, grouped)) {
                    return true;
                }
                grouped = 0;
            }
        }
        step = -step;
    }
    return try_vectors(group, grouped);
}

// Small diamonds around the best vector until it stays or leaves the bounds. Returns true at an
// early end.
bool MotionSearch::walk_diamond() {
    const int range = m_picture.g_search_range;
    const Range bounds_x = vector_range(m_px, m_picture.g_width16, m_best.x, range);
    const Range bounds_y = vector_range(m_py, m_picture.g_height16, m_best.y, range);
    Vector centre;
    do {
        centre = m_best;
        const Vector diamond[4] = {{centre.x - 1, centre.y},
                                   {centre.x + 1, centre.y},
                                   {centre.x, centre.y - 1},
                                   {centre.x, centre.y + 1}};
        if (try_vectors(diamond, 4)) {
            return true;
        }
    } while ((m_best.x != centre.x || m_best.y != centre.y) && bounds_x.contains(m_best.x) &&
             bounds_y.contains(m_best.y));
    return false;
}

// Evaluates the zero vector, the first candidate. Returns true at an early end.
bool MotionSearch::try_zero() {
    *m_visited = m_coder.g_visit_stamp;
    int sums[4];
    m_kernels.phase_sads(m_block, m_ref, m_stride, sums);
    const int rate = rate_of(0, 0);
    return accept(sums, rate, 2 * (sums[0] + first_share(rate))) && m_best_sad < kGoodSad;
}

// Evaluates up to kGroup vectors in order, without those that this search has already evaluated.
// Returns true at an early end.
bool MotionSearch::try_vectors(const Vector* vectors, int count) {
    const int visit_dim = m_picture.g_visit_dim;
    const std::uint8_t visit_stamp = m_coder.g_visit_stamp;
    Vector fresh[kGroup];
    const std::uint8_t* refs[kGroup];
    int n = 0;
    for (int i = 0; i < count; ++i) {
        std::uint8_t& stamp = m_visited[vectors[i].x * visit_dim + vectors[i].y];
        if (stamp != visit_stamp) {
            stamp = visit_stamp;
            fresh[n] = vectors[i];
            refs[n++] = m_ref + vectors[i].y * m_stride + vectors[i].x;
        }
    }
    if (n == 0) {
        return false;
    }
    int rates[kGroup];
    std::int32_t limits[kGroup] = {};
    for (int i = 0; i < n; ++i) {
        rates[i] = rate_of(4 * fresh[i].x, 4 * fresh[i].y);
        limits[i] = first_phases_limit(rates[i]);
    }
    unsigned passed = 1;
    if (n > 1) {
        std::fill(refs + n, refs + kGroup, refs[0]);
        passed = m_kernels.first_phases_below_x4(m_block, refs, m_stride, limits);
    }
    for (; passed != 0; passed &= passed - 1) {
        const int i = zolt::lowest_bit(passed);
        int sums[4];
        m_kernels.phase_sads(m_block, refs[i], m_stride, sums);
        if (accept(sums, rates[i], 2 * (sums[0] + first_share(rates[i])))) {
            m_best = fresh[i];
            if (m_best_sad < kGoodSad) {
                return true;
            }
        }
    }
    return false;
}

// Half-pel step around the integer result.
void MotionSearch::half_stage() {
    set_planes(m_best.y * m_stride + m_best.x);
    const Fractions candidates(*this, kHalfCandidates, 4 * m_best.x, 4 * m_best.y, 2);
    const zolt::HalfSamples at = {m_planes[kVertical], m_planes[kHorizontal], m_planes[kCentre]};
    const std::uint8_t* refs[kFractions];
    zolt::half_candidates(at, m_stride, refs);
    unsigned passed = m_kernels.first_phases_below_half(m_block, at, m_stride, candidates.limits);
    for (; passed != 0; passed &= passed - 1) {
        const int n = zolt::lowest_bit(passed);
        const int rate = candidates.rates[n];
        int sums[4];
        m_kernels.phase_sads(m_block, refs[n], m_stride, sums);
        if (accept(sums, rate, 2 * (sums[0] + first_share(rate)))) {
            m_fraction = {2 * kHalfCandidates[n].x, 2 * kHalfCandidates[n].y};
            if (m_best_sad < kGoodSad) {
                return;
            }
        }
    }
}

// Quarter-pel step around the half-pel result; its first threshold is tighter.
void MotionSearch::quarter_stage() {
    const Vector half = m_fraction;
    const int kind = std::abs(half.x) / 2 + std::abs(half.y);
    if (kind > 3) {
        exitOnError("Encountered error in quarter pixel computation. exiting!\n", -100);
    }
    set_planes((m_best.y - (half.y < 0 ? 1 : 0)) * m_stride + m_best.x - (half.x < 0 ? 1 : 0));
    const Fractions candidates(*this, kQuarterCandidates, 4 * m_best.x + half.x,
                               4 * m_best.y + half.y, 1);
    const bool cross = kind == 0 || kind == 3;
    const std::uint8_t* centre = m_planes[kResultPlane[kind]];
    const std::uint8_t* refs[kFractions];
    for (int n = 0; n < (cross ? 4 : kFractions); ++n) {
        refs[n] = sample(m_picture.g_quarter_samples[kind][n]);
    }
    unsigned passed =
        (cross ? m_kernels.first_phases_below_cross : m_kernels.first_phases_below_star)(
            m_block, centre, refs, m_stride, candidates.limits);
    for (; passed != 0; passed &= passed - 1) {
        const int n = zolt::lowest_bit(passed);
        const bool diagonal = cross && n >= 4;
        const std::uint8_t* a = diagonal ? refs[zolt::kCrossPairs[n - 4][0]] : centre;
        const std::uint8_t* b = refs[diagonal ? zolt::kCrossPairs[n - 4][1] : n];
        const int rate = candidates.rates[n];
        int sums[4];
        m_kernels.phase_sads_average(m_block, a, b, m_stride, sums);
        if (accept(sums, rate, (5 * (sums[0] + first_share(rate))) >> 2)) {
            m_fraction = {half.x + kQuarterCandidates[n].x, half.y + kQuarterCandidates[n].y};
            if (m_best_sad < kGoodSad) {
                return;
            }
        }
    }
}

// Points the planes at the macroblock moved by `position` samples.
void MotionSearch::set_planes(std::ptrdiff_t position) {
    position += m_py * m_stride + m_px;
    m_planes[kFull] = m_picture.g_ref_y + position;
    m_planes[kVertical] = m_picture.g_half_v_L0 + position;
    m_planes[kHorizontal] = m_picture.g_half_h_L0 + position;
    m_planes[kCentre] = m_picture.g_half_hv_L0 + position;
}

// Makes a candidate the best one if its costs after every phase are below the thresholds and its
// cost is the lowest. sums: its SAD of the phases up to each; first_threshold: the threshold that
// it then sets for phase 0.
bool MotionSearch::accept(const int* sums, int rate, int first_threshold) {
    const int second_cost = sums[1] + second_share(rate);
    const int third_cost = sums[2] + third_share(rate);
    // One branch for all of them: most candidates that come here pass.
    const bool rejected = (m_thresholds[0] <= sums[0] + first_share(rate)) |
                          (m_thresholds[1] <= second_cost) | (m_thresholds[2] <= third_cost) |
                          (sums[3] + rate >= m_best_cost);
    if (rejected) {
        return false;
    }
    m_thresholds[0] = first_threshold;
    m_thresholds[1] = second_cost;
    m_thresholds[2] = third_cost;
    m_best_sad = sums[3];
    m_best_cost = sums[3] + rate;
    return true;
}

}  // namespace
