#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <climits>
#include <cstddef>
#include <ctime>
#include <string>
#include <thread>
#include <vector>

#include "Film.h"
#include "Session.h"
#include "encoder/CEncoder.h"
#include "io/ThreadRunner.h"

// What a picture costs: by type, size and kernel table at a constant QP; in a session with rate
// control; and in two sessions on two threads.

namespace {

using zolt_bench::Film;
using zolt_bench::Session;
using Clock = std::chrono::steady_clock;

constexpr int kQp = 28;
constexpr int kSizes[][2] = {{176, 144}, {352, 288}, {640, 352}, {1280, 720}, {1920, 1072}};

double seconds_since(Clock::time_point start) {
    return std::chrono::duration<double>(Clock::now() - start).count();
}

double median(std::vector<double> values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

void picture(benchmark::State& state, const zolt::Kernels& kernels, int width, int height,
             SliceType type) {
    const Film film(width, height);
    CEncoder engine(width, height, &kernels);
    engine.set_bit_rate(0);
    engine.set_qp(kQp);
    engine.set_intra_period(type == I_SLICE ? 1 : INT_MAX);
    engine.initialize_encoder();
    int n = 0;
    const auto encode = [&] {
        engine.encode_frame(film.picture(n++));
        benchmark::DoNotOptimize(engine.get_nal_size());
        engine.reset_nal_buffer();
    };
    encode();  // the I picture in front of P pictures
    for (auto _ : state) {
        encode();
    }
    state.counters["per_mb"] = benchmark::Counter(
        width / 16 * (height / 16),
        benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// Time between a picture's arrival and its NAL unit's departure.
void latency(benchmark::State& state) {
    constexpr int kWidth = 1280, kHeight = 720;
    const Film film(kWidth, kHeight);
    Session session(kWidth, kHeight, static_cast<int>(state.range(0)));
    std::vector<double> times;
    int n = 0;
    for (auto _ : state) {
        const Clock::time_point start = Clock::now();
        session.encode(film.picture(n++));
        times.push_back(1000 * seconds_since(start));
    }
    std::sort(times.begin(), times.end());
    state.counters["median_ms"] = times[times.size() / 2];
    state.counters["p99_ms"] = times[times.size() * 99 / 100];
}

// Pictures a second of two sessions on two threads over those of one session, which needs two idle
// processors; and the processor time of a picture beside another session over its time alone, which
// does not. Medians of the iterations.
void two_sessions(benchmark::State& state) {
    constexpr int kWidth = 1280, kHeight = 720, kBitRateKbs = 2000, kPictures = 30;
    const Film film(kWidth, kHeight);
    Session first(kWidth, kHeight, kBitRateKbs);
    Session second(kWidth, kHeight, kBitRateKbs);
    const auto run = [&film](Session& session) {
        for (int n = 0; n < kPictures; ++n) {
            session.encode(film.picture(n));
        }
    };
    run(first);
    run(second);
    std::vector<double> speedups, costs;
    for (auto _ : state) {
        const Clock::time_point start = Clock::now();
        const std::clock_t processor_start = std::clock();
        run(first);
        const double one = seconds_since(start);
        const Clock::time_point middle = Clock::now();
        const std::clock_t processor_middle = std::clock();
        std::thread other([&] { run(second); });
        run(first);
        other.join();
        speedups.push_back(2 * one / seconds_since(middle));
        costs.push_back(static_cast<double>(std::clock() - processor_middle) / 2 /
                        static_cast<double>(processor_middle - processor_start));
    }
    state.counters["speedup"] = median(speedups);
    state.counters["cost"] = median(costs);
}

// Pictures a second of a session with two threads over those of the same session with its caller's
// alone, which needs two idle processors: a run of each in turn. Median of the iterations.
void two_threads(benchmark::State& state) {
    const int width = static_cast<int>(state.range(0));
    const int height = static_cast<int>(state.range(1));
    const int pictures = static_cast<int>(30 * 1280 * 720 / (state.range(0) * state.range(1)));
    const Film film(width, height);
    zolt::ThreadRunner runner(2);
    Session session(width, height, static_cast<int>(state.range(2)));
    const auto run = [&](zolt::ThreadRunner* lent) {
        session.lend(lent);
        const Clock::time_point start = Clock::now();
        for (int n = 0; n < pictures; ++n) {
            session.encode(film.picture(n));
        }
        return seconds_since(start);
    };
    run(&runner);
    std::vector<double> speedups;
    for (auto _ : state) {
        const double one = run(nullptr);
        speedups.push_back(one / run(&runner));
    }
    state.counters["speedup"] = median(speedups);
}

const bool registered = [] {
    for (const SliceType type : {I_SLICE, P_SLICE}) {
        for (const auto& size : kSizes) {
            for (const zolt::Kernels& kernels : zolt::kernel_tables()) {
                const std::string name = std::string(type == I_SLICE ? "I/" : "P/") +
                                         std::to_string(size[0]) + "x" + std::to_string(size[1]) +
                                         "/" + kernels.name;
                benchmark::RegisterBenchmark(name.c_str(), [=, &kernels](benchmark::State& state) {
                    picture(state, kernels, size[0], size[1], type);
                })->Unit(benchmark::kMillisecond);
            }
        }
    }
    return true;
}();

BENCHMARK(latency)->ArgName("kbit/s")->Arg(2000)->Unit(benchmark::kMillisecond)->Iterations(300);
BENCHMARK(two_threads)
    ->ArgNames({"width", "height", "kbit/s"})
    ->Args({352, 288, 800})
    ->Args({1280, 720, 2000})
    ->Args({1920, 1072, 4000})
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime()
    ->Iterations(15);
BENCHMARK(two_sessions)->Unit(benchmark::kMillisecond)->UseRealTime()->Iterations(9);

}  // namespace
