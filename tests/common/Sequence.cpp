#include "common/Sequence.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <stdexcept>

namespace zolt_test {
namespace {

int hash(int x, int y, int seed) {
    std::uint32_t h = static_cast<std::uint32_t>(x) * 0x9e3779b1u ^
                      static_cast<std::uint32_t>(y) * 0x85ebca77u ^
                      static_cast<std::uint32_t>(seed) * 0xc2b2ae3du;
    h = (h ^ h >> 15) * 0x2c1b3c6du;
    h = (h ^ h >> 12) * 0x297a2d39u;
    return static_cast<int>((h ^ h >> 15) >> 24);
}

// Bilinear noise on a lattice of `cell` units.
int lattice(int x, int y, int cell, int seed) {
    const int i = x / cell, j = y / cell;
    const int fx = x % cell, fy = y % cell;
    const int top = hash(i, j, seed) * (cell - fx) + hash(i + 1, j, seed) * fx;
    const int bottom = hash(i, j + 1, seed) * (cell - fx) + hash(i + 1, j + 1, seed) * fx;
    return (top * (cell - fy) + bottom * fy) / (cell * cell);
}

// A texture of coarse and fine detail; x, y in sixteenths of a sample, above -65536.
int texture(int x, int y, int seed) {
    x += 1 << 16;
    y += 1 << 16;
    return (3 * lattice(x, y, 192, seed) + lattice(x, y, 40, seed + 1)) / 4;
}

// A sample of plane 0..2 of picture n at (x, y), in luma samples.
using Sampler = int (*)(int plane, int x, int y, int n);
struct Kind {
    const char* name;
    Sampler sample;
};
constexpr Kind kKinds[] = {
    {"gradient", [](int plane, int x, int y,
                    int n) { return std::abs(((2 * x + (plane + 1) * y + 5 * n) & 511) - 256); }},
    {"zoom",
     [](int plane, int x, int y, int n) {
         const int scale = 1024 / (64 + n);  // sixteenths of a texel per sample
         return texture((x - 30) * scale, (y - 20) * scale, plane);
     }},
    {"noise", [](int plane, int x, int y, int n) { return hash(x, y, 3 * n + plane); }},
    {"still", [](int plane, int x, int y, int) { return texture(16 * x, 16 * y, plane); }},
    {"cut", [](int plane, int x, int y,
               int n) { return texture(16 * x + 23 * n, 16 * y - 9 * n, 7 * (n / 5) + plane); }},
    {"flat", [](int plane, int, int, int n) { return 90 + 30 * plane + n / 4; }},
    {"fade",
     [](int plane, int x, int y, int n) {
         const int light = std::abs(12 - n % 24);  // of 12
         const int black = plane == 0 ? 16 : 128;
         return black + (texture(16 * x + 4 * n, 16 * y, plane) - black) * light / 12;
     }},
    {"pan", [](int plane, int x, int y,
               int n) { return texture(16 * (x + 40 * n), 16 * (y + 3 * n), plane); }},
    {"drop", [](int plane, int x, int y,
                int n) { return texture(16 * (x + 3 * n), 16 * (y + 40 * n), plane); }},
    {"checker",
     [](int plane, int x, int y, int n) {
         const bool fine = (y / 16 + n / 3) % 2 == 0;
         const int parity = fine ? x / (plane ? 2 : 1) + y / (plane ? 2 : 1) : x / 8 + y / 8;
         return (parity + n) % 2 * 255;
     }},
};

Sampler sampler(const std::string& kind) {
    for (const Kind& k : kKinds) {
        if (kind == k.name) {
            return k.sample;
        }
    }
    throw std::runtime_error("No such kind of sequence: " + kind);
}

}  // namespace

const std::vector<std::string>& generated_kinds() {
    static const std::vector<std::string> kinds = [] {
        std::vector<std::string> names;
        for (const Kind& k : kKinds) {
            names.push_back(k.name);
        }
        return names;
    }();
    return kinds;
}

Sequence generated(const std::string& kind, int width, int height, int pictures) {
    const Sampler sample = sampler(kind);
    const auto draw = [=](int n, std::uint8_t* out) {
        for (int plane = 0; plane < 3; ++plane) {
            const int scale = plane == 0 ? 1 : 2;
            for (int y = 0; y < height / scale; ++y) {
                for (int x = 0; x < width / scale; ++x) {
                    const int value = sample(plane, scale * x, scale * y, n);
                    *out++ = static_cast<std::uint8_t>(std::clamp(value, 0, 255));
                }
            }
        }
    };
    return {kind + "_" + std::to_string(width) + "x" + std::to_string(height), width, height,
            pictures, draw};
}

const std::vector<Clip>& clips() {
    static const std::vector<Clip> list = {
        {"carphone", "carphone_176x144.mkv", 176, 144, 120},
        {"football", "football_352x288.mkv", 352, 288, 200},
        {"sintel", "sintel_854x480.mkv", 854, 480, 120},
        {"street", "street_1280x720.mkv", 1280, 720, 40},
    };
    return list;
}

Sequence load_clip(const std::string& folder, const Clip& clip, int first, int count) {
    Sequence sequence{clip.name, clip.width, clip.height, count, nullptr};
    const std::size_t picture_size = sequence.picture_size();
    const auto pixels =
        std::make_shared<std::vector<std::uint8_t>>(picture_size * static_cast<std::size_t>(count));
    const std::string command = "ffmpeg -v error -nostdin -i '" + folder + "/" + clip.file +
                                "' -vf trim=start_frame=" + std::to_string(first) +
                                ":end_frame=" + std::to_string(first + count) +
                                " -fps_mode passthrough -f rawvideo -pix_fmt yuv420p pipe:1";
    std::FILE* pipe = popen(command.c_str(), "r");
    if (!pipe) {
        throw std::runtime_error("Cannot run ffmpeg");
    }
    const std::size_t size = std::fread(pixels->data(), 1, pixels->size(), pipe);
    if (pclose(pipe) != 0 || size != pixels->size()) {
        throw std::runtime_error(std::string("Cannot decode the clip ") + clip.file);
    }
    sequence.draw = [pixels, picture_size](int n, std::uint8_t* picture) {
        const auto start = pixels->begin() + static_cast<std::ptrdiff_t>(picture_size) * n;
        std::copy(start, start + static_cast<std::ptrdiff_t>(picture_size), picture);
    };
    return sequence;
}

}  // namespace zolt_test
