// Vector prediction against clause 8.4.1.3, inter prediction samples against clause 8.4.2.2.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>

#include "common/Random.h"
#include "encoder/MacroblockCoder.h"
#include "encoder/tables.h"

namespace {

using zolt_test::Random;

// ---- Vector prediction ----

struct Motion {
    bool available = false;
    int ref = -1, x = 0, y = 0;
};

// Position of the 4x4 block at column x, row y of a macroblock in decoding order.
int decoding_order(int x, int y) {
    for (int k = 0; k < 16; ++k) {
        if (zolt::luma_scan_i[k] == x && zolt::luma_scan_j[k] == y) {
            return k;
        }
    }
    return -1;
}

// The block at (x, y), in blocks, seen from the partition at (bx, by) of the engine's current
// macroblock: available when it has been decoded before (clauses 6.4.8, 6.4.11.7).
Motion neighbour(const MacroblockCoder& e, int bx, int by, int x, int y) {
    const int column = 4 * e.g_mb_x + x, row = 4 * e.g_mb_y + y;
    if (column < 0 || row < 0 || column >= e.picture.g_blk_width || row >= e.picture.g_blk_height) {
        return {};
    }
    const int mb = row / 4 * e.picture.g_mb_width + column / 4;
    const int current = e.g_mb_y * e.picture.g_mb_width + e.g_mb_x;
    if (mb > current ||
        (mb == current && decoding_order(column % 4, row % 4) >= decoding_order(bx, by))) {
        return {};
    }
    const int block = row * e.picture.g_blk_width + column;
    return {true, e.picture.g_blk_ref[block], e.picture.g_blk_mvx[block],
            e.picture.g_blk_mvy[block]};
}

int median(int a, int b, int c) {
    return a + b + c - std::min({a, b, c}) - std::max({a, b, c});
}

std::array<int, 2> reference_prediction(const MacroblockCoder& e, int ref, int bx, int by, int w,
                                        int h) {
    const Motion a = neighbour(e, bx, by, bx - 1, by);
    Motion b = neighbour(e, bx, by, bx, by - 1);
    Motion c = neighbour(e, bx, by, bx + w / 4, by - 1);
    if (!c.available) {
        c = neighbour(e, bx, by, bx - 1, by - 1);
    }
    if (w == 16 && h == 8 && (by == 0 ? b : a).ref == ref) {
        return by == 0 ? std::array{b.x, b.y} : std::array{a.x, a.y};
    }
    if (w == 8 && h == 16 && (bx == 0 ? a : c).ref == ref) {
        return bx == 0 ? std::array{a.x, a.y} : std::array{c.x, c.y};
    }
    if (!b.available && !c.available && a.available) {
        b = c = a;
    }
    const Motion* only = nullptr;
    int matches = 0;
    for (const Motion* m : std::array<const Motion*, 3>{&a, &b, &c}) {
        if (m->ref == ref) {
            only = m;
            ++matches;
        }
    }
    if (matches == 1) {
        return {only->x, only->y};
    }
    return {median(a.x, b.x, c.x), median(a.y, b.y, c.y)};
}

TEST(VectorPrediction, EveryShapeOnRandomNeighbourhoods) {
    constexpr int kShapes[][2] = {{16, 16}, {16, 8}, {8, 16}, {8, 8}, {8, 4}, {4, 8}, {4, 4}};
    Random random(1);
    Picture picture(64, 48, zolt::best_kernels());
    MacroblockCoder coder(picture);
    for (int iteration = 0; iteration < 3000; ++iteration) {
        for (int block = 0; block < picture.g_blk_width * picture.g_blk_height; ++block) {
            const int ref = random.between(-1, 1);
            picture.g_blk_ref[block] = static_cast<std::int8_t>(ref);
            const auto component = [&] { return ref < 0 ? 0 : random.between(-90, 90); };
            picture.g_blk_mvx[block] = static_cast<std::int16_t>(component());
            picture.g_blk_mvy[block] = static_cast<std::int16_t>(component());
        }
        coder.g_mb_x = random.between(0, 3);
        coder.g_mb_y = random.between(0, 2);
        coder.g_mb_left = coder.g_mb_x > 0;
        coder.g_mb_up = coder.g_mb_y > 0;
        const auto& [w, h] = kShapes[iteration % 7];
        const int ref = random.between(0, 1);
        for (int by = 0; by < 4; by += h / 4) {
            for (int bx = 0; bx < 4; bx += w / 4) {
                std::int16_t x, y;
                coder.form_mv_prediction(&x, &y, static_cast<std::int8_t>(ref), bx, by, w, h);
                ASSERT_EQ((std::array<int, 2>{x, y}),
                          reference_prediction(coder, ref, bx, by, w, h))
                    << w << "x" << h << " at block (" << bx << ", " << by << ") of macroblock ("
                    << coder.g_mb_x << ", " << coder.g_mb_y << ")";
            }
        }
    }
}

// ---- Prediction samples ----

// A plane whose samples outside repeat its border (clause 8.4.2.2).
struct ClampedPlane {
    const std::uint8_t* p;
    std::ptrdiff_t stride;
    int width, height;

