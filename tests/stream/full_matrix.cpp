// Codes every clip and every generated sequence at every key-frame interval, QP and bit rate that
// matters and has each stream decoded; longer than a test may be. A line for each stream, a summary
// at the end, status 1 when a stream is not what it should be.

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "common/Encoding.h"
#include "common/Random.h"
#include "common/Workers.h"

namespace {

using zolt_test::Sequence;
using zolt_test::Settings;
using Bytes = std::vector<std::uint8_t>;

const char kUsage[] =
    "usage: full_matrix [--jobs N] [--threads N] [--clips FOLDER] [--only NAME] |\n"
    "                   --long-run [PICTURES]\n"
    "  --jobs N         streams at a time (1)\n"
    "  --threads N      each picture is coded by a random number of workers, 1..N, and the stream\n"
    "                   compared with that of one (1)\n"
    "  --clips FOLDER   the lossless clips (environment variable ZOLT_TEST_CLIPS)\n"
    "  --only NAME      sequences whose name begins with NAME\n"
    "  --long-run       one session of 64x64 pictures (100000) at key-frame interval 70000\n";

struct Options {
    int jobs = 1;
    int threads = 1;
    std::string clips;
    std::string only;
    int long_run = 0;
};

bool parse(int argc, char** argv, Options& options) {
    if (const char* folder = std::getenv("ZOLT_TEST_CLIPS")) {
        options.clips = folder;
    }
    for (int i = 1; i < argc; ++i) {
        const std::string option = argv[i];
        const bool has_value = i + 1 < argc;
        if (option == "--jobs" && has_value) {
            options.jobs = std::atoi(argv[++i]);
        } else if (option == "--threads" && has_value) {
            options.threads = std::atoi(argv[++i]);
        } else if (option == "--clips" && has_value) {
            options.clips = argv[++i];
        } else if (option == "--only" && has_value) {
            options.only = argv[++i];
        } else if (option == "--long-run") {
            options.long_run = has_value ? std::atoi(argv[++i]) : 100000;
        } else {
            return false;
        }
    }
    return options.jobs > 0 && options.threads > 0 && options.long_run >= 0;
}

// What a stream is like.
struct Figures {
    double bits = 0;
    double squared_error = 0;
    long samples = 0;
    long skipped = 0, inter = 0, intra = 0;
    int lowest_qp = 51, highest_qp = 0;

    void add(const CEncoder& e, const Bytes& source, const Bytes& nal, const Bytes& coded) {
        bits += 8.0 * static_cast<double>(nal.size());
        for (int y = 0; y < e.picture.g_height16; ++y) {
            for (int x = 0; x < e.picture.g_width16; ++x) {
                const int difference = source[static_cast<std::size_t>(y * e.picture.g_width + x)] -
                                       coded[static_cast<std::size_t>(y * e.picture.g_width16 + x)];
                squared_error += difference * difference;
            }
        }
        samples += e.picture.g_width16 * e.picture.g_height16;
        for (int mb = 0; mb < e.picture.g_num_mbs; ++mb) {
            ++(e.picture.g_mb_mode[mb] == MB_SKIP     ? skipped
               : e.picture.g_mb_mode[mb] == MB_P16x16 ? inter
                                                      : intra);
        }
        lowest_qp = std::min<int>(lowest_qp, e.picture.g_mb_qp[0]);
        highest_qp = std::max<int>(highest_qp, e.picture.g_mb_qp[0]);
    }

