#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <stdexcept>
#include <string>
#include <vector>

#include "Film.h"
#include "Pool.h"
#include "TimedPicture.h"
#include "encoder/CEncoder.h"
#include "io/Y4mReader.h"

// The times of a stream's macroblocks and of what else its pictures are made of, as CSV: what
// simulate.py works with. TimedPicture.h says what the parts are.

namespace {

constexpr char kUsage[] =
    "usage: bench_wavefront INPUT [PICTURES [KBIT/S [REPETITIONS [WORKERS]]]]\n"
    "  INPUT        a Y4M file, or WxH for a film that is built in\n"
    "  PICTURES     to be coded, the first one as an IDR picture (30)\n"
    "  KBIT/S       bit rate at 30 pictures a second; 0: QP 28 (2000)\n"
    "  REPETITIONS  of every picture, of which median and least time are printed (9)\n"
    "  WORKERS      of the part `several` (2)\n";

struct Pictures {
    int width, height;
    std::vector<std::vector<std::uint8_t>> frames;
};

Pictures built_in(int width, int height, int count) {
    const zolt_bench::Film film(width, height);
    Pictures pictures{width, height, {}};
    for (int n = 0; n < count; ++n) {
        pictures.frames.emplace_back(film.picture(n), film.picture(n) + film.picture_size());
    }
    return pictures;
}

Pictures from_file(const std::string& name, int count) {
    zolt::Y4mReader reader{zolt::ByteReader(name)};
    const zolt::PictureFormat format = reader.format();
    Pictures pictures{format.width, format.height, {}};
    std::vector<std::uint8_t> frame(format.sample_bytes());
    for (int n = 0; n < count && reader.read(frame); ++n) {
        pictures.frames.push_back(frame);
    }
    return pictures;
}

Pictures open(const std::string& input, int count) {
    int width = 0, height = 0, used = 0;
    const bool is_size = std::sscanf(input.c_str(), "%dx%d%n", &width, &height, &used) == 2 &&
                         input.size() == static_cast<std::size_t>(used);
    return is_size ? built_in(width, height, count) : from_file(input, count);
}

void print(int picture, char type, std::vector<zolt_bench::Part> parts) {
    for (zolt_bench::Part& part : parts) {
        std::sort(part.nanoseconds.begin(), part.nanoseconds.end());
        std::printf("%d,%c,%s,%d,%d,%d,%.0f,%.0f\n", picture, type, part.name, part.row,
                    part.column, part.detail, part.nanoseconds[part.nanoseconds.size() / 2],
                    part.nanoseconds.front());
    }
}

int number(int argc, char** argv, int index, int otherwise, int least) {
    if (index >= argc) {
        return otherwise;
    }
    char* end = nullptr;
    const long value = std::strtol(argv[index], &end, 10);
    if (*end != '\0' || end == argv[index] || value < least || value > 1000000) {
        throw std::runtime_error(std::string(argv[index]) + ": not a number from " +
                                 std::to_string(least));
    }
    return static_cast<int>(value);
}

void measure(int argc, char** argv) {
    const Pictures pictures = open(argv[1], number(argc, argv, 2, 30, 1));
    const int kilobits = number(argc, argv, 3, 2000, 0);
    const int repetitions = number(argc, argv, 4, 9, 1);
    zolt_bench::Pool pool(number(argc, argv, 5, 2, 1));
    CEncoder engine(pictures.width, pictures.height);
    engine.set_bit_rate(1000 * kilobits);
    engine.set_qp(28);
    engine.set_frame_rate(30);
    engine.set_intra_period(static_cast<int>(pictures.frames.size()));
    engine.initialize_encoder();
    zolt_bench::TimedPicture timed(engine, pool);
    std::printf("picture,type,part,row,column,detail,median_ns,least_ns\n");
    for (std::size_t n = 0; n < pictures.frames.size(); ++n) {
        timed.code(pictures.frames[n].data(), repetitions);
        print(static_cast<int>(n), engine.g_pic_type == I_SLICE ? 'I' : 'P', timed.parts());
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2 || argc > 6) {
        std::fputs(kUsage, stderr);
        return 2;
    }
    try {
        measure(argc, argv);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "bench_wavefront: %s\n", error.what());
        return EXIT_FAILURE;
    }
    return EXIT_SUCCESS;
}