    int operator()(int x, int y) const {
        return p[std::clamp(y, 0, height - 1) * stride + std::clamp(x, 0, width - 1)];
    }
};

int tap(int e, int f, int g, int h, int i, int j) {
    return e - 5 * f + 20 * g + 20 * h - 5 * i + j;
}

// Luma sample of clause 8.4.2.2.1 with the names of Figure 8-4: G at (x, y), in quarter samples at
// (fx, fy) from there.
int luma_sample(const ClampedPlane& p, int x, int y, int fx, int fy) {
    const auto clip = [](int v) { return std::clamp(v, 0, 255); };
    const auto b1 = [&](int r) {
        return tap(p(x - 2, y + r), p(x - 1, y + r), p(x, y + r), p(x + 1, y + r), p(x + 2, y + r),
                   p(x + 3, y + r));
    };
    const auto h1 = [&](int c) {
        return tap(p(x + c, y - 2), p(x + c, y - 1), p(x + c, y), p(x + c, y + 1), p(x + c, y + 2),
                   p(x + c, y + 3));
    };
    const int G = p(x, y), H = p(x + 1, y), M = p(x, y + 1);
    const int b = clip((b1(0) + 16) >> 5), s = clip((b1(1) + 16) >> 5);
    const int h = clip((h1(0) + 16) >> 5), m = clip((h1(1) + 16) >> 5);
    const int j = clip((tap(b1(-2), b1(-1), b1(0), b1(1), b1(2), b1(3)) + 512) >> 10);
    const int pairs[4][4][2] = {{{G, G}, {G, h}, {h, h}, {M, h}},
                                {{G, b}, {b, h}, {h, j}, {h, s}},
                                {{b, b}, {b, j}, {j, j}, {j, s}},
                                {{H, b}, {b, m}, {j, m}, {s, m}}};
    return (pairs[fx][fy][0] + pairs[fx][fy][1] + 1) >> 1;
}

int chroma_sample(const ClampedPlane& p, int x, int y, int fx, int fy) {
    return ((8 - fx) * (8 - fy) * p(x, y) + fx * (8 - fy) * p(x + 1, y) +
            (8 - fx) * fy * p(x, y + 1) + fx * fy * p(x + 1, y + 1) + 32) >>
           6;
}

class InterPrediction : public testing::Test {
protected:
    InterPrediction() {
        for (const auto& [p, stride, width, height] : {y_, u_, v_}) {
            for (int i = 0; i < width * height; ++i) {
                // Contrast enough to clip.
                const int value =
                    random_.between(0, 2) ? random_.sample() : random_.between(0, 1) * 255;
                const_cast<std::uint8_t*>(p)[i / width * stride + i % width] =
                    static_cast<std::uint8_t>(value);
            }
        }
        picture_.framePredInitP();
        picture_.make_half_pixel_sds(32 + picture_.g_pad_luma - 3);
    }

    Random random_{2};
    Picture picture_{48, 32, zolt::best_kernels()};
    MacroblockCoder coder_{picture_};
    ClampedPlane y_{picture_.g_ref_y, picture_.g_stride_luma, 48, 32};
    ClampedPlane u_{picture_.g_ref_u, picture_.g_stride_chroma, 24, 16};
    ClampedPlane v_{picture_.g_ref_v, picture_.g_stride_chroma, 24, 16};
};

TEST_F(InterPrediction, EveryPositionInAndAroundThePicture) {
    for (int iteration = 0; iteration < 4000; ++iteration) {
        const int limit = iteration % 8 == 0 ? 2000 : 150;
        const int mvx = random_.between(-limit, limit), mvy = random_.between(-limit, limit);
        const int mb_x = random_.between(0, 2), mb_y = random_.between(0, 1);
        alignas(32) std::uint8_t pred[256];
        coder_.qpmc_16x16_L0(pred, mvx, mvy, 16 * mb_x, 16 * mb_y);
        for (int i = 0; i < 256; ++i) {
            const int x = 16 * mb_x + i % 16 + (mvx >> 2), y = 16 * mb_y + i / 16 + (mvy >> 2);
            ASSERT_EQ(pred[i], luma_sample(y_, x, y, mvx & 3, mvy & 3))
                << "luma at " << i << " for vector (" << mvx << ", " << mvy << ")";
        }
        coder_.qpmc_c_core(pred, mvx, mvy, 8 * mb_x, 8 * mb_y);
        for (int i = 0; i < 128; ++i) {
            const int x = 8 * mb_x + i % 8 + (mvx >> 3), y = 8 * mb_y + i / 8 % 8 + (mvy >> 3);
            ASSERT_EQ(pred[i], chroma_sample(i < 64 ? u_ : v_, x, y, mvx & 7, mvy & 7))
                << "chroma at " << i << " for vector (" << mvx << ", " << mvy << ")";
        }
    }
}

}  // namespace
