// The motion search against a plain model of it. The model works on its own copies of the pictures,
// one macroblock after the other, with nothing of the engine's but the vectors that it coded around
// a macroblock, from which the prediction follows (clause 8.4.1.3). Every search of every P picture
// has to end at the same record after the integer and after the quarter-pel stage.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <ostream>
#include <set>
#include <sstream>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "common/Encoding.h"
#include "common/Random.h"
#include "common/Sequence.h"
#include "encoder/CEncoder.h"
#include "kernels/Kernels.h"

namespace {

using zolt_test::Encoding;
using zolt_test::Random;
using zolt_test::Sequence;
using zolt_test::Settings;

// ---- The model ----

constexpr int kBorder = 32;           // samples around a plane
constexpr int kRange = 16;            // reach of the search, pels
constexpr unsigned kNone = 0xffffff;  // cost without a candidate
constexpr unsigned kGoodEnough = 512;

constexpr unsigned kLambda[40] = {1,  1,  1,  1,  2,  2,  2,  2,  3,  3,  3,  4,  4,  4,
                                  5,  6,  6,  7,  8,  9,  10, 11, 13, 14, 16, 18, 20, 23,
                                  25, 29, 32, 36, 40, 45, 51, 57, 64, 72, 81, 91};

struct Vector {
    int x = 0, y = 0;
};

std::ostream& operator<<(std::ostream& out, Vector v) {
    return out << "(" << v.x << ", " << v.y << ")";
}

struct Record {
    int x = 0, y = 0, dx = 0, dy = 0;
    unsigned sad = 0, cost = 0;

    bool operator==(const Record& o) const {
        return std::tie(x, y, dx, dy, sad, cost) == std::tie(o.x, o.y, o.dx, o.dy, o.sad, o.cost);
    }
};

std::ostream& operator<<(std::ostream& out, const Record& r) {
    return out << Vector{r.x, r.y} << " + " << Vector{r.dx, r.dy} << "/4 sad " << r.sad << " cost "
               << r.cost;
}

// Results of the two stages of a search.
struct Found {
    Record integer, refined;

    bool operator==(const Found& o) const { return integer == o.integer && refined == o.refined; }
};

std::ostream& operator<<(std::ostream& out, const Found& f) {
    return out << f.integer << ", then " << f.refined;
}

// A plane with its border.
class Plane {
public:
    Plane(int width, int height, const std::function<int(int x, int y)>& sample)
        : stride(width + 2 * kBorder) {
        for (int y = -kBorder; y < height + kBorder; ++y) {
            for (int x = -kBorder; x < width + kBorder; ++x) {
                samples_.push_back(static_cast<std::uint8_t>(sample(x, y)));
            }
        }
    }

    const std::uint8_t* at(int x, int y) const {
        return &samples_.at(static_cast<std::size_t>((y + kBorder) * stride + x + kBorder));
    }

    const int stride;

private:
    std::vector<std::uint8_t> samples_;
};

int half_sample(int e, int f, int g, int h, int i, int j) {
    return std::clamp((e - 5 * f + 20 * g + 20 * h - 5 * i + j + 16) >> 5, 0, 255);
}

// Exp-Golomb length of the absolute difference d in quarter pels, as a signed element's.
unsigned component_rate(int d) {
    const int k = std::min(2 * std::abs(d), 511);
    unsigned length = 1;
    for (int n = k + 1; n > 1; n /= 2) {
        length += 2;
    }
    return length;
}

template <class T>
T median(T a, T b, T c) {
    return std::max(std::min(a, b), std::min(std::max(a, b), c));
}

// The searches of one picture, in macroblock order.
class SearchModel {
public:
    // source, reference: luma of width x height samples, whole macroblocks; source rows are
    // source_stride samples long.
    SearchModel(int width, int height, const std::uint8_t* source, int source_stride,
                const std::uint8_t* reference)
        : width_(width),
          height_(height),
          current_(width, height, extended(source, source_stride)),
          whole_(width, height, extended(reference, width)),
          below_(width, height, [&](int x, int y) { return below(reference, x, y); }),
          right_(width, height,
                 [&](int x, int y) {
                     const auto p = [&](int i) { return sample(reference, width_, x + i, y); };
                     return half_sample(p(-2), p(-1), p(0), p(1), p(2), p(3));
                 }),
          centre_(width, height,
                  [&](int x, int y) {
                      // From samples that are already rounded and clipped.
                      const auto p = [&](int i) { return below(reference, x + i, y); };
                      return half_sample(p(-2), p(-1), p(0), p(1), p(2), p(3));
                  }),
          records_(static_cast<std::size_t>(width / 16 * (height / 16))) {}

