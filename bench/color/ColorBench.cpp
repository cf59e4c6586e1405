#include <benchmark/benchmark.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "color/ColorConverter.h"
#include "kernels/Kernels.h"

// Time to convert a 1280x720 picture of every source format to IYUV: by the kernels of every table
// ("format/table"), and by the converter with its own table ("format/converter").

namespace {

using zolt::Kernels;

constexpr int kWidth = 1280, kHeight = 720;

struct Rows {
    const std::uint8_t *upper, *lower;
    zolt::IyuvRows to;
};

struct Case {
    const char* name;
    int format;
    void (*run)(const Kernels& k, const Rows& rows);
};

template <Kernels::RgbConversion Kernels::*conversion, int kR, int kG, int kB>
void run_rgb(const Kernels& k, const Rows& rows) {
    (k.*conversion)(rows.upper, rows.lower, {kR, kG, kB}, rows.to, kWidth);
}

template <Kernels::YuvConversion Kernels::*conversion>
void run_yuv(const Kernels& k, const Rows& rows) {
    (k.*conversion)(rows.upper, rows.lower, rows.to, kWidth);
}

constexpr Case kCases[] = {
    {"BGRA", ColorConverter::kBGRA, run_rgb<&Kernels::rgb32_rows_to_iyuv, 2, 1, 0>},
    {"RGBA", ColorConverter::kRGBA, run_rgb<&Kernels::rgb32_rows_to_iyuv, 0, 1, 2>},
    {"ARGB", ColorConverter::kARGB, run_rgb<&Kernels::rgb32_rows_to_iyuv, 1, 2, 3>},
    {"BGR", ColorConverter::kBGR, run_rgb<&Kernels::rgb24_rows_to_iyuv, 2, 1, 0>},
    {"RGB", ColorConverter::kRGB, run_rgb<&Kernels::rgb24_rows_to_iyuv, 0, 1, 2>},
    {"AYUV", ColorConverter::kAYUV, run_yuv<&Kernels::ayuv_rows_to_iyuv>},
    {"YUY2", ColorConverter::kYUY2, run_yuv<&Kernels::yuy2_rows_to_iyuv>},
};

std::vector<std::uint8_t> noise(int format) {
    std::vector<std::uint8_t> picture(
        static_cast<std::size_t>(ColorConverter::GetBufferSize(kWidth, kHeight, format)));
    std::minstd_rand random(1);
    for (std::uint8_t& byte : picture) {
        byte = static_cast<std::uint8_t>(random() >> 8);
    }
    return picture;
}

void measure_kernels(benchmark::State& state, const Kernels& kernels, const Case& c) {
    const std::vector<std::uint8_t> source = noise(c.format);
    std::vector<std::uint8_t> result(kWidth * kHeight * 3 / 2);
    const std::ptrdiff_t row_bytes = static_cast<std::ptrdiff_t>(source.size()) / kHeight;
    for (auto _ : state) {
        const std::uint8_t* from = source.data();
        std::uint8_t* luma = result.data();
        std::uint8_t* u = luma + kWidth * kHeight;
        std::uint8_t* v = u + kWidth * kHeight / 4;
        for (int y = 0; y < kHeight; y += 2) {
            c.run(kernels, {from, from + row_bytes, {luma, luma + kWidth, u, v}});
            from += 2 * row_bytes;
            luma += 2 * kWidth;
            u += kWidth / 2;
            v += kWidth / 2;
        }
        benchmark::ClobberMemory();
    }
}

void measure_converter(benchmark::State& state, int format) {
    const std::vector<std::uint8_t> source = noise(format);
    const std::unique_ptr<ColorConverter> converter(ColorConverter::GetNewColorConverter(
        kWidth, kHeight, format, ColorConverter::kIYUV, 16, 16));
    for (auto _ : state) {
        converter->Convert(source.data());
        benchmark::ClobberMemory();
    }
}

}  // namespace

int main(int argc, char** argv) {
    for (const Case& c : kCases) {
        for (const Kernels& kernels : zolt::kernel_tables()) {
            benchmark::RegisterBenchmark(
                (std::string(c.name) + "/" + kernels.name).c_str(),
                [&](benchmark::State& state) { measure_kernels(state, kernels, c); })
                ->Unit(benchmark::kMicrosecond);
        }
        benchmark::RegisterBenchmark(
            (std::string(c.name) + "/converter").c_str(),
            [&](benchmark::State& state) { measure_converter(state, c.format); })
            ->Unit(benchmark::kMicrosecond);
    }
    benchmark::RegisterBenchmark("IYUV/converter", [](benchmark::State& state) {
        measure_converter(state, ColorConverter::kIYUV);
    })->Unit(benchmark::kMicrosecond);
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
}
