#include <sys/resource.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <exception>
#include <map>
#include <mutex>
#include <stdexcept>
#include <string>
#include <vector>

#include "Pipeline.h"

// A live source through one encoder after the other: what is dropped, what processor time coding
// takes and how long a picture stays in the encoder.

namespace {

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;

struct Options {
    double seconds = 60;
    int width = 1280;
    int height = 720;
    int fps = 30;
    int kbs = 2000;
    std::string source = "videotestsrc is-live=true pattern=smpte";
    std::vector<std::string> encoders;  // as for gst-launch-1.0
};

/** What a pipeline did in the time between its first picture and its last. */
struct Measured {
    int pictures_in = 0;
    int pictures_out = 0;
    double seconds = 0;
    double cpu_seconds = 0;  // user and system, of all threads
    double bytes = 0;
    std::vector<double> latencies;  // from the encoder's input to its output, seconds
};

double cpu_seconds() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    const auto seconds = [](const timeval& time) { return time.tv_sec + time.tv_usec * 1e-6; };
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

/** The pictures that go into an element "enc" and come out of it, told apart by their times. */
class Stopwatch {
public:
    explicit Stopwatch(Pipeline& pipeline) {
        pipeline.watch("camera", "sink", GST_PAD_PROBE_TYPE_BUFFER, [this](GstPadProbeInfo*) {
            const std::lock_guard<std::mutex> lock(mutex_);
            if (measured_.pictures_in++ == 0) {
                start_ = Clock::now();
                cpu_start_ = cpu_seconds();
            }
            return GST_PAD_PROBE_OK;
        });
        pipeline.watch("enc", "sink", GST_PAD_PROBE_TYPE_BUFFER, [this](GstPadProbeInfo* info) {
            const std::lock_guard<std::mutex> lock(mutex_);
            entered_[GST_BUFFER_PTS(GST_PAD_PROBE_INFO_BUFFER(info))] = Clock::now();
            return GST_PAD_PROBE_OK;
        });
        pipeline.watch("enc", "src", GST_PAD_PROBE_TYPE_BUFFER, [this](GstPadProbeInfo* info) {
            leave(GST_PAD_PROBE_INFO_BUFFER(info));
            return GST_PAD_PROBE_OK;
        });
    }

    /** After the end of the stream. */
    Measured measured() {
        const std::lock_guard<std::mutex> lock(mutex_);
        return measured_;
    }

private:
    void leave(GstBuffer* coded) {
        const Clock::time_point now = Clock::now();
        const std::lock_guard<std::mutex> lock(mutex_);
        if (measured_.pictures_out++ == 0 && !entered_.empty()) {
            // Some encoders move all times, to leave room for reordering.
            shift_ = GST_BUFFER_PTS(coded) - entered_.begin()->first;
        }
        const auto entered = entered_.find(GST_BUFFER_PTS(coded) - shift_);
        if (entered != entered_.end()) {
            measured_.latencies.push_back(Seconds(now - entered->second).count());
            entered_.erase(entered);
        }
        measured_.bytes += static_cast<double>(gst_buffer_get_size(coded));
        measured_.seconds = Seconds(now - start_).count();
        measured_.cpu_seconds = cpu_seconds() - cpu_start_;
    }