    std::string text(double seconds) const {
        const double mbs = static_cast<double>(skipped + inter + intra) / 100;
        const double mse = squared_error / static_cast<double>(samples);
        char line[200];
        std::snprintf(line, sizeof line,
                      "%8.1f kbit/s  PSNR-Y %6.2f  skipped %5.1f%% inter %5.1f%% intra %5.1f%%  QP "
                      "%d..%d",
                      bits / seconds / 1000, mse > 0 ? 10 * std::log10(255 * 255 / mse) : 99.99,
                      static_cast<double>(skipped) / mbs, static_cast<double>(inter) / mbs,
                      static_cast<double>(intra) / mbs, lowest_qp, highest_qp);
        return line;
    }
};

// Checks one stream and says how it went; returns whether it is well. threads: the most workers.
bool run(const Sequence& sequence, const Settings& settings, int threads, std::mutex& output) {
    Figures figures;
    zolt_test::Hooks hooks;
    zolt_test::Workers workers(1, zolt_test::Order::kDelayed);
    zolt_test::Random random(std::hash<std::string>()(sequence.name + settings.name()));
    zolt_test::Encoding alone(sequence.width, sequence.height, settings);
    int first_difference = -1;
    if (threads > 1) {
        hooks.before = [&](CEncoder& engine, int) {
            workers.set_count(random.between(1, threads));
            engine.set_worker_pool(&workers);
        };
    }
    hooks.after = [&](CEncoder& engine, int n, const Bytes& source, const Bytes& nal,
                      const Bytes& coded) {
        figures.add(engine, source, nal, coded);
        if (threads > 1 && alone.encode(source.data()) != nal && first_difference < 0) {
            first_difference = n;
        }
    };
    std::string problem;
    try {
        problem = zolt_test::check_stream(sequence, settings, hooks);
    } catch (const std::exception& error) {
        problem = error.what();
    }
    if (first_difference >= 0) {
        problem += " picture " + std::to_string(first_difference) + " differs from one worker's";
    }
    const std::string result =
        problem.empty() ? figures.text(sequence.pictures / settings.frame_rate) : problem;
    const std::lock_guard<std::mutex> lock(output);
    std::printf("%s %-18s %-14s %s\n", problem.empty() ? "ok  " : "FAIL", sequence.name.c_str(),
                settings.name().c_str(), result.c_str());
    std::fflush(stdout);
    return problem.empty();
}

std::vector<Settings> all_settings() {
    std::vector<Settings> list;
    for (const int period : {1, 2, 7, 30, 300}) {
        for (const int qp : {0, 6, 10, 18, 28, 40, 51}) {
            list.push_back({qp, 0, period});
        }
        for (const int kilobits : {64, 200, 800, 2000, 4000}) {
            list.push_back({28, 1000 * kilobits, period});
        }
    }
    return list;
}

// The sequences, made when they are needed.
std::vector<std::pair<std::string, std::function<Sequence()>>> all_sequences(
    const Options& options) {
    std::vector<std::pair<std::string, std::function<Sequence()>>> list;
    for (const std::string& kind : zolt_test::generated_kinds()) {
        for (const auto& [width, height] :
             {std::pair{16, 16}, {16, 144}, {176, 16}, {48, 80}, {178, 146}, {352, 288}}) {
            const auto make = [kind, w = width, h = height] {
                return zolt_test::generated(kind, w, h, 35);
            };
            list.emplace_back(make().name, make);
        }
    }
    if (options.clips.empty()) {
        std::printf("No folder of clips: generated sequences only\n");
        return list;
    }
    for (const zolt_test::Clip& clip : zolt_test::clips()) {
        list.emplace_back(clip.name, [&clip, folder = options.clips] {
            return zolt_test::load_clip(folder, clip, 0, clip.pictures);
        });
    }
    return list;
}

// Pictures of 64x64 that never come to rest.
Sequence restless(int pictures) {
    const Sequence slow = zolt_test::generated("gradient", 64, 64, pictures);
    const Sequence fast = zolt_test::generated("pan", 64, 64, pictures);
    const Sequence dark = zolt_test::generated("fade", 64, 64, pictures);
    return {"long_run_64x64", 64, 64, pictures, [=](int n, std::uint8_t* picture) {
                (n % 90 < 60 ? slow : n % 90 < 65 ? fast : dark).draw(n, picture);
            }};
}

// Runs the matrix; returns the number of streams that failed.
int run_matrix(const Options& options) {
    const std::vector<Settings> settings = all_settings();
    std::mutex output;
    std::atomic<int> streams{0}, failures{0};
    for (const auto& [name, make] : all_sequences(options)) {
        if (name.compare(0, options.only.size(), options.only) != 0) {
            continue;
        }
        const Sequence sequence = make();
        std::atomic<std::size_t> next{0};
        std::vector<std::thread> jobs;
        for (int job = 0; job < options.jobs; ++job) {
            jobs.emplace_back([&] {
                for (std::size_t i = next++; i < settings.size(); i = next++) {
                    ++streams;
                    failures += run(sequence, settings[i], options.threads, output) ? 0 : 1;
                }
            });
        }
        for (std::thread& job : jobs) {
            job.join();
        }
    }
    std::printf("%d streams, %d failed\n", streams.load(), failures.load());
    return streams > 0 ? failures.load() : 1;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        Options options;
        if (!parse(argc, argv, options)) {
            std::fputs(kUsage, stderr);
            return 2;
        }
        if (options.long_run > 0) {
            std::mutex output;
            return run(restless(options.long_run), {28, 200000, 70000}, options.threads, output)
                       ? 0
                       : 1;
        }
        return run_matrix(options) == 0 ? 0 : 1;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "full_matrix: %s\n", error.what());
        return 2;
    }
}
