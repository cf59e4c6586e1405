// Every kernel of every table against the scalar one, on random and extreme input. The buffers are
// compared whole, margins included, so that a stray write shows as a difference.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "common/Random.h"
#include "encoder/tables.h"
#include "kernels/Kernels.h"

namespace {

using zolt::Kernels;
using zolt_test::Random;

// The tables to compare with the scalar one.
std::vector<const Kernels*> tables() {
    std::vector<const Kernels*> list;
    for (const Kernels& table : zolt::kernel_tables()) {
        list.push_back(&table);
    }
    list.erase(list.begin());
    return list;
}

constexpr int kPlaneWidth = 160;
constexpr int kPlaneSize = kPlaneWidth * 160;
constexpr int kMargin = 64;  // before and after what a kernel may write

// All that kernels read and write.
struct Arena {
    alignas(64) std::uint8_t plane[2][kPlaneSize];
    alignas(64) std::uint8_t samples[kMargin + 512 + kMargin];
    alignas(64) std::uint8_t mode_preds[kMargin + 1024 + kMargin];
    alignas(64) std::int16_t coefs[kMargin + 16 * 16 + kMargin];
    alignas(64) std::int16_t scan[kMargin + 16 * 16 + kMargin];
    alignas(64) std::uint16_t nonzero[kMargin + 16 + kMargin];
    alignas(64) std::int32_t values[kMargin + 16 + kMargin];
    alignas(64) std::int32_t numbers[kMargin + 64 + kMargin];
    std::int16_t dc[1 + 16];
    std::uint32_t result;

    // Aligned as the engine's are and no better.
    std::uint8_t* pred() { return samples + kMargin + 32; }
    std::uint8_t* pred_4x4() { return samples + kMargin + 16; }
    std::int16_t* coef() { return coefs + kMargin + 16; }
    std::int16_t* levels() { return scan + kMargin + 16; }
    std::uint16_t* masks() { return nonzero + kMargin + 1; }
    std::uint8_t* preds() { return mode_preds + kMargin; }
    std::int32_t* out() { return numbers + kMargin; }
};

enum Pattern { kNoise, kExtremes, kColumns, kChecker, kBlackAndWhite, kGentle, kPatternCount };

// Fills samples; `which` tells two planes of a pattern apart.
void fill(std::uint8_t* p, int count, int pattern, int which, Random& random) {
    const int base = random.between(0, 255);
    for (int i = 0; i < count; ++i) {
        const int x = i % kPlaneWidth, y = i / kPlaneWidth;
        const std::uint32_t r = random.next();
        const int values[kPatternCount] = {static_cast<int>(r >> 24),
                                           static_cast<int>(r >> 31) * 255,
                                           (x + which) % 2 * 255,
                                           (x + y + which) % 2 * 255,
                                           which * 255,
                                           std::clamp(base + static_cast<int>(r % 13) - 6, 0, 255)};
        p[i] = static_cast<std::uint8_t>(values[pattern]);
    }
}

void fill(Arena& arena, int pattern, Random& random) {
    std::memset(static_cast<void*>(&arena), 0, sizeof arena);
    fill(arena.plane[0], kPlaneSize, pattern, 0, random);
    fill(arena.plane[1], kPlaneSize, pattern, 1, random);
    fill(arena.samples, sizeof arena.samples, pattern, 1, random);
    for (auto& c : arena.coefs) {
        // Up to the largest magnitude that reconstruct takes, so that sums leave 16 bits.
        const int values[kPatternCount] = {random.between(-32767, 32767),
                                           random.between(0, 1) ? 32767 : -32767,
                                           32767,
                                           random.between(-2000, 2000),
                                           -32767,
                                           random.between(-40, 40)};
        c = static_cast<std::int16_t>(values[pattern]);
    }
    for (auto& v : arena.values) {
        const int values[kPatternCount] = {random.between(-65535, 65535),
                                           random.between(0, 1) ? 65535 : -65535,
                                           65535,
                                           random.between(-4080, 4080),
                                           -65535,
                                           random.between(-20, 20)};
        v = values[pattern];
    }
}

// Samples somewhere in a plane, far enough from its ends for any kernel. References of the motion
// search have any alignment, blocks of the current picture that of their size.
struct Place {
    std::ptrdiff_t stride;
    std::uint8_t* p;

