#include <gtest/gtest.h>

#include <set>
#include <string>

#include "media/ExpDecayAverage.h"
#include "media/IMediaConfig.h"
#include "media/MediaStreamConfig.h"
#include "media/MediaType.h"

namespace {

using zolt::fourcc;

TEST(MediaType, KindsFollowTheNames) {
    std::set<int> codes;
    for (const auto& row : MediaType::MediaMap) {
        const std::string name = row.name;
        SCOPED_TRACE(name);
        codes.insert(row.code);
        const std::string kind = name.substr(0, name.find(' '));
        EXPECT_EQ(MediaType::IsAudio(row.code), kind == "Audio");
        EXPECT_EQ(MediaType::IsVideo(row.code), kind == "Video");
        EXPECT_EQ(MediaType::IsText(row.code),
                  kind == "Text" || kind == "3GPP" || kind == "Closed");
        const int decoded = MediaType::GetDecMediaType(row.code);
        EXPECT_EQ(decoded, MediaType::IsAudio(row.code)   ? fourcc("unca")
                           : MediaType::IsVideo(row.code) ? fourcc("uncv")
                           : MediaType::IsText(row.code)  ? fourcc("text")
                                                          : fourcc("####"));
        EXPECT_EQ(MediaType::ToString(row.code), name);
        EXPECT_EQ(MediaType::ToMediaType(row.name), row.code);
    }
    EXPECT_EQ(codes.size(), 22u);
}

TEST(MediaType, AnswersUnknownInput) {
    EXPECT_STREQ(MediaType::ToString(0x61766331), "Video AVC");
    EXPECT_STREQ(MediaType::ToString(fourcc("AVC1")), "Unknown Media Type");
    EXPECT_STREQ(MediaType::ToString(0), "Unknown Media Type");
    EXPECT_EQ(MediaType::ToMediaType("HREF"), 0x68726566);
    EXPECT_EQ(MediaType::ToMediaType("Video Avc"), 0x23232323);
    EXPECT_EQ(MediaType::ToMediaType("Video AVC "), 0x23232323);
    EXPECT_EQ(MediaType::ToMediaType(""), 0x23232323);
    EXPECT_EQ(MediaType::ToMediaType(nullptr), 0x23232323);
    EXPECT_EQ(MediaType::GetDecMediaType(-1), 0x23232323);
    EXPECT_STREQ(MediaType::CapTypeString(fourcc("wind")), "Window/Desktop Capture");
    EXPECT_STREQ(MediaType::CapTypeString(fourcc("####")), "Capture Type Undefined");
    EXPECT_STREQ(MediaType::CapTypeString(fourcc("avc1")), "Unknown Capture Type");
}

TEST(MediaStreamConfig, KeepsACopyOfTheKey) {
    struct Config : IMediaConfig {
    } description;
    unsigned char key[3] = {1, 2, 3};
    MediaStreamConfig config(fourcc("avc1"), &description, key, 3);
    key[0] = 99;
    unsigned char* stored = nullptr;
    ASSERT_EQ(config.GetCryptoSessionKey(&stored), 3);
    EXPECT_NE(stored, key);
    EXPECT_EQ(stored[0], 1);
    EXPECT_EQ(stored[2], 3);
    EXPECT_TRUE(config.IsEncrypted());
    EXPECT_EQ(config.GetMediaType(), fourcc("avc1"));
    EXPECT_EQ(config.GetMediaConfig(), &description);
    EXPECT_EQ(config.GetBwAdaptConfig(), nullptr);
}

TEST(MediaStreamConfig, HasNoKeyUnlessGivenOne) {
    MediaStreamConfig plain(1, nullptr);
    MediaStreamConfig flagged(1, nullptr, true);
    MediaStreamConfig null_key(1, nullptr, nullptr, 16);
    for (MediaStreamConfig* config : {&plain, &flagged, &null_key}) {
        unsigned char other = 0;
        unsigned char* stored = &other;
        EXPECT_EQ(config->GetCryptoSessionKey(&stored), 0);
        EXPECT_EQ(stored, nullptr);
        EXPECT_EQ(config->IsEncrypted(), config == &flagged);
    }
    unsigned char key = 7;
    MediaStreamConfig negative(1, nullptr, &key, -5);
    unsigned char* stored = nullptr;
    EXPECT_EQ(negative.GetCryptoSessionKey(&stored), 0);
    EXPECT_TRUE(negative.IsEncrypted());
}

TEST(ExpDecayAverage, WeighsTheNewestValue) {
    ExpDecayAverage by_default;
    EXPECT_DOUBLE_EQ(by_default.Update(10), 10);
    EXPECT_DOUBLE_EQ(by_default.Update(20), 10.2);
    by_default.Reset();
    EXPECT_DOUBLE_EQ(by_default.Update(-3), -3);

    ExpDecayAverage quarter(4);
    quarter.Update(0);
    EXPECT_DOUBLE_EQ(quarter.Update(1), 0.25);

    ExpDecayAverage half(0.5);
    half.Update(0);
    half.Update(1);
    EXPECT_DOUBLE_EQ(half.Update(1), 0.75);

    for (const int n : {1, 0, -4}) {
        ExpDecayAverage last_only(n);
        last_only.Update(5);
        EXPECT_DOUBLE_EQ(last_only.Update(8), 8) << n;
    }
}

}  // namespace
