#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "encoder/CEncoder.h"

namespace {

constexpr std::uint32_t kNoCost = 0xffffff;

// A candidate whose distortion is lower ends the search it belongs to.
constexpr std::uint32_t kGoodSad = 512;

// Lowest threshold of the distortion above which the spiral is walked.
constexpr std::uint32_t kMinSpiralSad = 2048;
constexpr int kSpiralStep = 4;

constexpr int kMaxRateIndex = 511;

struct RateTable {
    std::uint16_t bits[kMaxRateIndex + 1];
};

constexpr RateTable make_mv_rate() {
    RateTable table{};
    for (int k = 0; k <= kMaxRateIndex; ++k) {
        int log2 = 0;
        for (int x = k + 1; x > 1; x >>= 1) {
            ++log2;
        }
        table.bits[k] = static_cast<std::uint16_t>(2 * log2 + 1);
    }
    return table;
}

// Bits of the Exp-Golomb code of k (clause 9.1).
constexpr RateTable mv_rate = make_mv_rate();

// Rate of one vector component that differs by d quarter pels from its prediction.
int component_rate(int d) {
    return mv_rate.bits[std::min(2 * std::abs(d), kMaxRateIndex)];
}

template <typename T>
T median(T a, T b, T c) {
    return std::max(std::min(a, b), std::min(std::max(a, b), c));
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

// The running integer search of one macroblock. The functions that evaluate candidates return true
// when the search has ended.
struct IntegerSearch {
    CEncoder& encoder;
    const std::uint8_t* ref;  // the macroblock's position in the reference
    std::uint32_t* visited;   // stamp of the zero vector
    int px, py;               // the macroblock's position, samples
    std::uint32_t best_cost = kNoCost;
    int best_x = 0, best_y = 0;

    bool run(int mb_x, int mb_y);
    bool evaluate(int x, int y);
    bool walk_spiral();
    bool walk_diamond();
};

// A half-sample candidate: fraction in quarter pels, plane and offset of its sample.
enum Plane { kFull, kVertical, kHorizontal, kCentre };
struct PlaneSample {
    Plane plane;
    int x, y;
};
struct HalfCandidate {
    int dx, dy;
    PlaneSample sample;
};
constexpr HalfCandidate kHalfCandidates[8] = {
    {0, 2, {kVertical, 0, 0}},     {0, -2, {kVertical, 0, -1}}, {2, 0, {kHorizontal, 0, 0}},
    {-2, 0, {kHorizontal, -1, 0}}, {2, 2, {kCentre, 0, 0}},     {-2, 2, {kCentre, -1, 0}},
    {2, -2, {kCentre, 0, -1}},     {-2, -2, {kCentre, -1, -1}}};

// Quarter-sample candidates around the half-sample result, in the order of their evaluation.
struct Fraction {
    int dx, dy;
};
constexpr Fraction kQuarterCandidates[8] = {{1, 0}, {0, 1},  {-1, 0}, {0, -1},
                                            {1, 1}, {-1, 1}, {1, -1}, {-1, -1}};

// The two samples whose average is each of them (clause 8.4.2.2.1), for a result at an integer
// sample G, at b, at h and at j. Offsets are relative to the result's sample in its own plane.
constexpr PlaneSample kQuarterSamples[4][8][2] = {{{{kFull, 0, 0}, {kHorizontal, 0, 0}},
                                                   {{kFull, 0, 0}, {kVertical, 0, 0}},
                                                   {{kFull, 0, 0}, {kHorizontal, -1, 0}},
                                                   {{kFull, 0, 0}, {kVertical, 0, -1}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 0, 0}},
                                                   {{kHorizontal, -1, 0}, {kVertical, 0, 0}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 0, -1}},
                                                   {{kHorizontal, -1, 0}, {kVertical, 0, -1}}},
                                                  {{{kHorizontal, 0, 0}, {kFull, 1, 0}},
                                                   {{kHorizontal, 0, 0}, {kCentre, 0, 0}},
                                                   {{kHorizontal, 0, 0}, {kFull, 0, 0}},
                                                   {{kHorizontal, 0, 0}, {kCentre, 0, -1}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 1, 0}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 0, 0}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 1, -1}},
                                                   {{kHorizontal, 0, 0}, {kVertical, 0, -1}}},
                                                  {{{kVertical, 0, 0}, {kCentre, 0, 0}},
                                                   {{kVertical, 0, 0}, {kFull, 0, 1}},
                                                   {{kVertical, 0, 0}, {kCentre, -1, 0}},
                                                   {{kVertical, 0, 0}, {kFull, 0, 0}},
                                                   {{kVertical, 0, 0}, {kHorizontal, 0, 1}},
                                                   {{kVertical, 0, 0}, {kHorizontal, -1, 1}},
                                                   {{kVertical, 0, 0}, {kHorizontal, 0, 0}},
                                                   {{kVertical, 0, 0}, {kHorizontal, -1, 0}}},
                                                  {{{kCentre, 0, 0}, {kVertical, 1, 0}},
                                                   {{kCentre, 0, 0}, {kHorizontal, 0, 1}},
                                                   {{kCentre, 0, 0}, {kVertical, 0, 0}},
                                                   {{kCentre, 0, 0}, {kHorizontal, 0, 0}},
                                                   {{kVertical, 1, 0}, {kHorizontal, 0, 1}},
                                                   {{kVertical, 0, 0}, {kHorizontal, 0, 1}},
                                                   {{kVertical, 1, 0}, {kHorizontal, 0, 0}},
                                                   {{kVertical, 0, 0}, {kHorizontal, 0, 0}}}};

}  // namespace

