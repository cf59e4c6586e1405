#include <algorithm>

#include "encoder/MacroblockCoder.h"

namespace {

// Availability of the neighbour C of a partition, by k = bx + 4 * by + w / 4: the position right of
// the block above its top right block (clause 6.4.11.7). Column 4 is the next macroblock.
constexpr std::uint8_t test_up[17] = {0, 1, 1, 1};
constexpr std::uint8_t test_up_right[17] = {0, 0, 0, 0, 1};
constexpr std::uint8_t test_interior[17] = {0, 0, 0, 0, 0, 1, 0, 1, 0, 1, 1, 1, 0, 1, 0, 1, 0};

int median(int a, int b, int c) {
    return std::max(std::min(a, b), std::min(std::max(a, b), c));
}

// A neighbouring partition of the vector prediction; not available: ref -1, zero vector.
struct Neighbour {
    bool available = false;
    int ref = -1;
    std::int16_t x = 0, y = 0;
};

// Farthest position outside the picture that a prediction is read from; what lies beyond repeats
// the border.
constexpr int kLumaOverhang = 20;
constexpr int kChromaOverhang = 10;
constexpr int kFarOverhang = 3;  // beyond the right and lower edges

}  // namespace

void MacroblockCoder::form_mv_prediction(std::int16_t* pmv_x, std::int16_t* pmv_y, std::int8_t ref,
                                         int bx, int by, int w, int h) const {
    const std::ptrdiff_t origin =
        static_cast<std::ptrdiff_t>(4 * g_mb_y + by) * picture.g_blk_width + 4 * g_mb_x + bx;
    const auto neighbour = [&](bool available, std::ptrdiff_t offset) {
        Neighbour n;
        if (available) {
            n.available = true;
            n.ref = picture.g_blk_ref[origin + offset];
            n.x = picture.g_blk_mvx[origin + offset];
            n.y = picture.g_blk_mvy[origin + offset];
        }
        return n;
    };
    const int k = bx + 4 * by + w / 4;
    const bool up_right_exists = g_mb_y > 0 && g_mb_x < picture.g_mb_width - 1;
    const Neighbour a = neighbour(bx > 0 || g_mb_left, -1);
    const Neighbour b = neighbour(by > 0 || g_mb_up, -picture.g_blk_width);
    Neighbour c = neighbour(
        (test_up[k] && g_mb_up) || (test_up_right[k] && up_right_exists) || test_interior[k],
        w / 4 - picture.g_blk_width);
    if (!c.available) {  // D stands in for C
        c = neighbour((bx > 0 || g_mb_left) && (by > 0 || g_mb_up), -1 - picture.g_blk_width);
    }

    const bool match_a = a.ref == ref;
    const bool match_b = b.ref == ref;
    const bool match_c = c.ref == ref;
    const Neighbour* chosen = nullptr;
    if (match_a + match_b + match_c == 1) {
        chosen = match_a ? &a : match_b ? &b : &c;
    } else if (w == 8 && h == 16) {
        chosen = bx == 0 ? (match_a ? &a : nullptr) : (match_c ? &c : nullptr);
    } else if (w == 16 && h == 8) {
        chosen = by == 0 ? (match_b ? &b : nullptr) : (match_a ? &a : nullptr);
    }
    if (!chosen && !b.available && !c.available) {
        chosen = &a;
    }
    *pmv_x = chosen ? chosen->x : static_cast<std::int16_t>(median(a.x, b.x, c.x));
    *pmv_y = chosen ? chosen->y : static_cast<std::int16_t>(median(a.y, b.y, c.y));
}

void MacroblockCoder::qpmc_16x16_L0(std::uint8_t* pred, int mvx, int mvy, int px, int py) const {
    const int x = std::clamp((mvx + 4 * px) >> 2, -kLumaOverhang, picture.g_width16 + kFarOverhang);
    const int y =
        std::clamp((mvy + 4 * py) >> 2, -kLumaOverhang, picture.g_height16 + kFarOverhang);
    const int fx = mvx & 3;
    const int fy = mvy & 3;
    const std::ptrdiff_t stride = picture.g_stride_luma;
    const std::ptrdiff_t position = y * stride + x;
    const std::uint8_t* full = picture.g_ref_y + position;
    const std::uint8_t* horizontal = picture.g_half_h_L0 + position;  // b
    const std::uint8_t* vertical = picture.g_half_v_L0 + position;    // h

    // The two samples that clause 8.4.2.2.1 averages: in an even row or column of the
    // quarter-sample grid one of them lies on it, elsewhere they are the nearest b and h.
    if (fx == 0) {
        if (fy == 0) {
            g_kernels->copy_16x16(pred, full, stride);
        } else if (fy == 2) {
            g_kernels->copy_16x16(pred, vertical, stride);
        } else {
            g_kernels->average_16x16(pred, fy == 3 ? full + stride : full, stride, vertical,
                                     stride);
        }
    } else if (fy == 0) {
        if (fx == 2) {
            g_kernels->copy_16x16(pred, horizontal, stride);
        } else {
            g_kernels->average_16x16(pred, fx == 3 ? full + 1 : full, stride, horizontal, stride);
        }
    } else if (fx == 2 || fy == 2) {
        g_kernels->centre_16x16(pred, full, stride);
        if (fy != 2) {
            g_kernels->average_16x16(pred, fy == 3 ? horizontal + stride : horizontal, stride, pred,
                                     16);
        } else if (fx != 2) {
            g_kernels->average_16x16(pred, fx == 3 ? vertical + 1 : vertical, stride, pred, 16);
        }
    } else {
        g_kernels->average_16x16(pred, fy == 3 ? horizontal + stride : horizontal, stride,
                                 fx == 3 ? vertical + 1 : vertical, stride);
    }
}

void MacroblockCoder::qpmc_c_core(std::uint8_t* pred, int mvx, int mvy, int cx, int cy) const {
    const int x =
        std::clamp((mvx + 8 * cx) >> 3, -kChromaOverhang, picture.g_cwidth + kFarOverhang);
    const int y =
        std::clamp((mvy + 8 * cy) >> 3, -kChromaOverhang, picture.g_cheight + kFarOverhang);
    const std::ptrdiff_t position = static_cast<std::ptrdiff_t>(y) * picture.g_stride_chroma + x;
    g_kernels->chroma_8x8(pred, picture.g_ref_u + position, picture.g_ref_v + position,
                          picture.g_stride_chroma, mvx & 7, mvy & 7);
}