    // Searches a macroblock, whose predicted vector is `predicted` quarter pels, and keeps the
    // integer result for its neighbours.
    Found search(int mb_x, int mb_y, Vector predicted, unsigned lambda) {
        px_ = 16 * mb_x;
        py_ = 16 * mb_y;
        predicted_ = predicted;
        lambda_ = lambda;
        best_ = Record{0, 0, 0, 0, 0, kNone};
        std::fill_n(threshold_, 3, kNone);
        visited_.clear();

        integer_search();
        const Record integer = best_;
        keep(mb_y * (width_ / 16) + mb_x, integer);
        refine({{0, 2}, {0, -2}, {2, 0}, {-2, 0}, {2, 2}, {-2, 2}, {2, -2}, {-2, -2}}, false);
        refine({{1, 0}, {0, 1}, {-1, 0}, {0, -1}, {1, 1}, {-1, 1}, {1, -1}, {-1, -1}}, true);
        return {integer, best_};
    }

    // The integer result of a macroblock.
    void keep(int mb, const Record& integer) { records_[static_cast<std::size_t>(mb)] = integer; }

private:
    int sample(const std::uint8_t* p, int stride, int x, int y) const {
        return p[std::clamp(y, 0, height_ - 1) * stride + std::clamp(x, 0, width_ - 1)];
    }
    std::function<int(int, int)> extended(const std::uint8_t* p, int stride) const {
        return [=](int x, int y) { return sample(p, stride, x, y); };
    }
    int below(const std::uint8_t* p, int x, int y) const {
        const auto s = [&](int i) { return sample(p, width_, x, y + i); };
        return half_sample(s(-2), s(-1), s(0), s(1), s(2), s(3));
    }

    // Cost of predicting the macroblock by the averages of the samples at a and b, or kNone once a
    // part of it shows that it is no good. The samples are added up in four parts of 64; a new best
    // sets the thresholds that later candidates' parts are held against.
    unsigned measure(const std::uint8_t* a, const std::uint8_t* b, unsigned rate, bool quarter) {
        constexpr int kParts[4][2] = {{0, 0}, {1, 1}, {1, 0}, {0, 1}};  // first row and column
        const unsigned shares[3] = {(rate + 2) >> 2, (rate + 1) >> 1, (3 * rate) >> 2};
        const std::uint8_t* block = current_.at(px_, py_);
        unsigned partial[3];
        std::uint16_t sum = 0;
        for (int part = 0; part < 4; ++part) {
            for (int y = kParts[part][0]; y < 16; y += 2) {
                for (int x = kParts[part][1]; x < 16; x += 2) {
                    const int at = y * current_.stride + x;
                    sum = static_cast<std::uint16_t>(
                        sum + std::abs(block[at] - ((a[at] + b[at] + 1) >> 1)));
                }
            }
            if (part < 3) {
                partial[part] = sum + shares[part];
                if (threshold_[part] <= partial[part]) {
                    return kNone;
                }
            }
        }
        if (sum + rate < best_.cost) {
            threshold_[0] = quarter ? (5 * partial[0]) >> 2 : 2 * partial[0];
            threshold_[1] = partial[1];
            threshold_[2] = partial[2];
            best_.sad = sum;
        }
        return sum + rate;
    }

    // Rate of a vector in quarter pels.
    unsigned rate(int x, int y) const {
        return (component_rate(x - predicted_.x) + component_rate(y - predicted_.y)) * lambda_;
    }