void CEncoder::initDiamond(std::uint8_t range, std::uint8_t method, std::uint8_t subpel) {
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
    g_visit_dim = 16 * range;
}

// Prepares the reference for the macroblocks of a P picture.
void CEncoder::framePredInitP() {
    g_kernels->extend_edges(g_ref_y, g_width16, g_height16, g_stride_luma, g_pad_luma);
    g_kernels->extend_edges(g_ref_u, g_cwidth, g_cheight, g_stride_chroma, g_pad_chroma);
    g_kernels->extend_edges(g_ref_v, g_cwidth, g_cheight, g_stride_chroma, g_pad_chroma);
    if (g_subpel_enable) {
        make_half_pixel_sds();
    }
}

// Half-sample planes of the reference. The centre plane is filtered from the rounded samples of the
// vertical one: an approximation that only the search reads.
void CEncoder::make_half_pixel_sds() {
    constexpr int kMargin = 3;  // outermost rows and columns, which lack a filter tap
    const int count = g_stride_luma - 2 * kMargin;
    for (int y = kMargin - g_pad_luma; y < g_height16 + g_pad_luma - kMargin; ++y) {
        const std::ptrdiff_t row = static_cast<std::ptrdiff_t>(y) * g_stride_luma - g_pad_luma;
        const std::ptrdiff_t inner = row + kMargin;
        g_kernels->half_vertical_row(g_ref_y + row, g_stride_luma, g_half_v_L0 + row,
                                     g_stride_luma);
        g_kernels->half_horizontal_row(g_ref_y + inner, g_half_h_L0 + inner, count);
        g_kernels->half_horizontal_row(g_half_v_L0 + inner, g_half_hv_L0 + inner, count);
    }
}

// Motion search of the current macroblock: integer, half and quarter pels.
void CEncoder::generateMBPred() {
    form_mv_prediction(&g_pmv_x, &g_pmv_y, 0, 0, 0, 16, 16);
    g_kernels->split_phases(g_mb_src_y, g_stride_luma, g_cur_phases);
    _mv& result = g_mv_array[g_mapMBNumber];
    sd_search(result);
    if (g_subpel_enable) {
        estimate_half_pixel_sds(result);
        estimate_quarter_pixel_sds(result);
    }
}

// Subsampled diamond search at integer pels. Its result is also what later macroblocks of the
// picture see of this one.
void CEncoder::sd_search(_mv& result) {
    if (++g_visit_stamp == 0) {
        std::memset(g_visit_L0, 0,
                    sizeof *g_visit_L0 * static_cast<std::size_t>(g_visit_dim) *
                        static_cast<std::size_t>(g_visit_dim));
        g_visit_stamp = 1;
    }
    std::fill(g_sd_thresh, g_sd_thresh + 3, kNoCost);

    const int px = 16 * g_mb_x;
    const int py = 16 * g_mb_y;
    IntegerSearch search{*this, g_ref_y + static_cast<std::ptrdiff_t>(py) * g_stride_luma + px,
                         g_visit_L0 + g_visit_dim / 2 * (g_visit_dim + 1), px, py};
    search.run(g_mb_x, g_mb_y);

    result.x = static_cast<std::int16_t>(search.best_x);
    result.y = static_cast<std::int16_t>(search.best_y);
    result.dx = 0;
    result.dy = 0;
    result.sad = g_best_sad;
    result.cost = search.best_cost;
    g_me_mb_L0[g_mapMBNumber] = result;
}

