#include <benchmark/benchmark.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <random>
#include <string>

#include "encoder/kernels/Kernels.h"
#include "encoder/tables.h"

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

// What kernels read and write. Kernels that work in place see their own results again: levels
// quantise to themselves, and edges that are filtered once are filtered again.
struct Arena {
    alignas(64) std::uint8_t planes[2][kPlaneSize];
    alignas(64) std::uint8_t phases[512];
    alignas(64) std::uint8_t pred[256];
    alignas(64) std::int16_t coefs[256];
    alignas(64) std::int16_t scan[256];
    alignas(64) std::int32_t values[16];
    alignas(64) std::int32_t sums[16];
    std::uint16_t nonzero[16];
    std::uint8_t* current;  // a macroblock
    const std::uint8_t* a[4];
    const std::uint8_t* b[4];

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
        for (int i = 0; i < 4; ++i) {
            a[i] = planes[1] + place + (i - 2) * kStride + 3 * i - 5;
            b[i] = a[i] + 1;
        }
        zolt::scalar_kernels().split_phases(current, kStride, phases);
        zolt::scalar_kernels().transform_16x16(current, kStride, pred, coefs);
    }

    const std::uint8_t* reference() const { return a[0]; }
};

struct Case {
    const char* name;
    void (*run)(const Kernels& k, Arena& a);
};

template <Kernels::NormalFilter Kernels::*filter>
void run_normal(const Kernels& k, Arena& a) {
    constexpr std::int8_t kTc0[4] = {1, 2, -1, 1};
    (k.*filter)(a.current, kStride, 40, 10, kTc0);
}

template <Kernels::StrongFilter Kernels::*filter>
void run_strong(const Kernels& k, Arena& a) {
    (k.*filter)(a.current, kStride, 40, 10);
}

void quantize(const Kernels& k, Arena& a, int blocks) {
    benchmark::DoNotOptimize(
        k.quantize(a.coefs, blocks, zolt::inter_quantizer(kQp), a.scan, a.nonzero));
}

constexpr Case kCases[] = {
    {"split_phases",
     [](const Kernels& k, Arena& a) { k.split_phases(a.current, kStride, a.phases); }},
    {"sad_first_phases",
     [](const Kernels& k, Arena& a) {
         k.sad_first_phases(a.phases, a.reference(), kStride, a.sums);
     }},
    {"sad_first_phases_x4",
     [](const Kernels& k, Arena& a) {
         k.sad_first_phases_x4(a.phases, a.a, kStride, a.sums, a.sums + 4);
     }},
    {"sad_first_phases_average_x4",
     [](const Kernels& k, Arena& a) {
         k.sad_first_phases_average_x4(a.phases, a.a, a.b, kStride, a.sums, a.sums + 4);
     }},
    {"sad_last_phases",
     [](const Kernels& k, Arena& a) {
         k.sad_last_phases(a.phases, a.reference(), kStride, a.sums);
     }},
    {"sad_last_phases_average",
     [](const Kernels& k, Arena& a) {
         k.sad_last_phases_average(a.phases, a.a[0], a.b[0], kStride, a.sums);
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
     [](const Kernels& k, Arena& a) { k.average_16x16(a.pred, a.a[0], kStride, a.b[0], kStride); }},
    {"centre_16x16",
     [](const Kernels& k, Arena& a) { k.centre_16x16(a.pred, a.reference(), kStride); }},
    {"chroma_8x8",
     [](const Kernels& k, Arena& a) { k.chroma_8x8(a.pred, a.reference(), kStride, 3, 5); }},
    {"transform_16x16",
     [](const Kernels& k, Arena& a) { k.transform_16x16(a.current, kStride, a.pred, a.coefs); }},
    {"transform_8x8",
     [](const Kernels& k, Arena& a) { k.transform_8x8(a.current, kStride, a.pred, a.coefs); }},
    {"transform_4x4",
     [](const Kernels& k, Arena& a) { k.transform_4x4(a.current, kStride, a.pred, a.coefs); }},
    {"quantize", [](const Kernels& k, Arena& a) { quantize(k, a, 16); }},
    {"reconstruct_16x16",
     [](const Kernels& k, Arena& a) {
         k.reconstruct_16x16(a.coefs, 0xffff, a.pred, a.current, kStride);
     }},
    {"reconstruct_8x8",
     [](const Kernels& k, Arena& a) {
         k.reconstruct_8x8(a.coefs, 15, a.pred, a.current, kStride);
     }},
    {"reconstruct_4x4",
     [](const Kernels& k, Arena& a) { k.reconstruct_4x4(a.coefs, a.pred, a.current, kStride); }},
    {"block_sums", [](const Kernels& k, Arena& a) { k.block_sums(a.current, kStride, a.sums); }},
    {"hadamard_energy", [](const Kernels& k, Arena& a) { k.hadamard_energy(a.values, a.sums); }},
    {"phase_sad_16x16",
     [](const Kernels& k, Arena& a) { k.phase_sad_16x16(a.current, kStride, a.pred, a.sums); }},
    {"phase_satd_8x8",
     [](const Kernels& k, Arena& a) { k.phase_satd_8x8(a.current, kStride, a.pred, a.sums); }},
    {"phase_satd_4x4",
     [](const Kernels& k, Arena& a) { k.phase_satd_4x4(a.current, kStride, a.pred, a.sums); }},
    {"deblock_luma_vertical", run_normal<&Kernels::deblock_luma_vertical>},
    {"deblock_luma_horizontal", run_normal<&Kernels::deblock_luma_horizontal>},
    {"deblock_chroma_vertical", run_normal<&Kernels::deblock_chroma_vertical>},
    {"deblock_chroma_horizontal", run_normal<&Kernels::deblock_chroma_horizontal>},
    {"deblock_luma_vertical_strong", run_strong<&Kernels::deblock_luma_vertical_strong>},
    {"deblock_luma_horizontal_strong", run_strong<&Kernels::deblock_luma_horizontal_strong>},
    {"deblock_chroma_vertical_strong", run_strong<&Kernels::deblock_chroma_vertical_strong>},
    {"deblock_chroma_horizontal_strong", run_strong<&Kernels::deblock_chroma_horizontal_strong>},
};
static_assert(offsetof(Kernels, rgb32_rows_to_iyuv) ==
                  sizeof(const char*) + sizeof kCases / sizeof *kCases * sizeof(void (*)()),
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
