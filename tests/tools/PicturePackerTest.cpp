#include "io/PicturePacker.h"

#include <gtest/gtest.h>

namespace zolt {
namespace {

using Bytes = std::vector<unsigned char>;

// What is in the sample's layout already is to be coded where it stands.
TEST(PicturePacker, KnowsWhatIsPacked) {
    const PictureFormat format{PictureFormat::kIyuv, 32, 16};
    const PicturePacker packer(format, format);
    const Bytes memory(4096);
    const unsigned char* const start = memory.data();
    const std::vector<PicturePacker::Rows> packed = {
        {start, 32, 16, 32}, {start + 512, 16, 8, 16}, {start + 640, 16, 8, 16}};
    EXPECT_TRUE(packer.is_packed(packed));

    auto apart = packed;
    apart[2].first += 64;
    EXPECT_FALSE(packer.is_packed(apart));
    auto exchanged = packed;
    std::swap(exchanged[1], exchanged[2]);
    EXPECT_FALSE(packer.is_packed(exchanged));
    auto wider = packed;
    wider[0].stride = 48;
    EXPECT_FALSE(packer.is_packed(wider));
    EXPECT_FALSE(PicturePacker(format, {PictureFormat::kIyuv, 32, 32}).is_packed(packed));
}

// Planes of files have whole chroma samples where the last luma pair is half a one.
TEST(PicturePacker, ExtendsTheRowsOfFiles) {
    const PictureFormat planar{PictureFormat::kIyuv, 3, 3};
    const Bytes luma = {1, 2, 3, 0, 4, 5, 6, 0, 7, 8, 9, 0};
    const Bytes cb = {11, 12, 13, 14};
    const Bytes cr = {21, 22, 23, 24};
    Bytes sample(24);
    PicturePacker(planar, {PictureFormat::kIyuv, 4, 4})
        .pack({{luma.data(), 4, 3, 3}, {cb.data(), 2, 2, 2}, {cr.data() + 2, -2, 2, 2}},
              sample.data());
    EXPECT_EQ(sample, (Bytes{1, 2, 3, 3, 4,  5,  6,  6,  7,  8,  9,  9,
                             7, 8, 9, 9, 11, 12, 13, 14, 23, 24, 21, 22}));

    // The second luma value of the last pair is no pixel.
    const Bytes row = {1, 101, 2, 201, 3, 103, 99, 203};
    Bytes extended(16);
    PicturePacker({PictureFormat::kYuy2, 3, 1}, {PictureFormat::kYuy2, 8, 1})
        .pack({{row.data(), 8, 1, 8}}, extended.data());
    EXPECT_EQ(extended, (Bytes{1, 101, 2, 201, 3, 103, 3, 203, 3, 103, 3, 203, 3, 103, 3, 203}));

    // A sample that ends with half a pair leaves the rest of it out.
    Bytes cut(6);
    PicturePacker({PictureFormat::kYuy2, 3, 1}, {PictureFormat::kYuy2, 3, 1})
        .pack({{row.data(), 8, 1, 8}}, cut.data());
    EXPECT_EQ(cut, (Bytes{1, 101, 2, 201, 3, 103}));
}

}  // namespace
}  // namespace zolt
