#include "io/SyntheticSource.h"

#include <algorithm>

#include "io/ToolError.h"
#include "io/numbers.h"

namespace zolt {
namespace {

constexpr int kTextureSide = 256;
constexpr int kTextureMask = kTextureSide - 1;

// Grid step of each octave of the texture's noise; an octave weighs in proportion to its step.
constexpr int kOctaveSteps[] = {64, 32, 16, 8, 4};

// A fixed pseudo-random byte for a grid point (a 32-bit mixing function).
std::uint32_t hash_byte(int x, int y, int octave) {
    std::uint32_t h = static_cast<std::uint32_t>(x) * 0x9E3779B1u +
                      static_cast<std::uint32_t>(y) * 0x85EBCA77u +
                      static_cast<std::uint32_t>(octave) * 0xC2B2AE3Du;
    h ^= h >> 15;
    h *= 0x2C1B3C6Du;
    h ^= h >> 12;
    h *= 0x297A2D39u;
    h ^= h >> 15;
    return h & 0xFF;
}

// Noise between random grid points, interpolated linearly, of several grid steps on top of each
// other.
std::vector<unsigned char> make_texture() {
    std::vector<unsigned char> texture(kTextureSide * kTextureSide);
    for (int y = 0; y < kTextureSide; ++y) {
        for (int x = 0; x < kTextureSide; ++x) {
            int sum = 0;
            int weight = 0;
            for (const int step : kOctaveSteps) {
                const int points = kTextureSide / step;
                const auto corner = [&](int dx, int dy) {
                    return static_cast<int>(
                        hash_byte((x / step + dx) % points, (y / step + dy) % points, step));
                };
                const int fx = x % step;
                const int fy = y % step;
                const int above = corner(0, 0) * (step - fx) + corner(1, 0) * fx;
                const int below = corner(0, 1) * (step - fx) + corner(1, 1) * fx;
                sum += (above * (step - fy) + below * fy) / step;
                weight += step;
            }
            // The sum of octaves crowds around the middle: stretch it.
            texture[y * kTextureSide + x] =
                static_cast<unsigned char>(std::clamp((sum / weight - 128) * 7 / 4 + 128, 16, 235));
        }
    }
    return texture;
}

// Goes from 0 to `range` and back, one step a tick.
std::int64_t bounce(std::int64_t tick, std::int64_t range) {
    if (range < 1) {
        return 0;
    }
    const std::int64_t phase = tick % (2 * range);
    return phase < range ? phase : 2 * range - phase;
}

UsageError bad_spec(std::string_view input, const std::string& what) {
    return UsageError(std::string(input) + ": " + what +
                      "; write synthetic:WxH@FPS:FRAMES, for example synthetic:352x288@30:300");
}

}  // namespace

bool SyntheticSource::recognises(std::string_view input) {
    return input == kName || (input.substr(0, kName.size()) == kName && input[kName.size()] == ':');
}

SyntheticSource::Settings SyntheticSource::parse(std::string_view input) {
    Settings settings;
    if (input == kName) {
        return settings;
    }
    const std::string_view spec = input.substr(kName.size() + 1);
    const std::size_t at = std::min(spec.find('@'), spec.size());
    const std::string_view size = spec.substr(0, at);
    const std::size_t cross = size.find('x');
    const auto width = parse_number(size.substr(0, cross));
    const auto height =
        cross == std::string_view::npos ? std::nullopt : parse_number(size.substr(cross + 1));
    if (!width || !height) {
        throw bad_spec(input, "the size is not WIDTHxHEIGHT");
    }
    settings.width = *width;
    settings.height = *height;
    const std::string error = PictureFormat::size_error(*width, *height);
    if (!error.empty()) {
        throw UsageError(std::string(input) + ": " + error);
    }
    if (at == spec.size()) {
        return settings;
    }
    // The colon ends the rate, which is a decimal number or a fraction with '/'.
    const std::string_view timing = spec.substr(at + 1);
    const std::size_t colon = std::min(timing.find(':'), timing.size());
    const auto rate = FrameRate::parse(timing.substr(0, colon));
    if (!rate) {
        throw bad_spec(input, "the frame rate is not a positive number such as 25 or 30000/1001");
    }
    settings.frame_rate = *rate;
    if (colon < timing.size()) {
        const auto frames = parse_number(timing.substr(colon + 1));
        if (!frames || *frames == 0) {
            throw bad_spec(input, "the number of frames is not a whole number from 1");
        }
        settings.frames = *frames;
    }
    return settings;
}

SyntheticSource::SyntheticSource(const Settings& settings)
    : settings_(settings), texture_(make_texture()) {}

PictureFormat SyntheticSource::format() const {
    return {PictureFormat::kIyuv, settings_.width, settings_.height};
}

bool SyntheticSource::read(std::vector<unsigned char>& sample) {
    if (next_ == settings_.frames) {
        return false;
    }
    const Disc disc = disc_at(next_);
    const auto luma_size = static_cast<std::size_t>(settings_.width) * settings_.height;
    const auto chroma_size = static_cast<std::size_t>(settings_.width / 2) * (settings_.height / 2);
    draw_luma(sample.data(), disc);
    draw_chroma(sample.data() + luma_size, disc, 1);
    draw_chroma(sample.data() + luma_size + chroma_size, disc, -1);
    ++next_;
    return true;
}

SyntheticSource::Disc SyntheticSource::disc_at(std::int64_t frame) const {
    const std::int64_t radius = std::min(settings_.width, settings_.height) / 5;
    return {radius + bounce(3 * frame, settings_.width - 2 * radius),
            radius + bounce(2 * frame, settings_.height - 2 * radius), radius};
}

void SyntheticSource::draw_luma(unsigned char* plane, const Disc& disc) const {
    // The background's drift in quarter samples.
    const std::int64_t drift_x = 5 * next_;
    const std::int64_t drift_y = 2 * next_;
    const int fx = static_cast<int>(drift_x % 4);
    const int fy = static_cast<int>(drift_y % 4);
    const auto texel = [this](std::int64_t x, std::int64_t y) {
        return static_cast<int>(texture_[(y & kTextureMask) * kTextureSide + (x & kTextureMask)]);
    };
    for (std::int64_t y = 0; y < settings_.height; ++y) {
        const std::int64_t v = y + drift_y / 4;
        for (std::int64_t x = 0; x < settings_.width; ++x) {
            int value;
            if (disc.contains(x, y)) {
                // The texture turned by 90 degrees and brighter, moving with the disc.
                value = std::min(235, 64 + texel(2 * (y - disc.y), 2 * (x - disc.x)) * 3 / 4);
            } else {
                const std::int64_t u = x + drift_x / 4;
                const int above = texel(u, v) * (4 - fx) + texel(u + 1, v) * fx;
                const int below = texel(u, v + 1) * (4 - fx) + texel(u + 1, v + 1) * fx;
                value = (above * (4 - fy) + below * fy + 8) / 16;
            }
            *plane++ = static_cast<unsigned char>(value);
        }
    }
}

// `direction` 1 or -1: the way in which the background's colour runs and the disc differs from
// grey.
void SyntheticSource::draw_chroma(unsigned char* plane, const Disc& disc, int direction) const {
    for (std::int64_t y = 0; y < settings_.height / 2; ++y) {
        for (std::int64_t x = 0; x < settings_.width / 2; ++x) {
            const std::int64_t along = direction > 0 ? x : y;
            const std::int64_t value = disc.contains(2 * x, 2 * y)
                                           ? 128 + direction * 40
                                           : 96 + bounce(along + next_ / 2, 64);
            *plane++ = static_cast<unsigned char>(value);
        }
    }
}

}  // namespace zolt
