#include <cstdlib>

#include "kernels/families.h"

namespace zolt {
namespace {

using std::int32_t;
using std::ptrdiff_t;
using std::uint32_t;
using std::uint8_t;

// Where a row stands among the `rows` of an arranged block, in which those of the upper and of the
// lower half alternate.
constexpr int arranged_position(int row, int rows) {
    return 2 * (row % (rows / 2)) + row / (rows / 2);
}

// Samples of an arranged block: of the block itself, and of the checkerboard.
uint8_t* block_row(uint8_t* block, int y) {
    return block + 16 * arranged_position(y, 16);
}
const uint8_t* block_row(const uint8_t* block, int y) {
    return block + 16 * arranged_position(y, 16);
}
uint8_t* checkerboard_row(uint8_t* block, int n) {
    return block + 256 + 16 * arranged_position(n, 8);
}

void arrange_block(const uint8_t* src, ptrdiff_t stride, uint8_t* block) {
    for (int y = 0; y < 16; ++y) {
        for (int x = 0; x < 16; ++x) {
            const uint8_t sample = src[y * stride + x];
            block_row(block, y)[x] = sample;
            if ((x + y) % 2 == 0) {
                checkerboard_row(block, y / 2)[x] = sample;
            }
        }
    }
}

// First row and first column of each sampling phase.
constexpr int kPhaseRow[4] = {0, 1, 1, 0};
constexpr int kPhaseColumn[4] = {0, 1, 0, 1};

// SADs of the phases up to each; sample(y, x) is the sample to compare with.
template <typename Sample>
void add_phases(const uint8_t* block, Sample sample, int* sums) {
    int sum = 0;
    for (int p = 0; p < 4; ++p) {
        for (int y = kPhaseRow[p]; y < 16; y += 2) {
            for (int x = kPhaseColumn[p]; x < 16; x += 2) {
                sum += std::abs(block_row(block, y)[x] - sample(y, x));
            }
        }
        sums[p] = sum;
    }
}

auto samples_at(const uint8_t* ref, ptrdiff_t stride) {
    return [=](int y, int x) { return int{ref[y * stride + x]}; };
}

auto averages_at(const uint8_t* a, const uint8_t* b, ptrdiff_t stride) {
    return [=](int y, int x) { return (a[y * stride + x] + b[y * stride + x] + 1) >> 1; };
}

void phase_sads(const uint8_t* block, const uint8_t* ref, ptrdiff_t stride, int* sums) {
    add_phases(block, samples_at(ref, stride), sums);
}

void phase_sads_average(const uint8_t* block, const uint8_t* a, const uint8_t* b, ptrdiff_t stride,
                        int* sums) {
    add_phases(block, averages_at(a, b, stride), sums);
}

template <typename Sample>
bool first_phases_below(const uint8_t* block, Sample sample, int32_t limit) {
    int sums[4];
    add_phases(block, sample, sums);
    return sums[1] < limit;
}

template <int kCount>
uint32_t first_phases_below(const uint8_t* block, const uint8_t* const* refs, ptrdiff_t stride,
                            const int32_t* limits) {
    uint32_t below = 0;
    for (int n = 0; n < kCount; ++n) {
        below |= uint32_t{first_phases_below(block, samples_at(refs[n], stride), limits[n])} << n;
    }
    return below;
}

uint32_t first_phases_below_half(const uint8_t* block, const HalfSamples& at, ptrdiff_t stride,
                                 const int32_t* limits) {
    const uint8_t* refs[8];
    half_candidates(at, stride, refs);
    return first_phases_below<8>(block, refs, stride, limits);
}

// The averages of centre and each of kCount blocks.
template <int kCount>
uint32_t averages_below(const uint8_t* block, const uint8_t* centre, const uint8_t* const* refs,
                        ptrdiff_t stride, const int32_t* limits) {
    uint32_t below = 0;
    for (int n = 0; n < kCount; ++n) {
        below |=
            uint32_t{first_phases_below(block, averages_at(centre, refs[n], stride), limits[n])}
            << n;
    }
    return below;
}

uint32_t first_phases_below_cross(const uint8_t* block, const uint8_t* centre,
                                  const uint8_t* const* refs, ptrdiff_t stride,
                                  const int32_t* limits) {
    uint32_t below = averages_below<4>(block, centre, refs, stride, limits);
    for (int n = 0; n < 4; ++n) {
        const uint8_t* a = refs[kCrossPairs[n][0]];
        const uint8_t* b = refs[kCrossPairs[n][1]];
        below |= uint32_t{first_phases_below(block, averages_at(a, b, stride), limits[4 + n])}
                 << (4 + n);
    }
    return below;
}

}  // namespace

void scalar::fill_search(Kernels& table) {
    table.arrange_block = arrange_block;
    table.phase_sads = phase_sads;
    table.phase_sads_average = phase_sads_average;
    table.first_phases_below_x4 = first_phases_below<4>;
    table.first_phases_below_half = first_phases_below_half;
    table.first_phases_below_star = averages_below<8>;
    table.first_phases_below_cross = first_phases_below_cross;
}

}  // namespace zolt