namespace {

bool IntegerSearch::run(int mb_x, int mb_y) {
    const int mb_width = encoder.g_mb_width;
    const int range = encoder.g_search_range;
    const _mv none = {};
    const _mv* record = encoder.g_me_mb_L0 + mb_y * mb_width + mb_x;
    const _mv& top = mb_y > 0 ? record[-mb_width] : none;
    const _mv& left = mb_x > 0 ? record[-1] : none;
    const _mv& top_right = mb_y > 0 && mb_x < mb_width - 1 ? record[1 - mb_width] : none;

    const int cx = std::clamp((encoder.g_pmv_x + 2) >> 2, -range, range);
    const int cy = std::clamp((encoder.g_pmv_y + 2) >> 2, -range, range);
    const Range window_x = vector_range(px, encoder.g_width16, cx, range);
    const Range window_y = vector_range(py, encoder.g_height16, cy, range);
    const auto try_vector = [&](int x, int y) {
        return window_x.between(x) && window_y.between(y) && evaluate(x, y);
    };

    if (try_vector(0, 0) ||
        try_vector(median(top.x, left.x, top_right.x), median(top.y, left.y, top_right.y)) ||
        try_vector(cx, cy)) {
        return true;
    }
    const auto norm = [](const _mv& v) { return std::abs(v.x) + std::abs(v.y); };
    if (std::max({norm(top), norm(left), norm(top_right)}) > 3 &&
        (try_vector(top.x, top.y) || try_vector(left.x, left.y) ||
         try_vector(top_right.x, top_right.y))) {
        return true;
    }

    std::uint32_t spiral_sad = 0;
    if (mb_x > 0 || mb_y > 0) {
        spiral_sad = std::max(
            2 * median(top.sad & 0xffff, left.sad & 0xffff, top_right.sad & 0xffff), kMinSpiralSad);
    }
    if (encoder.g_best_sad > spiral_sad && walk_spiral()) {
        return true;
    }
    return walk_diamond();
}

// Square spiral around the zero vector, not clipped to the window.
bool IntegerSearch::walk_spiral() {
    int x = 0;
    int y = 0;
    int step = kSpiralStep;
    for (int n = 1; n < encoder.g_search_range / 2; ++n) {
        for (int i = 0; i < 2 * n; ++i) {
            (i < n ? x : y) += step;
            if (std::max(std::abs(x), std::abs(y)) > encoder.g_search_range) {
                return false;
            }
            if (evaluate(x, y)) {
                return true;
            }
        }
        step = -step;
    }
    return false;
}

// Small diamonds around the best vector until it stays or leaves the bounds.
bool IntegerSearch::walk_diamond() {
    const int range = encoder.g_search_range;
    const Range bounds_x = vector_range(px, encoder.g_width16, best_x, range);
    const Range bounds_y = vector_range(py, encoder.g_height16, best_y, range);
    int x, y;
    do {
        x = best_x;
        y = best_y;
        if (evaluate(x - 1, y) || evaluate(x + 1, y) || evaluate(x, y - 1) || evaluate(x, y + 1)) {
            return true;
        }
    } while ((best_x != x || best_y != y) && bounds_x.contains(best_x) &&
             bounds_y.contains(best_y));
    return false;
}

// Evaluates the vector (x, y) unless this search has already done so.
bool IntegerSearch::evaluate(int x, int y) {
    std::uint32_t& stamp = visited[x * encoder.g_visit_dim + y];
    if (stamp == encoder.g_visit_stamp) {
        return false;
    }
    stamp = encoder.g_visit_stamp;
    const std::uint32_t cost =
        encoder.find_sd_sad(ref + x + static_cast<std::ptrdiff_t>(y) * encoder.g_stride_luma,
                            best_cost, encoder.vector_rate(4 * x, 4 * y));
    if (cost >= best_cost) {
        return false;
    }
    best_cost = cost;
    best_x = x;
    best_y = y;
    return encoder.g_best_sad < kGoodSad;
}

}  // namespace

// Cost of a vector's difference from its prediction; x, y in quarter pels.
int CEncoder::vector_rate(int x, int y) const {
    return (component_rate(x - g_pmv_x) + component_rate(y - g_pmv_y)) * g_sad_lambda;
}

// Half-pel step around the integer result.
void CEncoder::estimate_half_pixel_sds(_mv& record) {
    const std::ptrdiff_t position =
        static_cast<std::ptrdiff_t>(16 * g_mb_y + record.y) * g_stride_luma + 16 * g_mb_x +
        record.x;
    const std::uint8_t* const planes[4] = {g_ref_y, g_half_v_L0, g_half_h_L0, g_half_hv_L0};
    const std::uint8_t* centre[4];
    for (int plane = 0; plane < 4; ++plane) {
        centre[plane] = planes[plane] + position;
    }
    const int x = 4 * record.x;
    const int y = 4 * record.y;
    for (const HalfCandidate& candidate : kHalfCandidates) {
        const PlaneSample& s = candidate.sample;
        const std::uint32_t cost =
            find_sd_sad(centre[s.plane] + s.y * static_cast<std::ptrdiff_t>(g_stride_luma) + s.x,
                        record.cost, vector_rate(x + candidate.dx, y + candidate.dy));
        if (cost < record.cost) {
            record.dx = static_cast<std::int8_t>(candidate.dx);
            record.dy = static_cast<std::int8_t>(candidate.dy);
            record.cost = cost;
            if (g_best_sad < kGoodSad) {
                break;
            }
        }
    }
    record.sad = g_best_sad;
}