    Place(std::uint8_t* plane, Random& random, int alignment = 1) {
        stride = random.between(72 / alignment, kPlaneWidth / alignment) * alignment;
        p = plane + 40 * kPlaneWidth + random.between(0, 63 / alignment) * alignment;
    }
};

// A case runs one kernel on the arena; what else it needs it draws, equally for every table.
struct Case {
    const char* name;
    void (*run)(const Kernels& k, Arena& a, Random random);
};

// Arranges a block in the arena's samples.
void arrange_current(Arena& a, Random& random) {
    const Place current(a.plane[0], random, 16);
    zolt::scalar_kernels().arrange_block(current.p, current.stride, a.pred());
}

// A block of the reference and eight around it, with limits at which their distortions decide.
struct Candidates {
    const std::uint8_t* centre;
    const std::uint8_t* refs[8];
    std::ptrdiff_t stride;
    std::int32_t limits[8];

    Candidates(Arena& arena, Random& random) {
        const Place place(arena.plane[1], random);
        centre = place.p;
        stride = place.stride;
        for (int i = 0; i < 8; ++i) {
            refs[i] = centre + random.between(-8, 8) * stride + random.between(-8, 8);
        }
        set_limits(arena, random);
    }

    void set_limits(Arena& arena, Random& random) {
        for (int i = 0; i < 8; ++i) {
            int sums[4];
            zolt::scalar_kernels().phase_sads(arena.pred(), refs[i], stride, sums);
            const int choices[4] = {sums[1], sums[1] + 1, sums[1] + random.between(-300, 300),
                                    random.between(0, 1) ? 0xffffff : -5};
            limits[i] = choices[random.between(0, 3)];
        }
    }

    // Limits at which the distortions of averages decide.
    void average(Arena& arena, bool cross, Random& random) {
        for (int i = 0; i < 8; ++i) {
            const bool diagonal = cross && i >= 4;
            const std::uint8_t* a = diagonal ? refs[zolt::kCrossPairs[i - 4][0]] : centre;
            const std::uint8_t* b = refs[diagonal ? zolt::kCrossPairs[i - 4][1] : i];
            int sums[4];
            zolt::scalar_kernels().phase_sads_average(arena.pred(), a, b, stride, sums);
            limits[i] = sums[1] + random.between(-1, 2);
        }
    }
};

const zolt::Quantizer& any_quantizer(Random& random) {
    const int qp = random.between(0, 51);
    return random.between(0, 1) ? zolt::intra_quantizer(qp) : zolt::inter_quantizer(qp);
}

// Blocks of levels or coefficients before a kernel that may write zeros to those without levels or
// leave them as they are.
class BlocksBefore {
public:
    BlocksBefore(std::int16_t* blocks, int count)
        : m_blocks(blocks), m_before(blocks, blocks + 16 * count) {}