    // Tries a vector once. True: it is so good that the search ends.
    bool try_integer(int x, int y) {
        if (!visited_.insert({x, y}).second) {
            return false;
        }
        const std::uint8_t* p = whole_.at(px_ + x, py_ + y);
        const unsigned cost = measure(p, p, rate(4 * x, 4 * y), false);
        if (cost >= best_.cost) {
            return false;
        }
        best_.x = x;
        best_.y = y;
        best_.cost = cost;
        return best_.sad < kGoodEnough;
    }

    // Integer result of another macroblock of the picture; zeros where there is none.
    Record neighbour(bool available, int mb_x, int mb_y) const {
        return available ? records_[static_cast<std::size_t>(mb_y * (width_ / 16) + mb_x)]
                         : Record{};
    }

    void integer_search() {
        const int mb_x = px_ / 16, mb_y = py_ / 16;
        const Record top = neighbour(mb_y > 0, mb_x, mb_y - 1);
        const Record left = neighbour(mb_x > 0, mb_x - 1, mb_y);
        const Record top_right = neighbour(mb_y > 0 && mb_x < width_ / 16 - 1, mb_x + 1, mb_y - 1);

        const Vector centre = {std::clamp((predicted_.x + 2) >> 2, -kRange, kRange),
                               std::clamp((predicted_.y + 2) >> 2, -kRange, kRange)};
        std::vector<Vector> candidates = {
            {0, 0},
            {median(top.x, left.x, top_right.x), median(top.y, left.y, top_right.y)},
            centre};
        bool moving = false;
        for (const Record& n : {top, left, top_right}) {
            moving = moving || std::abs(n.x) + std::abs(n.y) > 3;
        }
        if (moving) {
            for (const Record& n : {top, left, top_right}) {
                candidates.push_back({n.x, n.y});
            }
        }
        for (const Vector& v : candidates) {
            const bool inside = v.x > std::max(-19 - px_, centre.x - kRange) &&
                                v.x < std::min(centre.x + kRange, width_ - px_ + 2) &&
                                v.y > std::max(-19 - py_, centre.y - kRange) &&
                                v.y < std::min(centre.y + kRange, height_ - py_ + 2);
            if (inside && try_integer(v.x, v.y)) {
                return;
            }
        }

        unsigned enough = 0;
        if (mb_x > 0 || mb_y > 0) {
            const auto low = [](unsigned sad) { return sad & 0xffff; };
            enough = std::max(2 * median(low(top.sad), low(left.sad), low(top_right.sad)), 2048u);
        }
        if (best_.sad > enough && spiral()) {
            return;
        }
        diamond();
    }

    // Every fourth pel around the zero vector, whatever was found so far.
    bool spiral() {
        int x = 0, y = 0, step = 4;
        for (int n = 1; n < kRange / 2; ++n) {
            for (int i = 0; i < 2 * n; ++i) {
                (i < n ? x : y) += step;
                if (std::max(std::abs(x), std::abs(y)) > kRange) {
                    return false;
                }
                if (try_integer(x, y)) {
                    return true;
                }
            }
            step = -step;
        }
        return false;
    }

    // Steps of one pel for as long as they gain and stay inside.
    void diamond() {
        const int left = std::max(-19 - px_, best_.x - kRange);
        const int right = std::min(best_.x + kRange, width_ - px_ + 2);
        const int top = std::max(-19 - py_, best_.y - kRange);
        const int bottom = std::min(best_.y + kRange, height_ - py_ + 2);
        for (;;) {
            const Vector c = {best_.x, best_.y};
            for (const auto& [dx, dy] :
                 {Vector{-1, 0}, Vector{1, 0}, Vector{0, -1}, Vector{0, 1}}) {
                if (try_integer(c.x + dx, c.y + dy)) {
                    return;
                }
            }
            const bool moved = best_.x != c.x || best_.y != c.y;
            if (!moved || best_.x < left || best_.x > right || best_.y < top || best_.y > bottom) {
                return;
            }
        }
    }

    // The macroblock in the plane that holds the samples of this phase, in half pels.
    const std::uint8_t* half_block(int x, int y) const {
        const Plane& plane = x & 1 ? (y & 1 ? centre_ : right_) : (y & 1 ? below_ : whole_);
        return plane.at(px_ + (x >> 1), py_ + (y >> 1));
    }