    std::mutex mutex_;
    Clock::time_point start_;
    double cpu_start_ = 0;
    GstClockTime shift_ = 0;
    std::map<GstClockTime, Clock::time_point> entered_;
    Measured measured_;
};

Measured measure(const Options& options, const std::string& encoder) {
    // Like a camera, the source does not wait: what the encoder is too slow for is lost in the
    // queue.
    Pipeline pipeline(
        options.source + " ! video/x-raw,format=I420,width=" + std::to_string(options.width) +
        ",height=" + std::to_string(options.height) + ",framerate=" + std::to_string(options.fps) +
        "/1 ! queue name=camera leaky=downstream max-size-buffers=2 "
        "max-size-bytes=0 max-size-time=0 ! " +
        encoder + " name=enc ! fakesink sync=false");
    Stopwatch stopwatch(pipeline);
    pipeline.play();
    if (!pipeline.wait(Seconds(options.seconds))) {
        gst_element_send_event(GST_ELEMENT(pipeline.bin()), gst_event_new_eos());
        pipeline.wait(Seconds(10));
    }
    pipeline.stop();
    const Measured measured = stopwatch.measured();
    if (measured.pictures_out == 0) {
        throw std::runtime_error("no picture came out of " + encoder);
    }
    return measured;
}

double percentile(std::vector<double>& values, double share) {
    if (values.empty()) {
        return NAN;
    }
    const auto index =
        static_cast<std::size_t>(share * static_cast<double>(values.size() - 1) + 0.5);
    std::sort(values.begin(), values.end());
    return values[index];
}

/** Shares are those of one processor. */
double share(const Measured& measured) {
    return measured.cpu_seconds / measured.seconds;
}

void print(const std::string& name, Measured measured, double share_without) {
    constexpr double kPercent = 100;
    constexpr double kMs = 1000;
    std::printf(
        "%8d %8d %8.1f %10.2f %10.2f %10.0f  %s\n", measured.pictures_in,
        measured.pictures_in - measured.pictures_out, kPercent * (share(measured) - share_without),
        kMs * percentile(measured.latencies, 0.5), kMs * percentile(measured.latencies, 0.99),
        measured.bytes * 8 / 1000 / measured.seconds, name.c_str());
    std::fflush(stdout);
}

void run(const Options& options) {
    std::printf("%s, %dx%d, %d frames/s, %g s each\n\n", options.source.c_str(), options.width,
                options.height, options.fps, options.seconds);
    std::printf("%8s %8s %8s %10s %10s %10s\n", "pictures", "dropped", "CPU %", "median ms",
                "99 % ms", "kbit/s");
    const double share_without = share(measure(options, "identity"));
    for (const std::string& encoder : options.encoders) {
        print(encoder, measure(options, encoder), share_without);
    }
    std::printf("\nWithout an encoder the pipeline takes %.1f %%.\n", 100 * share_without);
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    CLI::App app(
        "Puts a live source through encoders, one after the other. CPU is the share of one "
        "processor "
        "that the encoder takes: that of the pipeline less that of one without it.",
        "bench_gst_live");
    app.add_option("-s,--seconds", options.seconds, "Length of each run")
        ->check(CLI::Range(0.5, 86400.0))
        ->capture_default_str();
    app.add_option("--width", options.width)->capture_default_str();
    app.add_option("--height", options.height)->capture_default_str();
    app.add_option("--fps", options.fps, "Frames/s")->capture_default_str();
    app.add_option("-b,--bitrate", options.kbs, "Of the default encoders, kbit/s")
        ->capture_default_str();
    app.add_option("--source", options.source, "As for gst-launch-1.0; it keeps time itself")
        ->capture_default_str();
    app.add_option("ENCODER", options.encoders, "As for gst-launch-1.0 (default: three encoders)");
    CLI11_PARSE(app, argc, argv);
    if (options.encoders.empty()) {
        const std::string kbs = std::to_string(options.kbs);
        options.encoders = {
            "zolth264enc key-int-max=30 bitrate=" + kbs,
            "x264enc tune=zerolatency speed-preset=ultrafast key-int-max=30 bitrate=" + kbs,
            "openh264enc gop-size=30 rate-control=bitrate bitrate=" + kbs + "000"};
    }
    g_setenv("GST_PLUGIN_PATH", ZOLT_ELEMENT_FOLDER, FALSE);
    gst_init(nullptr, nullptr);
    try {
        run(options);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "bench_gst_live: %s\n", error.what());
        return 1;
    }
    return 0;
}