    // Puts back what stood in those without levels, where zeros do now.
    void restore(std::uint32_t coded) {
        for (std::size_t b = 0; b < m_before.size() / 16; ++b) {
            std::int16_t* const block = m_blocks + 16 * b;
            if ((coded >> b & 1) == 0 && std::count(block, block + 16, 0) == 16) {
                std::copy_n(m_before.begin() + static_cast<std::ptrdiff_t>(16 * b), 16, block);
            }
        }
    }

private:
    std::int16_t* m_blocks;
    std::vector<std::int16_t> m_before;
};

// A residual kernel on blocks of `size` x `size` samples, in half of the cases with DC values of
// their own. Predictions near the samples leave some blocks without levels.
template <auto kernel, int size>
void run_residual(const Kernels& k, Arena& a, Random random) {
    const Place src(a.plane[0], random, size);
    const zolt::Quantizer& q = any_quantizer(random);
    std::uint8_t* const pred = size == 4 ? a.pred_4x4() : a.pred();
    const int near = random.between(0, size * size);
    for (int i = 0; i < near; ++i) {
        const int sample = src.p[i / size * src.stride + i % size];
        pred[i] = static_cast<std::uint8_t>(std::clamp(sample + random.between(-4, 4), 0, 255));
    }
    if constexpr (size == 4) {
        a.result = (k.*kernel)(src.p, src.stride, pred, q, a.coef(), a.levels(), a.masks());
    } else {
        std::int16_t* const dc = random.between(0, 1) ? a.dc + 1 : nullptr;
        BlocksBefore coefs(a.coef(), 16), levels(a.levels(), 16);
        a.result = (k.*kernel)(src.p, src.stride, pred, q, dc, a.coef(), a.levels(), a.masks());
        levels.restore(a.result);
        if (!dc) {
            coefs.restore(a.result);
        }
    }
}

// Gives a chroma component a prediction whose error has a DC coefficient or an AC one at the border
// of the dead zone, as far as samples allow: a step between halves, or a constant.
void predict_at_dead_zone(const std::uint8_t* src, std::ptrdiff_t stride, std::uint8_t* pred,
                          const zolt::Quantizer& q, Random& random) {
    const bool constant = random.between(0, 1);
    // The first is the sum of 64 errors, the second 4 * 4 + 4 * 2 times the error in a block.
    const int target = constant ? q.dc_dead_zone : 64 * q.dead_zone[4] / 24;
    const int total = std::min(target + random.between(-2, 2), 64 * 255);
    for (int i = 0; i < 64; ++i) {
        const int error = total / 64 + (i < total % 64 ? 1 : 0);
        const bool minus = !constant && i % 4 > 1;
        const int sample = src[i / 8 * stride + i % 8] + (minus ? error : -error);
        pred[i] = static_cast<std::uint8_t>(std::clamp(sample, 0, 255));
    }
}

// Components somewhere in the planes, the reconstruction in their place or elsewhere.
void run_code_chroma(const Kernels& k, Arena& a, Random random) {
    const Place src(a.plane[0], random, 8);
    const Place elsewhere(a.plane[0] + 64 * kPlaneWidth, random, 8);
    const bool in_place = random.between(0, 1);
    const Place& dst = in_place ? src : elsewhere;
    const std::ptrdiff_t v = a.plane[1] - a.plane[0];
    const zolt::Quantizer& q = any_quantizer(random);
    for (int c = 0; c < 2; ++c) {
        std::uint8_t* const pred = a.pred() + 64 * c;
        const std::uint8_t* const samples = src.p + v * c;
        const int kind = random.between(0, 3), near = random.between(0, 64);
        if (kind == 0) {
            predict_at_dead_zone(samples, src.stride, pred, q, random);
        }
        for (int i = 0; kind == 1 && i < near; ++i) {
            const int sample = samples[i / 8 * src.stride + i % 8];
            pred[i] = static_cast<std::uint8_t>(std::clamp(sample + random.between(-4, 4), 0, 255));
        }
    }
    BlocksBefore levels(a.levels(), 8);
    a.result = k.code_chroma({{src.p, src.p + v},
                              src.stride,
                              a.pred(),
                              {dst.p, dst.p + v},
                              dst.stride,
                              &q,
                              a.levels(),
                              a.masks(),
                              a.dc + 1});
    levels.restore(a.result);
}

// The filter of an edge between macroblocks of some QP.
zolt::EdgeFilter random_filter(Random& random) {
    zolt::EdgeFilter filter{};
    filter.alpha = static_cast<std::uint8_t>(random.between(0, 255));
    filter.beta = static_cast<std::uint8_t>(random.between(0, 18));
    filter.tc0[0] = -1;
    for (int strength = 1; strength < 4; ++strength) {
        filter.tc0[strength] = static_cast<std::int8_t>(random.between(0, 25));
    }
    return filter;
}

// Runs a filter on the edges of the macroblock whose samples it takes: edges without a strength,
// with one for all segments or with any for each, the outer one strong at times.
template <auto filter, typename... Samples>
void run_filter(const Kernels& k, Random& random, std::ptrdiff_t stride, Samples... samples) {
    std::uint32_t strengths[4];
    for (std::uint32_t& edge : strengths) {
        const int kind = random.between(0, 3);
        const auto strength = [&] { return static_cast<std::uint32_t>(random.between(0, 3)); };
        edge = kind == 0 ? 0 : strength() * 0x01010101U;
        for (int i = 0; i < 4 && kind == 1; ++i) {
            edge = edge << 8 | strength();
        }
    }
    if (random.between(0, 2) == 0) {
        strengths[0] = zolt::kStrongEdge;
    }
    const zolt::EdgeFilter outer = random_filter(random), inner = random_filter(random);
    (k.*filter)(samples..., stride, strengths, outer, inner);
}

template <auto filter>
void run_luma_filter(const Kernels& k, Arena& a, Random random) {
    const Place edge(a.plane[0], random, 4);
    run_filter<filter>(k, random, edge.stride, edge.p);
}

template <auto filter>
void run_chroma_filter(const Kernels& k, Arena& a, Random random) {
    const Place edge(a.plane[0], random, 4);
    run_filter<filter>(k, random, edge.stride, edge.p, a.plane[1] + (edge.p - a.plane[0]));
}

constexpr Case kCases[] = {
    {"arrange_block",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 16);
         k.arrange_block(src.p, src.stride, a.pred());
     }},
    {"phase_sads",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         const Place ref(a.plane[1], random);
         k.phase_sads(a.pred(), ref.p, ref.stride, a.out());
     }},
    {"phase_sads_average",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         const Place ref(a.plane[1], random);
         k.phase_sads_average(a.pred(), ref.p, ref.p + random.between(-2, 2), ref.stride, a.out());
     }},
    {"first_phases_below_x4",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         const Candidates c(a, random);
         a.result = k.first_phases_below_x4(a.pred(), c.refs, c.stride, c.limits);
     }},
    {"first_phases_below_half",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         Candidates c(a, random);
         const zolt::HalfSamples at = {c.refs[0], c.refs[1], c.refs[2]};
         zolt::half_candidates(at, c.stride, c.refs);
         c.set_limits(a, random);
         a.result = k.first_phases_below_half(a.pred(), at, c.stride, c.limits);
     }},
    {"first_phases_below_star",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         Candidates c(a, random);
         c.average(a, false, random);
         a.result = k.first_phases_below_star(a.pred(), c.centre, c.refs, c.stride, c.limits);
     }},
    {"first_phases_below_cross",
     [](const Kernels& k, Arena& a, Random random) {
         arrange_current(a, random);
         Candidates c(a, random);
         c.average(a, true, random);
         a.result = k.first_phases_below_cross(a.pred(), c.centre, c.refs, c.stride, c.limits);
     }},
    {"extend_edges",
     [](const Kernels& k, Arena& a, Random random) {
         const bool luma = random.between(0, 1);
         const int unit = luma ? 16 : 8, border = luma ? 32 : 16;
         const int width = unit * random.between(1, 5), height = unit * random.between(1, 5);
         const std::ptrdiff_t stride = width + 2 * border;
         k.extend_edges(a.plane[0] + border * (stride + 1), width, height, stride, border);
     }},
    {"half_vertical_row",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random);
         k.half_vertical_row(src.p, src.stride, a.plane[1] + random.between(64, 128),
                             random.between(1, 150));
     }},
    {"half_horizontal_row",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random);
         k.half_horizontal_row(src.p, a.plane[1] + random.between(64, 128), random.between(1, 150));
     }},
    {"copy_16x16",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random);
         k.copy_16x16(a.pred(), src.p, src.stride);
     }},
    {"average_16x16",
     [](const Kernels& k, Arena& a, Random random) {
         const Place first(a.plane[0], random);
         const Place second(a.plane[1], random);
         const bool in_place = random.between(0, 1);  // with what the prediction holds
         k.average_16x16(a.pred(), first.p, first.stride, in_place ? a.pred() : second.p,
                         in_place ? 16 : second.stride);
     }},
    {"centre_16x16",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random);
         k.centre_16x16(a.pred(), src.p, src.stride);
     }},
    {"chroma_8x8",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random);
         const int fx = random.between(0, 7), fy = random.between(0, 7);
         k.chroma_8x8(a.pred(), src.p, a.plane[1] + (src.p - a.plane[0]), src.stride, fx, fy);
     }},
    {"code_residual_16x16", run_residual<&Kernels::code_residual_16x16, 16>},
    {"code_residual_4x4", run_residual<&Kernels::code_residual_4x4, 4>},
    {"code_luma_dc",
     [](const Kernels& k, Arena& a, Random random) {
         const int qp = random.between(0, 51);
         // All of one magnitude, so that they meet in one sum, or of any.
         const int largest = random.between(0, 4080);
         const bool any = random.between(0, 1) != 0;
         for (int n = 0; n < 16; ++n) {
             const int magnitude = any ? random.between(0, largest) : largest;
             a.dc[1 + n] = static_cast<std::int16_t>(random.between(0, 3) ? magnitude : -magnitude);
         }
         a.result = k.code_luma_dc(a.dc + 1, zolt::intra_quantizer(qp), a.coef(), a.levels());
     }},
    {"reconstruct_16x16",
     [](const Kernels& k, Arena& a, Random random) {
         const Place dst(a.plane[0], random, 16);
         k.reconstruct_16x16(a.coef(), random.next() & random.next() & 0xffff, a.pred(), dst.p,
                             dst.stride);
     }},
    {"reconstruct_4x4",
     [](const Kernels& k, Arena& a, Random random) {
         const Place dst(a.plane[0], random, 4);
         k.reconstruct_4x4(a.coef(), a.pred_4x4(), dst.p, dst.stride);
     }},
    {"code_chroma", run_code_chroma},
    {"block_sums",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 16);
         k.block_sums(src.p, src.stride, a.out());
     }},
    {"hadamard_energy",
     [](const Kernels& k, Arena& a, Random) { k.hadamard_energy(a.values + kMargin, a.out()); }},
    {"intra_16x16_modes",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 16);
         const bool up = random.between(0, 1), left = random.between(0, 1);
         k.intra_16x16_modes(src.p, src.stride, up, left, a.preds(), a.out());
     }},
    {"intra_chroma_modes",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 8);
         const std::uint8_t* v = a.plane[1] + (src.p - a.plane[0]);
         const bool up = random.between(0, 1), left = random.between(0, 1);
         k.intra_chroma_modes(src.p, v, src.stride, up, left, a.preds(), a.out());
     }},
    {"phase_satd_4x4",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 4);
         // The engine keeps the predictions of the nine modes one after the other.
         k.phase_satd_4x4(src.p, src.stride, a.pred() + 16 * random.between(0, 8), a.out());
     }},
    {"intra_4x4_modes",
     [](const Kernels& k, Arena& a, Random random) {
         const Place src(a.plane[0], random, 4);
         const std::uint8_t* neighbours = a.plane[1] + random.between(0, 100);
         k.intra_4x4_modes(src.p, src.stride, neighbours, random.sample(), a.pred_4x4(), a.coef());
     }},
    {"deblock_luma_vertical", run_luma_filter<&Kernels::deblock_luma_vertical>},
    {"deblock_luma_horizontal", run_luma_filter<&Kernels::deblock_luma_horizontal>},
    {"deblock_chroma_vertical", run_chroma_filter<&Kernels::deblock_chroma_vertical>},
    {"deblock_chroma_horizontal", run_chroma_filter<&Kernels::deblock_chroma_horizontal>},
};
// All function pointers of a table have a case, those of the colour conversions elsewhere, and so
// code_intra_4x4, which equals steps of the engine.
static_assert(offsetof(Kernels, rgb32_rows_to_iyuv) ==
                  sizeof(const char*) + (sizeof kCases / sizeof *kCases + 1) * sizeof(void (*)()),
              "a kernel without a case");