// Quarter-pel step around the half-pel result.
void CEncoder::estimate_quarter_pixel_sds(_mv& record) {
    const int half_dx = record.dx;
    const int half_dy = record.dy;
    const int kind = std::abs(half_dx) / 2 + std::abs(half_dy);
    if (kind > 3) {
        exitOnError("Encountered error in quarter pixel computation. exiting!\n", -100);
    }
    const std::ptrdiff_t stride = g_stride_luma;
    const std::ptrdiff_t position = (16 * g_mb_y + record.y - (half_dy < 0 ? 1 : 0)) * stride +
                                    16 * g_mb_x + record.x - (half_dx < 0 ? 1 : 0);
    const std::uint8_t* const planes[4] = {g_ref_y, g_half_v_L0, g_half_h_L0, g_half_hv_L0};
    const std::uint8_t* centre[4];
    for (int plane = 0; plane < 4; ++plane) {
        centre[plane] = planes[plane] + position;
    }
    const int x = 4 * record.x + half_dx;
    const int y = 4 * record.y + half_dy;
    for (int n = 0; n < 8; ++n) {
        const Fraction& candidate = kQuarterCandidates[n];
        const PlaneSample& a = kQuarterSamples[kind][n][0];
        const PlaneSample& b = kQuarterSamples[kind][n][1];
        const std::uint32_t cost = find_qpix_sd_sad(
            centre[a.plane] + a.y * stride + a.x, centre[b.plane] + b.y * stride + b.x, record.cost,
            vector_rate(x + candidate.dx, y + candidate.dy));
        if (cost < record.cost) {
            record.dx = static_cast<std::int8_t>(half_dx + candidate.dx);
            record.dy = static_cast<std::int8_t>(half_dy + candidate.dy);
            record.cost = cost;
            if (g_best_sad < kGoodSad) {
                break;
            }
        }
    }
    record.sad = g_best_sad;
}

namespace {

// The limits of Kernels::sad_phases: a phase's sum plus its share of the rate reaches the
// threshold.
struct PhaseCosts {
    int share[3];
    int limits[3];

    PhaseCosts(const std::uint32_t* thresholds, int rate)
        : share{(rate + 2) >> 2, (rate + 1) >> 1, (3 * rate) >> 2} {
        for (int p = 0; p < 3; ++p) {
            limits[p] = static_cast<int>(thresholds[p]) - share[p];
        }
    }
};

}  // namespace

// Cost of the block at ref; kNoCost when a partial cost has reached its threshold. A cost below
// best_cost moves the thresholds and g_best_sad.
std::uint32_t CEncoder::find_sd_sad(const std::uint8_t* ref, std::uint32_t best_cost, int rate) {
    const PhaseCosts costs(g_sd_thresh, rate);
    int sums[4];
    if (!g_kernels->sad_phases(g_cur_phases, ref, g_stride_luma, costs.limits, sums)) {
        return kNoCost;
    }
    const std::uint32_t total = static_cast<std::uint32_t>(sums[3] + rate);
    if (total < best_cost) {
        g_sd_thresh[0] = static_cast<std::uint32_t>(2 * (sums[0] + costs.share[0]));
        g_sd_thresh[1] = static_cast<std::uint32_t>(sums[1] + costs.share[1]);
        g_sd_thresh[2] = static_cast<std::uint32_t>(sums[2] + costs.share[2]);
        g_best_sad = static_cast<std::uint32_t>(sums[3]);
    }
    return total;
}

// The same for the average of two blocks, with a tighter first threshold.
std::uint32_t CEncoder::find_qpix_sd_sad(const std::uint8_t* a, const std::uint8_t* b,
                                         std::uint32_t best_cost, int rate) {
    const PhaseCosts costs(g_sd_thresh, rate);
    int sums[4];
    if (!g_kernels->sad_phases_average(g_cur_phases, a, b, g_stride_luma, costs.limits, sums)) {
        return kNoCost;
    }
    const std::uint32_t total = static_cast<std::uint32_t>(sums[3] + rate);
    if (total < best_cost) {
        g_sd_thresh[0] = static_cast<std::uint32_t>((5 * (sums[0] + costs.share[0])) >> 2);
        g_sd_thresh[1] = static_cast<std::uint32_t>(sums[1] + costs.share[1]);
        g_sd_thresh[2] = static_cast<std::uint32_t>(sums[2] + costs.share[2]);
        g_best_sad = static_cast<std::uint32_t>(sums[3]);
    }
    return total;
}
