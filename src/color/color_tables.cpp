#include "color/color_tables.h"

#include <algorithm>
#include <iterator>

namespace zolt {

std::uint8_t TableCr[256], TableCg[256], TableCb[256];
std::uint8_t TableCu[511], TableCv[511];
std::int32_t TableE02xCr[256], TableE11xCb[256], TableE12xCr[256], TableE21xCb[256];

namespace {

template <typename T, std::size_t kCount>
void fill(T (&table)[kCount], const T (&rule)[kCount]) {
    std::copy(std::begin(rule), std::end(rule), table);
}

}  // namespace

void fill_tables_rgb_to_yuv() {
    [[maybe_unused]] static const bool tablesRGB2YUVAreFilled = [] {
        fill(TableCr, kColorRules.luma_of_r);
        fill(TableCg, kColorRules.luma_of_g);
        fill(TableCb, kColorRules.luma_of_b);
        fill(TableCu, kColorRules.u);
        fill(TableCv, kColorRules.v);
        return true;
    }();
}

void fill_tables_yuv_to_rgb() {
    [[maybe_unused]] static const bool tablesYUV2RGBAreFilled = [] {
        fill(TableE02xCr, kColorRules.r_of_v);
        fill(TableE11xCb, kColorRules.g_of_u);
        fill(TableE12xCr, kColorRules.g_of_v);
        fill(TableE21xCb, kColorRules.b_of_u);
        return true;
    }();
}

}  // namespace zolt
