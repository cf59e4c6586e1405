#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <random>
#include <vector>

#include "avc/VideoAvcParser.h"

// How fast the parser splits 100 MB, by the size of the units and of the pieces that it is fed.

namespace {

constexpr std::size_t kStreamBytes = 100000000;

// Units of the given size with parameter sets in front. The payload is what coded slices look like:
// evenly spread bytes without start codes.
std::vector<unsigned char> make_stream(std::size_t unit_bytes) {
    std::vector<unsigned char> stream = {0,    0,    0, 1, 0x67, 0x4d, 0x40, 0x16, 0xf4, 0x0b,
                                         0x04, 0xb2, 0, 0, 0,    1,    0x68, 0xce, 0x38, 0x80};
    std::minstd_rand random(1);
    stream.reserve(kStreamBytes + unit_bytes);
    while (stream.size() < kStreamBytes) {
        const std::size_t start = stream.size();
        stream.insert(stream.end(), {0, 0, 1, 0x41, 0x9a});
        while (stream.size() < start + unit_bytes) {
            const auto byte = static_cast<unsigned char>(random() >> 8);
            stream.push_back(byte <= 3 && stream.back() == 0 ? 0x80 : byte);
        }
    }
    stream.resize(kStreamBytes);
    return stream;
}

void split(benchmark::State& state) {
    const std::vector<unsigned char> stream = make_stream(static_cast<std::size_t>(state.range(0)));
    const auto piece = static_cast<std::size_t>(state.range(1));
    for (auto _ : state) {
        VideoAvcParser parser(nullptr, 30);
        for (std::size_t pos = 0; pos < stream.size(); pos += piece) {
            const std::size_t length = std::min(piece, stream.size() - pos);
            parser.PutNextAvcData(stream.data() + pos, static_cast<int>(length));
        }
        benchmark::DoNotOptimize(parser.GetFirstSampleOffset());
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                            static_cast<std::int64_t>(stream.size()));
}

BENCHMARK(split)
    ->ArgNames({"unit", "piece"})
    ->Args({2000, 4096})
    ->Args({50, 4096})
    ->Args({5000000, 4096})
    ->Args({2000, 188})
    ->Args({2000, 1})
    ->Args({2000, 10000000})
    ->Unit(benchmark::kMillisecond);

}  // namespace
