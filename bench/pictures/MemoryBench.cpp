#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <vector>

#include "Session.h"
#include "media/IParallelRunner.h"

// Peak memory of one session, by picture size and number of workers: what the formula of
// docs/performance.md says, and by how much the resident memory of a process grows that runs one.

namespace {

constexpr int kSizes[][2] = {{176, 144}, {352, 288}, {640, 352}, {1280, 720}, {1920, 1072}};
constexpr int kWorkers[] = {1, 8};
constexpr int kBitRateKbs = 2000;
constexpr int kPictures = 4;

// Workers without threads: what they hold is the same.
class InTurn : public IParallelRunner {
public:
    explicit InTurn(int workers) : m_workers(workers) {}

    int GetThreads() noexcept override { return m_workers; }
    void Run(IParallelTask* task, int workers) noexcept override {
        for (int worker = 0; worker < workers; ++worker) {
            task->Run(worker);
        }
    }

private:
    int m_workers;
};

// Bytes of an engine and of the converter's picture, for sides that are multiples of 16.
double formula(double width, double height, int workers) {
    const double planes = 6 * (width + 64) * (height + 64);
    const double maps = 159.0 / 256 * width * height + 4.5 * height;
    const double row_bits = 88 * width;
    const double nal_buffer = 1.54 * width * height + row_bits;
    const double coder = 128 * 128 + 3800;
    const double converter = 1.5 * width * height;
    return planes + maps + nal_buffer + converter + workers * coder +
           (workers > 1 ? workers * row_bits : 0);
}

long peak_kilobytes() {
    rusage usage;
    getrusage(RUSAGE_SELF, &usage);
    return usage.ru_maxrss;
}

// The picture is made without memory that is given back: a peak before hides what comes after.
void measure(int width, int height, int workers) {
    std::vector<std::uint8_t> picture(static_cast<std::size_t>(width * height * 3 / 2));
    std::minstd_rand random(1);
    for (std::uint8_t& sample : picture) {
        sample = static_cast<std::uint8_t>(100 + random() % 32);
    }
    InTurn runner(workers);
    const auto encode = [&](int w, int h) {
        zolt_bench::Session session(w, h, kBitRateKbs);
        session.lend(workers > 1 ? &runner : nullptr);
        for (int n = 0; n < kPictures; ++n) {
            session.encode(picture.data());
        }
    };
    encode(16, 16);  // so that code and tables are there
    const long before = peak_kilobytes();
    encode(width, height);
    const double measured = 1024.0 * static_cast<double>(peak_kilobytes() - before);
    std::printf("%4dx%-4d  workers %d  formula %6.2f MB  measured %6.2f MB\n", width, height,
                workers, formula(width, height, workers) / 1e6, measured / 1e6);
}

}  // namespace

// Each in a process of its own: a peak does not go down.
int main() {
    for (const auto& size : kSizes) {
        for (const int workers : kWorkers) {
            const pid_t child = fork();
            if (child == 0) {
                measure(size[0], size[1], workers);
                std::fflush(stdout);
                _exit(0);
            }
            int status = 0;
            if (child < 0 || waitpid(child, &status, 0) != child || status != 0) {
                std::fprintf(stderr, "bench_memory: cannot measure in another process\n");
                return EXIT_FAILURE;
            }
        }
    }
    return EXIT_SUCCESS;
}
