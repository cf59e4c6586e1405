// The deblocking filter against clause 8.7, on random macroblocks and samples.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <vector>

#include "common/Random.h"
#include "encoder/MacroblockCoder.h"

namespace {

using zolt_test::Random;

// alpha', beta' (Table 8-16) and tC0' (Table 8-17) from index 16 on; below, alpha' and beta' are 0.
constexpr int kAlpha[36] = {4,  4,  5,   6,   7,   8,   9,   10,  12,  13,  15,  17,
                            20, 22, 25,  28,  32,  36,  40,  45,  50,  56,  63,  71,
                            80, 90, 101, 113, 127, 144, 162, 182, 203, 226, 255, 255};
constexpr int kBeta[36] = {2,  2,  2,  3,  3,  3,  3,  4,  4,  4,  6,  6,  7,  7,  8,  8,  9,  9,
                           10, 10, 11, 11, 12, 12, 13, 13, 14, 14, 15, 15, 16, 16, 17, 17, 18, 18};
constexpr int kTc0[3][36] = {{0, 0, 0, 0, 0, 0, 0, 1, 1, 1, 1, 1, 1, 1, 1, 1,  1,  2,
                              2, 2, 2, 3, 3, 3, 4, 4, 4, 5, 6, 6, 7, 8, 9, 10, 11, 13},
                             {0, 0, 0, 0, 0, 1, 1, 1, 1, 1, 1, 1, 1,  1,  1,  2,  2,  2,
                              2, 3, 3, 3, 4, 4, 5, 5, 6, 7, 8, 8, 10, 11, 12, 13, 15, 17},
                             {0, 1, 1, 1, 1, 1, 1, 1, 1, 1,  1,  2,  2,  2,  2,  3,  3,  3,
                              4, 4, 4, 5, 6, 6, 7, 8, 9, 10, 11, 13, 14, 16, 18, 20, 23, 25}};
// QPc from luma QP 30 on (Table 8-15).
constexpr int kChromaQp[22] = {29, 30, 31, 32, 32, 33, 34, 34, 35, 35, 36,
                               36, 37, 37, 37, 38, 38, 38, 39, 39, 39, 39};

struct Plane {
    std::vector<int> samples;
    int width;
    int& at(int x, int y) { return samples[static_cast<std::size_t>(y * width + x)]; }
};

class DeblockReference {
public:
    explicit DeblockReference(const Picture& picture) : p_(picture) {
        planes_[0] = read(p_.g_cur_y, p_.g_stride_luma, p_.g_width16, p_.g_height16);
        planes_[1] = read(p_.g_cur_u, p_.g_stride_chroma, p_.g_cwidth, p_.g_cheight);
        planes_[2] = read(p_.g_cur_v, p_.g_stride_chroma, p_.g_cwidth, p_.g_cheight);
    }

    static Plane read(const std::uint8_t* p, std::ptrdiff_t stride, int width, int height) {
        Plane plane{{}, width};
        for (int y = 0; y < height; ++y) {
            plane.samples.insert(plane.samples.end(), p + y * stride, p + y * stride + width);
        }
        return plane;
    }

    void filter_picture() {
        for (int mb_y = 0; mb_y < p_.g_mb_height; ++mb_y) {
            for (int mb_x = 0; mb_x < p_.g_mb_width; ++mb_x) {
                if (p_.g_lf_data[mb_y * p_.g_mb_width + mb_x].disable_flag == 0) {
                    for (const bool vertical : {true, false}) {
                        filter_edges(mb_x, mb_y, vertical);
                    }
                }
            }
        }
    }

    const Plane& plane(int n) const { return planes_[static_cast<std::size_t>(n)]; }

private:
    void filter_edges(int mb_x, int mb_y, bool vertical) {
        for (int plane = 0; plane < 3; ++plane) {
            const int size = plane == 0 ? 16 : 8;
            for (int edge = 0; edge < size; edge += 4) {
                for (int line = 0; line < size; ++line) {
                    const int x = size * mb_x + (vertical ? edge : line);
                    const int y = size * mb_y + (vertical ? line : edge);
                    if ((vertical ? x : y) > 0) {
                        filter_line(plane, x, y, vertical);
                    }
                }
            }
        }
    }