class KernelTable : public testing::TestWithParam<std::tuple<const Kernels*, Case>> {};

TEST_P(KernelTable, EqualsScalar) {
    const auto [table, c] = GetParam();
    // Not on the stack, whose surroundings would take a stray write without a word.
    const auto scalar = std::make_unique<Arena>();
    const auto other = std::make_unique<Arena>();
    for (int iteration = 0; iteration < 300; ++iteration) {
        Random random(static_cast<std::uint64_t>(iteration));
        const int pattern = iteration % kPatternCount;
        fill(*scalar, pattern, random);
        std::memcpy(other.get(), scalar.get(), sizeof(Arena));
        c.run(zolt::scalar_kernels(), *scalar, random);
        c.run(*table, *other, random);
        ASSERT_EQ(std::memcmp(scalar.get(), other.get(), sizeof(Arena)), 0)
            << "iteration " << iteration << ", pattern " << pattern;
    }
}

INSTANTIATE_TEST_SUITE_P(Tables, KernelTable,
                         testing::Combine(testing::ValuesIn(tables()), testing::ValuesIn(kCases)),
                         [](const auto& test) {
                             return std::string(std::get<0>(test.param)->name) + "_" +
                                    std::get<1>(test.param).name;
                         });
// A processor may have the scalar table only.
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(KernelTable);

}  // namespace
