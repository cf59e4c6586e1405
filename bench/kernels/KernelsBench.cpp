#include <benchmark/benchmark.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <random>
#include <string>

#include "encoder/tables.h"
#include "kernels/Kernels.h"

// Time of one call of every kernel of the engine, by table ("name/table"), on data in the cache.
// Strides and alignments are those of a 1280x720 session; references of the motion search are
// unaligned.

namespace {

using zolt::Kernels;

constexpr int kWidth = 1280, kHeight = 720;
constexpr int kBorder = 32;
constexpr std::ptrdiff_t kStride = kWidth + 2 * kBorder;
constexpr std::ptrdiff_t kPlaneSize = kStride * (kHeight + 2 * kBorder);
constexpr int kQp = 28;

// What kernels read and write. Deblocking works in place: it filters its own results again.
struct Arena {
    alignas(64) std::uint8_t planes[2][kPlaneSize];
    alignas(64) std::uint8_t block[zolt::kArrangedBlock];
    alignas(64) std::uint8_t pred[256];
    alignas(64) std::uint8_t preds[1024];
    alignas(64) std::int16_t coefs[256];
    alignas(64) std::int16_t scan[256];
    alignas(64) std::int32_t values[16];
    alignas(64) std::int32_t sums[64];
    std::uint16_t nonzero[16];
    std::int16_t dc[16];
    std::uint8_t* current;  // a macroblock
    const std::uint8_t* refs[8];
    std::int32_t limits[8] = {};

    Arena() {
        std::minstd_rand random(1);
        const auto between = [&random](int low, int high) {
            return low + static_cast<int>(random() % static_cast<unsigned>(high - low + 1));
        };
        // Gentle texture, so that the deblocking filters find edges to filter.
        for (std::ptrdiff_t i = 0; i < kPlaneSize; ++i) {
            const int base = static_cast<int>(i % kStride / 8 + i / kStride / 4) % 160 + 40;
            planes[0][i] = static_cast<std::uint8_t>(base + between(-3, 3));
            planes[1][i] = static_cast<std::uint8_t>(base + between(-3, 3));
        }
        for (std::uint8_t& sample : pred) {
            sample = static_cast<std::uint8_t>(between(90, 110));
        }
        for (std::int32_t& value : values) {
            value = between(-200, 200);
        }
        const std::ptrdiff_t place = (kBorder + 160) * kStride + kBorder + 320;
        current = planes[0] + place;
        for (int i = 0; i < 8; ++i) {
            refs[i] = planes[1] + place + (i - 2) * kStride + 3 * i - 5;
        }
        zolt::scalar_kernels().arrange_block(current, kStride, block);
        for (std::int16_t& coef : coefs) {
            coef = static_cast<std::int16_t>(between(-300, 300));
        }
    }