    // The line across an edge whose first q sample is at (x, y).
    void filter_line(int plane, int x, int y, bool vertical) {
        const int scale = plane == 0 ? 1 : 2;
        const int luma_x = scale * x, luma_y = scale * y;
        const int bs = strength(luma_x, luma_y, vertical);
        const int mb_q = luma_y / 16 * p_.g_mb_width + luma_x / 16;
        const int mb_p = (luma_y - !vertical) / 16 * p_.g_mb_width + (luma_x - vertical) / 16;
        const auto qp = [&](int mb) {
            const int luma = p_.g_mb_qp[mb];
            return plane == 0 || luma < 30 ? luma : kChromaQp[luma - 30];
        };
        const int average = (qp(mb_p) + qp(mb_q) + 1) >> 1;
        const int index_a = std::clamp(average + p_.g_lf_data[mb_q].alpha_offset, 0, 51) - 16;
        const int index_b = std::clamp(average + p_.g_lf_data[mb_q].beta_offset, 0, 51) - 16;
        const int alpha = index_a < 0 ? 0 : kAlpha[index_a];
        const int beta = index_b < 0 ? 0 : kBeta[index_b];
        const auto sample = [&](int i) -> int& {
            return planes_[static_cast<std::size_t>(plane)].at(x + (vertical ? i : 0),
                                                               y + (vertical ? 0 : i));
        };
        std::array<int, 4> p{}, q{};
        for (int i = 0; i < (plane == 0 ? 4 : 2); ++i) {
            q[static_cast<std::size_t>(i)] = sample(i);
            p[static_cast<std::size_t>(i)] = sample(-1 - i);
        }
        if (bs == 0 || std::abs(p[0] - q[0]) >= alpha || std::abs(p[1] - p[0]) >= beta ||
            std::abs(q[1] - q[0]) >= beta) {
            return;
        }
        const bool ap = plane == 0 && std::abs(p[2] - p[0]) < beta;
        const bool aq = plane == 0 && std::abs(q[2] - q[0]) < beta;
        if (bs == 4) {
            const bool close = std::abs(p[0] - q[0]) < (alpha >> 2) + 2;
            const auto strong = [&](const std::array<int, 4>& s, const std::array<int, 4>& t,
                                    bool smooth, int first, int step) {
                if (!smooth || !close) {
                    sample(first) = (2 * s[1] + s[0] + t[1] + 2) >> 2;
                    return;
                }
                sample(first) = (s[2] + 2 * s[1] + 2 * s[0] + 2 * t[0] + t[1] + 4) >> 3;
                sample(first + step) = (s[2] + s[1] + s[0] + t[0] + 2) >> 2;
                sample(first + 2 * step) = (2 * s[3] + 3 * s[2] + s[1] + s[0] + t[0] + 4) >> 3;
            };
            strong(p, q, ap, -1, -1);
            strong(q, p, aq, 0, 1);
            return;
        }
        const int tc0 = index_a < 0 ? 0 : kTc0[bs - 1][index_a];
        const int tc = plane == 0 ? tc0 + ap + aq : tc0 + 1;
        const int delta = std::clamp(((q[0] - p[0]) * 4 + (p[1] - q[1]) + 4) >> 3, -tc, tc);
        sample(-1) = std::clamp(p[0] + delta, 0, 255);
        sample(0) = std::clamp(q[0] - delta, 0, 255);
        const int middle = (p[0] + q[0] + 1) >> 1;
        if (ap) {
            sample(-2) = p[1] + std::clamp((p[2] + middle - 2 * p[1]) >> 1, -tc0, tc0);
        }
        if (aq) {
            sample(1) = q[1] + std::clamp((q[2] + middle - 2 * q[1]) >> 1, -tc0, tc0);
        }
    }

