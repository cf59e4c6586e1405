#include "color/color_tables.h"

#include <cmath>
#include <mutex>

namespace zolt {

std::uint8_t TableCr[256], TableCg[256], TableCb[256];
std::uint8_t TableCu[511], TableCv[511];
std::int32_t TableE02xCr[256], TableE11xCb[256], TableE12xCr[256], TableE21xCb[256];

namespace {

std::once_flag tablesRGB2YUVAreFilled, tablesYUV2RGBAreFilled;

std::uint8_t floor_half_up(double value) {
    return static_cast<std::uint8_t>(std::floor(value + 0.5));
}

int round_half_away(double value) {
    return static_cast<int>(value < 0.0 ? value - 0.5 : value + 0.5);
}

}  // namespace

void fill_tables_rgb_to_yuv() {
    std::call_once(tablesRGB2YUVAreFilled, [] {
        for (int i = 0; i < 256; ++i) {
            TableCr[i] = floor_half_up(0.3 * i);
            TableCg[i] = floor_half_up(0.59 * i);
            TableCb[i] = floor_half_up(0.11 * i);
        }
        for (int d = -255; d <= 255; ++d) {
            TableCu[d + 255] = clamp255(round_half_away(128 + d * 0.5617977528089888));  // 1 / 1.78
            TableCv[d + 255] = clamp255(round_half_away(128 + d * 0.7142857142857143));  // 1 / 1.4
        }
    });
}

void fill_tables_yuv_to_rgb() {
    std::call_once(tablesYUV2RGBAreFilled, [] {
        for (int c = -128; c <= 127; ++c) {
            TableE02xCr[c + 128] = round_half_away(1.4 * c);
            TableE11xCb[c + 128] = round_half_away(-0.33186440677966106 * c);  // 0.11 * 1.78 / 0.59
            TableE12xCr[c + 128] = round_half_away(-0.711864406779661 * c);    // 0.3 * 1.4 / 0.59
            TableE21xCb[c + 128] = round_half_away(1.78 * c);
        }
    });
}

}  // namespace zolt