    const std::uint8_t* reference() const { return refs[0]; }
};

struct Case {
    const char* name;
    void (*run)(const Kernels& k, Arena& a);
};

// Edges of an inter macroblock with few levels and of an intra macroblock.
constexpr std::uint32_t kInterEdges[4] = {0x01010201, 0, 0x02000000, 0x02000000};
constexpr std::uint32_t kIntraEdges[4] = {zolt::kStrongEdge, 0x03030303, 0x03030303, 0x03030303};
constexpr zolt::EdgeFilter kEdgeFilter = {40, 10, {-1, 1, 1, 2}};

template <Kernels::LumaFilter Kernels::*filter, const std::uint32_t* strengths>
void run_luma(const Kernels& k, Arena& a) {
    (k.*filter)(a.current, kStride, strengths, kEdgeFilter, kEdgeFilter);
}

template <Kernels::ChromaFilter Kernels::*filter, const std::uint32_t* strengths>
void run_chroma(const Kernels& k, Arena& a) {
    (k.*filter)(a.current, a.current + 64, kStride, strengths, kEdgeFilter, kEdgeFilter);
}

const zolt::Quantizer& quantizer() {
    return zolt::inter_quantizer(kQp);
}

void code_chroma(const Kernels& k, Arena& a) {
    std::uint8_t* const dst = a.current + 16 * kStride;
    benchmark::DoNotOptimize(k.code_chroma({{a.current, a.current + 16},
                                            kStride,
                                            a.pred,
                                            {dst, dst + 16},
                                            kStride,
                                            &quantizer(),
                                            a.scan,
                                            a.nonzero,
                                            a.dc}));
}

// A macroblock in the middle of a picture, its samples new each time.
void run_code_intra_4x4(const Kernels& k, Arena& a) {
    for (int y = 0; y < 16; ++y) {
        std::memcpy(a.current + y * kStride, a.block + 16 * y, 16);
    }
    std::int8_t modes[5 * 5] = {};
    std::uint8_t predicted[16], chosen[16];
    const zolt::Intra4x4 macroblock = {a.current,   kStride,   true,         true,   true,
                                       modes + 6,   5,         &quantizer(), 32,     192,
                                       {8, 10, 12}, predicted, chosen,       a.scan, a.nonzero};
    benchmark::DoNotOptimize(k.code_intra_4x4(macroblock));
}

constexpr Case kCases[] = {
    {"arrange_block",
     [](const Kernels& k, Arena& a) { k.arrange_block(a.current, kStride, a.block); }},
    {"phase_sads",
     [](const Kernels& k, Arena& a) { k.phase_sads(a.block, a.reference(), kStride, a.sums); }},
    {"phase_sads_average",
     [](const Kernels& k, Arena& a) {
         k.phase_sads_average(a.block, a.refs[0], a.refs[1], kStride, a.sums);
     }},
    {"first_phases_below_x4",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(k.first_phases_below_x4(a.block, a.refs, kStride, a.limits));
     }},
    {"first_phases_below_half",
     [](const Kernels& k, Arena& a) {
         const zolt::HalfSamples at = {a.refs[0], a.refs[1], a.refs[2]};
         benchmark::DoNotOptimize(k.first_phases_below_half(a.block, at, kStride, a.limits));
     }},
    {"first_phases_below_star",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(
             k.first_phases_below_star(a.block, a.reference(), a.refs, kStride, a.limits));
     }},
    {"first_phases_below_cross",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(
             k.first_phases_below_cross(a.block, a.reference(), a.refs, kStride, a.limits));
     }},
    {"extend_edges",
     [](const Kernels& k, Arena& a) {
         k.extend_edges(a.planes[0] + kBorder * (kStride + 1), kWidth, kHeight, kStride, kBorder);
     }},
    {"half_vertical_row",
     [](const Kernels& k, Arena& a) {
         k.half_vertical_row(a.planes[0] + kBorder * kStride, kStride,
                             a.planes[1] + kBorder * kStride, static_cast<int>(kStride));
     }},
    {"half_horizontal_row",
     [](const Kernels& k, Arena& a) {
         k.half_horizontal_row(a.planes[0] + kBorder * kStride + 3,
                               a.planes[1] + kBorder * kStride + 3, static_cast<int>(kStride) - 6);
     }},
    {"copy_16x16",
     [](const Kernels& k, Arena& a) { k.copy_16x16(a.pred, a.reference(), kStride); }},
    {"average_16x16",
     [](const Kernels& k, Arena& a) {
         k.average_16x16(a.pred, a.refs[0], kStride, a.refs[1], kStride);
     }},
    {"centre_16x16",
     [](const Kernels& k, Arena& a) { k.centre_16x16(a.pred, a.reference(), kStride); }},
    {"chroma_8x8",
     [](const Kernels& k, Arena& a) { k.chroma_8x8(a.pred, a.refs[0], a.refs[1], kStride, 3, 5); }},
    {"code_residual_16x16",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(k.code_residual_16x16(a.current, kStride, a.pred, quantizer(),
                                                        nullptr, a.coefs, a.scan, a.nonzero));
     }},
    {"code_residual_4x4",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(k.code_residual_4x4(a.current, kStride, a.pred, quantizer(),
                                                      a.coefs, a.scan, a.nonzero));
     }},
    {"code_luma_dc",
     [](const Kernels& k, Arena& a) {
         benchmark::DoNotOptimize(k.code_luma_dc(a.coefs, quantizer(), a.coefs, a.scan));
     }},
    {"reconstruct_16x16",
     [](const Kernels& k, Arena& a) {
         k.reconstruct_16x16(a.coefs, 0xffff, a.pred, a.current, kStride);
     }},
    {"reconstruct_4x4",
     [](const Kernels& k, Arena& a) { k.reconstruct_4x4(a.coefs, a.pred, a.current, kStride); }},
    {"code_chroma", code_chroma},
    {"block_sums", [](const Kernels& k, Arena& a) { k.block_sums(a.current, kStride, a.sums); }},
    {"hadamard_energy", [](const Kernels& k, Arena& a) { k.hadamard_energy(a.values, a.sums); }},
    {"intra_16x16_modes",
     [](const Kernels& k, Arena& a) {
         k.intra_16x16_modes(a.current, kStride, true, true, a.preds, a.sums);
     }},
    {"intra_chroma_modes",
     [](const Kernels& k, Arena& a) {
         k.intra_chroma_modes(a.current, a.current + 64, kStride, true, true, a.preds, a.sums);
     }},
    {"phase_satd_4x4",
     [](const Kernels& k, Arena& a) { k.phase_satd_4x4(a.current, kStride, a.pred, a.sums); }},
    {"intra_4x4_modes",
     [](const Kernels& k, Arena& a) {
         k.intra_4x4_modes(a.current, kStride, a.reference(), 100, a.pred, a.coefs);
     }},
    {"code_intra_4x4", run_code_intra_4x4},
    {"deblock_luma_vertical", run_luma<&Kernels::deblock_luma_vertical, kInterEdges>},
    {"deblock_luma_vertical_intra", run_luma<&Kernels::deblock_luma_vertical, kIntraEdges>},
    {"deblock_luma_horizontal", run_luma<&Kernels::deblock_luma_horizontal, kInterEdges>},
    {"deblock_luma_horizontal_intra", run_luma<&Kernels::deblock_luma_horizontal, kIntraEdges>},
    {"deblock_chroma_vertical", run_chroma<&Kernels::deblock_chroma_vertical, kInterEdges>},
    {"deblock_chroma_vertical_intra", run_chroma<&Kernels::deblock_chroma_vertical, kIntraEdges>},
    {"deblock_chroma_horizontal", run_chroma<&Kernels::deblock_chroma_horizontal, kInterEdges>},
    {"deblock_chroma_horizontal_intra",
     run_chroma<&Kernels::deblock_chroma_horizontal, kIntraEdges>},
};
// Each of the four deblocking kernels has two.
static_assert(offsetof(Kernels, rgb32_rows_to_iyuv) ==
                  sizeof(const char*) + (sizeof kCases / sizeof *kCases - 4) * sizeof(void (*)()),
              "a kernel without a benchmark");

void measure(benchmark::State& state, const Kernels& kernels, const Case& c) {
    const auto arena = std::make_unique<Arena>();
    for (auto _ : state) {
        c.run(kernels, *arena);
        benchmark::ClobberMemory();
    }
}

}  // namespace

int main(int argc, char** argv) {
    for (const Case& c : kCases) {
        for (const Kernels& kernels : zolt::kernel_tables()) {
            if (c.run == run_code_intra_4x4 && !kernels.code_intra_4x4) {
                continue;
            }
            benchmark::RegisterBenchmark(
                (std::string(c.name) + "/" + kernels.name).c_str(),
                [&](benchmark::State& state) { measure(state, kernels, c); });
        }
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
}