    // bS of clause 8.7.2.1 between the luma sample at (x, y) and the one left of or above it.
    int strength(int x, int y, bool vertical) const {
        const int px = x - vertical, py = y - !vertical;
        const auto mb_at = [&](int sx, int sy) { return sy / 16 * p_.g_mb_width + sx / 16; };
        const int q = mb_at(x, y), p = mb_at(px, py);
        const auto intra = [&](int mb) { return p_.g_mb_mode[mb] >= MB_INTRA4x4; };
        if (intra(p) || intra(q)) {
            return p != q ? 4 : 3;
        }
        const auto coded = [&](int sx, int sy) {
            const int block = sy % 16 / 4 * 4 + sx % 16 / 4;
            return (p_.g_coded_blocks[mb_at(sx, sy)] >> block & 1) != 0;
        };
        if (coded(x, y) || coded(px, py)) {
            return 2;
        }
        const _mv &a = p_.g_mv_array[p], &b = p_.g_mv_array[q];
        return std::abs(4 * a.x + a.dx - 4 * b.x - b.dx) >= 4 ||
               std::abs(4 * a.y + a.dy - 4 * b.y - b.dy) >= 4;
    }

    const Picture& p_;
    std::array<Plane, 3> planes_;
};

// Steps between 4x4 blocks with a little noise: edges that the filter is for.
void draw(std::uint8_t* p, std::ptrdiff_t stride, int width, int height, Random& random) {
    const int step = random.between(0, 40), noise = random.between(0, 9);
    const int base = random.between(0, 255);
    for (int y = 0; y < height; y += 4) {
        for (int x = 0; x < width; x += 4) {
            const int block = base + random.between(-step, step);
            for (int i = 0; i < 16; ++i) {
                p[(y + i / 4) * stride + x + i % 4] = static_cast<std::uint8_t>(
                    std::clamp(block + random.between(-noise, noise), 0, 255));
            }
        }
    }
}

TEST(Deblocking, EqualsTheStandardOnRandomPictures) {
    constexpr std::uint8_t kModes[] = {MB_SKIP, MB_P16x16, MB_INTRA4x4, MB_INTRA16x16};
    Random random(1);
    Picture picture(64, 48, zolt::best_kernels());
    MacroblockCoder coder(picture);
    for (int iteration = 0; iteration < 400; ++iteration) {
        draw(picture.g_cur_y, picture.g_stride_luma, 64, 48, random);
        draw(picture.g_cur_u, picture.g_stride_chroma, 32, 24, random);
        draw(picture.g_cur_v, picture.g_stride_chroma, 32, 24, random);
        const int qp = random.between(0, 51);
        const int most_intra = random.between(1, 3);
        for (int mb = 0; mb < picture.g_num_mbs; ++mb) {
            picture.g_mb_mode[mb] = kModes[random.between(0, most_intra)];
            picture.g_mb_qp[mb] =
                static_cast<std::uint8_t>(std::clamp(qp + random.between(-3, 3), 0, 51));
            picture.g_lf_data[mb] = {random.between(0, 9) == 0,
                                     static_cast<std::int8_t>(random.between(-12, 12)),
                                     static_cast<std::int8_t>(random.between(-12, 12))};
            // What intra macroblocks have here is left over and means nothing.
            const unsigned coded = random.next() & random.next() & 0xffff;
            picture.g_coded_blocks[mb] =
                static_cast<std::uint16_t>(picture.g_mb_mode[mb] == MB_SKIP ? 0 : coded);
            _mv& mv = picture.g_mv_array[mb];
            mv.x = static_cast<std::int16_t>(random.between(-1, 1));
            mv.y = static_cast<std::int16_t>(random.between(-1, 0));
            mv.dx = static_cast<std::int8_t>(random.between(-3, 3));
            mv.dy = static_cast<std::int8_t>(random.between(0, 1));
        }
        DeblockReference reference(picture);
        reference.filter_picture();
        for (int mb = 0; mb < picture.g_num_mbs; ++mb) {
            coder.filter_mb(mb % picture.g_mb_width, mb / picture.g_mb_width);
        }
        const DeblockReference filtered(picture);
        for (int plane = 0; plane < 3; ++plane) {
            ASSERT_EQ(filtered.plane(plane).samples, reference.plane(plane).samples)
                << "plane " << plane << ", iteration " << iteration;
        }
    }
}

}  // namespace