    // Tries eight positions around the best so far, distances in quarter pels. A quarter sample is
    // the average of the two half or whole samples beside it, on a diagonal of the two that are
    // half samples in one direction only.
    void refine(const std::vector<Vector>& around, bool quarter) {
        const int cx = best_.dx, cy = best_.dy;
        for (const Vector& v : around) {
            const int dx = cx + v.x, dy = cy + v.y;
            const int x = 4 * best_.x + dx, y = 4 * best_.y + dy;
            // The half-pel positions on either side; the same where it is one itself.
            int x0 = x >> 1, y0 = y >> 1, x1 = (x + 1) >> 1, y1 = (y + 1) >> 1;
            if (x0 != x1 && y0 != y1 && (x0 + y0) % 2 == 0) {
                std::swap(y0, y1);
            }
            const unsigned cost =
                measure(half_block(x0, y0), half_block(x1, y1), rate(x, y), quarter);
            if (cost < best_.cost) {
                best_.dx = dx;
                best_.dy = dy;
                best_.cost = cost;
                if (best_.sad < kGoodEnough) {
                    return;
                }
            }
        }
    }

    const int width_, height_;
    Plane current_, whole_, below_, right_, centre_;  // centre_: half a pel right and below
    std::vector<Record> records_;                     // integer results
    int px_ = 0, py_ = 0;
    Vector predicted_;
    unsigned lambda_ = 0;
    Record best_;
    unsigned threshold_[3] = {};
    std::set<std::pair<int, int>> visited_;
};

// Predicted vector of a 16x16 partition with reference index 0, in quarter pels (clause 8.4.1.3).
Vector predicted_vector(const CEncoder& e, int mb_x, int mb_y) {
    struct Motion {
        bool available;
        int ref, x, y;
    };
    const auto motion = [&](bool available, int x, int y) {
        const int block = available ? (4 * mb_y + y) * e.picture.g_blk_width + 4 * mb_x + x : 0;
        return available ? Motion{true, e.picture.g_blk_ref[block], e.picture.g_blk_mvx[block],
                                  e.picture.g_blk_mvy[block]}
                         : Motion{false, -1, 0, 0};
    };
    const Motion a = motion(mb_x > 0, -1, 0);
    const Motion b = motion(mb_y > 0, 0, -1);
    Motion c = motion(mb_y > 0 && mb_x < e.picture.g_mb_width - 1, 4, -1);
    if (!c.available) {
        c = motion(mb_x > 0 && mb_y > 0, -1, -1);
    }
    if (!b.available && !c.available) {
        return {a.x, a.y};
    }
    if ((a.ref == 0) + (b.ref == 0) + (c.ref == 0) == 1) {
        const Motion& only = a.ref == 0 ? a : b.ref == 0 ? b : c;
        return {only.x, only.y};
    }
    return {median(a.x, b.x, c.x), median(a.y, b.y, c.y)};
}

// ---- Comparison ----

Record record(const _mv& m) {
    return {m.x, m.y, m.dx, m.dy, m.sad, m.cost};
}

// What the engine found for a macroblock. The record of the integer stage has no fractions.
Found engine_found(const CEncoder& e, int mb) {
    Found found{record(e.picture.g_me_mb_L0[mb]), record(e.picture.g_mv_array[mb])};
    found.integer.dx = found.integer.dy = 0;
    return found;
}

// Codes a sequence and searches along. Returns the first macroblock where the two differ, or
// nothing; adds the number of searches to `searches`.
std::string compare(const Sequence& sequence, const Settings& settings, int& searches) {
    Encoding encoding(sequence.width, sequence.height, settings);
    const CEncoder& e = encoding.engine();
    std::vector<std::uint8_t> source(sequence.picture_size()), reference;
    for (int n = 0; n < sequence.pictures; ++n, reference = encoding.reconstruction()) {
        sequence.draw(n, source.data());
        encoding.encode(source.data());
        if (n % settings.intra_period == 0) {
            continue;
        }
        SearchModel model(e.picture.g_width16, e.picture.g_height16, source.data(), sequence.width,
                          reference.data());
        for (int mb = 0; mb < e.picture.g_num_mbs; ++mb, ++searches) {
            const int mb_x = mb % e.picture.g_mb_width, mb_y = mb / e.picture.g_mb_width;
            const Vector predicted = predicted_vector(e, mb_x, mb_y);
            const Found model_found = model.search(
                mb_x, mb_y, predicted, kLambda[std::max(e.picture.g_mb_qp[mb] - 12, 0)]);
            const Found found = engine_found(e, mb);
            // A macroblock coded in inter mode is coded with the vector that was found.
            const int block = 4 * mb_y * e.picture.g_blk_width + 4 * mb_x;
            const Vector coded = {e.picture.g_blk_mvx[block], e.picture.g_blk_mvy[block]};
            const Record& r = model_found.refined;
            const bool as_found = e.picture.g_blk_ref[block] < 0 ||
                                  (coded.x == 4 * r.x + r.dx && coded.y == 4 * r.y + r.dy);
            if (!(found == model_found) || !as_found) {
                std::ostringstream message;
                message << sequence.name << " " << settings.name() << " picture " << n
                        << " macroblock " << Vector{mb_x, mb_y} << ", predicted " << predicted
                        << "/4:\n  engine " << found << ", coded " << coded << "/4\n  model  "
                        << model_found;
                return message.str();
            }
        }
    }
    return "";
}

constexpr int kQps[] = {12, 28, 40};

class SearchOracle : public testing::TestWithParam<std::string> {};

TEST_P(SearchOracle, GeneratedSequences) {
    constexpr int kSizes[][2] = {{16, 16}, {150, 22}, {16, 112}, {176, 144}};
    for (const auto& [width, height] : kSizes) {
        const Sequence sequence = zolt_test::generated(GetParam(), width, height, 6);
        for (const int qp : kQps) {
            int searches = 0;
            EXPECT_EQ(compare(sequence, {qp, 0, 4}, searches), "");
            EXPECT_EQ(searches, width / 16 * (height / 16) * 4);
        }
    }
}

INSTANTIATE_TEST_SUITE_P(SearchKinds, SearchOracle, testing::ValuesIn(zolt_test::generated_kinds()),
                         [](const auto& test) { return test.param; });

// ---- Material that brings out single rules of the search ----

constexpr int kPictures = 4;  // of a sequence
constexpr int kRounds = 60;   // sequences of a test

// Luma given by a function of picture and position; grey.
Sequence grey(const std::string& name, int width, int height,
              const std::function<int(int n, int x, int y)>& sample) {
    const auto draw = [=](int n, std::uint8_t* out) {
        for (int y = 0; y < height; ++y) {
            for (int x = 0; x < width; ++x) {
                *out++ = static_cast<std::uint8_t>(std::clamp(sample(n, x, y), 0, 255));
            }
        }
        std::fill_n(out, width / 2 * (height / 2) * 2, std::uint8_t{128});
    };
    return {name + "_" + std::to_string(width) + "x" + std::to_string(height), width, height,
            kPictures, draw};
}

// 0..65535, by the position; x, y, seed not negative.
int noise(int x, int y, int seed) {
    std::uint64_t key = static_cast<std::uint64_t>(seed);
    for (const int v : {y, x}) {
        key = key << 20 | static_cast<std::uint64_t>(v);
    }
    return static_cast<int>(Random(key).next() >> 16);
}

// Smooth: random heights -128..127 on a lattice, linear in between.
int hills(int x, int y, int cell, int seed) {
    x += 16 * 1024;
    y += 16 * 1024;
    const auto height = [&](int i, int j) { return noise(x / cell + i, y / cell + j, seed) % 256; };
    const int u = x % cell, v = y % cell;
    const int sum = (height(0, 0) * (cell - u) + height(1, 0) * u) * (cell - v) +
                    (height(0, 1) * (cell - u) + height(1, 1) * u) * v;
    return sum / (cell * cell) - 128;
}

// Single samples on flat ground: distortions of few values, unevenly spread over a block.
Sequence stars(Random& random, int width, int height) {
    const int seed = random.between(0, 9999), rarity = random.between(8, 160);
    const int light = random.between(20, 120);
    return grey("stars" + std::to_string(seed), width, height, [=](int n, int x, int y) {
        return 100 + (noise(x, y, seed + n) % rarity ? 0 : light);
    });
}

// A landscape that moves far, which only steady steps can follow, also out of the picture.
Sequence sweep(Random& random, int width, int height) {
    const int seed = random.between(0, 9999), cell = random.between(12, 60);
    const int x_speed = random.between(-30, 30), y_speed = random.between(-30, 30);
    const int grain = random.between(1, 12);
    return grey("sweep" + std::to_string(seed), width, height, [=](int n, int x, int y) {
        return 128 + hills(x + n * x_speed, y + n * y_speed, cell, seed) +
               noise(x, y, seed + n) % grain;
    });
}

// Every macroblock with a contrast and a motion of its own.
Sequence mosaic(Random& random, int width, int height) {
    const int seed = random.between(0, 9999), cell = random.between(2, 12);
    const int speed = random.between(1, 40), contrast = 8 << random.between(0, 4);
    return grey("mosaic" + std::to_string(seed), width, height, [=](int n, int x, int y) {
        Random own(static_cast<std::uint64_t>(noise(x / 16, y / 16, seed + n)));
        const int scale = own.between(1, contrast);
        const int dx = own.between(-speed, speed), dy = own.between(-speed, speed);
        return 128 + hills(x + dx, y + dy, cell, seed) * scale / 128;
    });
}

// In every other picture the samples whose distortion is measured first move unlike the others: a
// vector that suits them need not suit the rest.
Sequence split(Random& random, int width, int height) {
    const int seed = random.between(0, 9999), cell = 4 * random.between(2, 12);
    const int spread = 4 << random.between(0, 4), contrast = 8 << random.between(0, 4);
    return grey("split" + std::to_string(seed), width, height, [=](int n, int x, int y) {
        Random own(static_cast<std::uint64_t>(noise(x / 16, y / 16, seed + n)));
        const int others = x % 2 + y % 2;
        int dx = 0, dy = 0;
        for (int i = 0; i < n % 2 + (others ? 1 : 0); ++i) {
            dx = own.between(-spread, spread);
            dy = own.between(-spread, spread);
        }
        return 128 + hills(4 * x + n % 2 * dx, 4 * y + n % 2 * dy, cell, seed) * contrast / 128;
    });
}

using Material = Sequence (*)(Random& random, int width, int height);
constexpr std::array<Material, 4> kMaterials = {stars, sweep, mosaic, split};

class SearchOracleMaterial : public testing::TestWithParam<int> {};

TEST_P(SearchOracleMaterial, SmallPictures) {
    Random random(static_cast<std::uint64_t>(GetParam()));
    for (int i = 0; i < kRounds; ++i) {
        const int width = 16 * random.between(1, 5), height = 16 * random.between(1, 5);
        const auto material = kMaterials[static_cast<std::size_t>(i % 4)];
        const Sequence sequence = material(random, width, height);
        const int qp = i % 2 ? random.between(0, 15) : random.between(10, 45);
        int searches = 0;
        ASSERT_EQ(compare(sequence, {qp, 0, 30}, searches), "");
    }
}

// Two pictures of random samples, and around every macroblock a random outcome of the searches and
// codings before: also such as pictures seldom or never lead to.
TEST_P(SearchOracleMaterial, RandomNeighbourhoods) {
    Random random(static_cast<std::uint64_t>(GetParam() + 1000));
    for (int i = 0; i < kRounds; ++i) {
        const int width = 16 * random.between(1, 4), height = 16 * random.between(1, 4);
        const Sequence sequence =
            kMaterials[static_cast<std::size_t>(i % 4)](random, width, height);
        std::vector<std::uint8_t> source(sequence.picture_size()), reference(source);
        sequence.draw(0, reference.data());
        sequence.draw(1, source.data());
        // In turn with every table of sample loops that this processor can run.
        const auto& tables = zolt::kernel_tables();
        const zolt::Kernels& kernels = tables.begin()[i / 4 % (tables.end() - tables.begin())];
        CEncoder e(width, height, &kernels);
        e.picture.g_frame = source.data();
        for (int y = 0; y < height; ++y) {
            std::copy_n(&reference[static_cast<std::size_t>(y * width)], width,
                        e.picture.g_ref_y + y * e.picture.g_stride_luma);
        }
        e.picture.framePredInitP();
        SearchModel model(width, height, source.data(), width, reference.data());
        for (int n = 0; n < 32 * e.picture.g_num_mbs; ++n) {
            const int mb = n % e.picture.g_num_mbs;
            const int reach = std::array{1, 4, 20, 38}[random.next() % 4];
            // Anywhere, or where the block is about to leave the picture's surroundings.
            const auto component = [&](int position, int size) {
                const int edge = random.between(0, 1) ? -19 - position : size - position + 2;
                return random.between(0, 1) ? random.between(-reach, reach)
                                            : edge + random.between(-3, 3);
            };
            const Vector about = {component(16 * (mb % e.picture.g_mb_width), width),
                                  component(16 * (mb / e.picture.g_mb_width), height)};
            const int near = random.between(0, 3);
            const int grid = random.between(0, 1) ? 4 : 1;  // 4: on the spiral's points
            const unsigned most = random.between(0, 1) ? 1100u : 20000u;
            for (int other = 0; other < e.picture.g_num_mbs; ++other) {
                Record r;
                const auto around = [&](int v) {
                    return std::clamp((v / grid + random.between(-near, near)) * grid, -38, 38);
                };
                r.x = around(about.x);
                r.y = around(about.y);
                r.sad = random.next() % most;
                model.keep(other, r);
                _mv& kept = e.picture.g_me_mb_L0[other];
                kept.x = static_cast<std::int16_t>(r.x);
                kept.y = static_cast<std::int16_t>(r.y);
                kept.sad = r.sad;
                const int ref = random.between(0, 3) ? 0 : -1;
                const int mvx = ref < 0 ? 0 : 4 * r.x + random.between(-12, 12);
                const int mvy = ref < 0 ? 0 : 4 * r.y + random.between(-12, 12);
                for (int block = 0; block < 16; ++block) {
                    const int at =
                        (4 * (other / e.picture.g_mb_width) + block / 4) * e.picture.g_blk_width +
                        4 * (other % e.picture.g_mb_width) + block % 4;
                    e.picture.g_blk_ref[at] = static_cast<std::int8_t>(ref);
                    e.picture.g_blk_mvx[at] = static_cast<std::int16_t>(mvx);
                    e.picture.g_blk_mvy[at] = static_cast<std::int16_t>(mvy);
                }
            }
            e.rows.coders[0]->g_mapMBNumber = mb;
            e.rows.coders[0]->g_mb_x = mb % e.picture.g_mb_width;
            e.rows.coders[0]->g_mb_y = mb / e.picture.g_mb_width;
            e.picture.g_mbQp = random.between(0, 3) ? random.between(0, 24) : 51;
            e.rows.coders[0]->setMBOffsets();
            e.rows.coders[0]->generateMBPred();
            const Vector predicted =
                predicted_vector(e, e.rows.coders[0]->g_mb_x, e.rows.coders[0]->g_mb_y);
            const Found model_found =
                model.search(e.rows.coders[0]->g_mb_x, e.rows.coders[0]->g_mb_y, predicted,
                             kLambda[std::max(e.picture.g_mbQp - 12, 0)]);
            ASSERT_EQ(engine_found(e, mb), model_found)
                << sequence.name << " " << kernels.name << " search " << n << " macroblock "
                << Vector{e.rows.coders[0]->g_mb_x, e.rows.coders[0]->g_mb_y} << ", predicted "
                << predicted << "/4, QP " << e.picture.g_mbQp;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(SearchMaterial, SearchOracleMaterial, testing::Range(0, 10));

TEST(SearchOracleClips, FirstPictures) {
    const char* folder = std::getenv("ZOLT_TEST_CLIPS");
    if (!folder) {
        GTEST_SKIP() << "ZOLT_TEST_CLIPS is not set: no clips to test with";
    }
    for (const zolt_test::Clip& clip : zolt_test::clips()) {
        const Sequence sequence = zolt_test::load_clip(folder, clip, 0, clip.width > 400 ? 3 : 6);
        for (const int qp : kQps) {
            int searches = 0;
            EXPECT_EQ(compare(sequence, {qp, 0, 30}, searches), "");
        }
    }
}

}  // namespace
