// The check that the stream tests stand on has to fail when there is something wrong.

#include <gtest/gtest.h>

#include "common/Decoder.h"
#include "common/Encoding.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

// A stream of three pictures, sent with a change: returns what the decoder has to say.
template <typename Change>
std::string check_with(Change change) {
    const zolt_test::Sequence sequence = zolt_test::generated("zoom", 48, 32, 3);
    zolt_test::Encoding encoding(48, 32, {20, 0, 30});
    zolt_test::Decoder decoder(48, 32);
    const auto send_set = [&](const Bytes& set) {
        decoder.send_parameter_set(set.data(), static_cast<int>(set.size()));
    };
    send_set(encoding.sequence_parameter_set());
    send_set(encoding.picture_parameter_set());
    Bytes picture(sequence.picture_size());
    for (int n = 0; n < sequence.pictures; ++n) {
        sequence.draw(n, picture.data());
        Bytes nal = encoding.encode(picture.data());
        Bytes expected = encoding.reconstruction();
        change(n, nal, expected);
        decoder.send_picture(nal.data(), static_cast<int>(nal.size()), expected);
    }
    return decoder.finish();
}

TEST(DecoderCheck, Succeeds) {
    EXPECT_EQ(check_with([](int, Bytes&, Bytes&) {}), "");
}

TEST(DecoderCheck, NamesTheFirstSampleThatDiffers) {
    EXPECT_EQ(check_with([](int n, Bytes&, Bytes& expected) {
                  expected[247] = static_cast<std::uint8_t>(expected[247] + (n == 1 ? 1 : 0));
              }).find("picture 1: sample 247 is "),
              0u);
}

TEST(DecoderCheck, ReportsADamagedOrMissingPicture) {
    EXPECT_NE(check_with([](int n, Bytes& nal, Bytes&) {
                  nal[nal.size() / 2] ^= static_cast<std::uint8_t>(n == 0 ? 0x5a : 0);
              }),
              "");
    // A type of NAL unit that decoders pass over.
    EXPECT_EQ(check_with([](int n, Bytes& nal, Bytes&) {
                  nal[0] = n == 2 ? 0x5e : nal[0];
              }).find("1 pictures have not been decoded"),
              0u);
}

}  // namespace
