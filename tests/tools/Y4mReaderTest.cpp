#include "io/Y4mReader.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include "io/ToolError.h"

namespace zolt {
namespace {

TEST(Y4mHeader, GivesSizeRateAndScan) {
    struct Case {
        const char* line;
        int width;
        int height;
        const char* frame_rate;  // "" where none is stated
        bool interlaced;
    };
    const Case cases[] = {
        {"YUV4MPEG2 W176 H144 F30000:1001 Ip A128:117 C420jpeg", 176, 144, "30000/1001", false},
        {"YUV4MPEG2 H144 W176", 176, 144, "", false},
        {"YUV4MPEG2  W16  H16  F50:2  C420 ", 16, 16, "25", false},
        {"YUV4MPEG2 W17 H33 F0:0 I? A0:0 C420mpeg2 XYSCSS=420MPEG2 Xother=W1", 17, 33, "", false},
        {"YUV4MPEG2 W720 H576 F25 It C420paldv XCOLORRANGE=LIMITED", 720, 576, "25", true},
        {"YUV4MPEG2 W7680 H4320 Ib Q12", 7680, 4320, "", true},
        {"YUV4MPEG2 W16 H16 F2147483647:1 Im", 16, 16, "2147483647", true},
    };
    for (const Case& expected : cases) {
        SCOPED_TRACE(expected.line);
        const Y4mHeader header = Y4mHeader::parse(expected.line, "x");
        EXPECT_EQ(header.width, expected.width);
        EXPECT_EQ(header.height, expected.height);
        EXPECT_EQ(header.frame_rate ? header.frame_rate->to_string() : "", expected.frame_rate);
        EXPECT_EQ(header.interlaced, expected.interlaced);
    }
}

TEST(Y4mHeader, RefusesWithFileAndReasonOnOneLine) {
    const std::pair<const char*, const char*> cases[] = {
        {"", "Y4M header"},
        {"YUV4MPEG", "Y4M header"},
        {"YUV4MPEG2W176 H144", "Y4M header"},
        {"YUV4MPEG2", "width is missing"},
        {"YUV4MPEG2 W176", "height is missing"},
        {"YUV4MPEG2 W H144", "width ''"},
        {"YUV4MPEG2 W-176 H144", "width '-176'"},
        {"YUV4MPEG2 W+176 H144", "width '+176'"},
        {"YUV4MPEG2 W176 H0x90", "height '0x90'"},
        {"YUV4MPEG2 W0 H144", "width '0'"},
        {"YUV4MPEG2 W99999999999999999999 H144", "width '99999"},
        {"YUV4MPEG2 W4294967312 H16", "width '4294967312'"},
        {"YUV4MPEG2 W2147483647 H2147483647", "too large"},
        {"YUV4MPEG2 W16384 H16384", "too large"},
        {"YUV4MPEG2 W15 H144", "smallest is 16x16"},
        {"YUV4MPEG2 W176 H8", "smallest is 16x16"},
        {"YUV4MPEG2 W16 H16 F30fps", "frame rate '30fps'"},
        {"YUV4MPEG2 W16 H16 F-30:1", "frame rate '-30:1'"},
        {"YUV4MPEG2 W16 H16 F30:0", "frame rate '30:0'"},
        {"YUV4MPEG2 W16 H16 F30:1:1", "frame rate '30:1:1'"},
        {"YUV4MPEG2 W16 H16 C420p10", "'420p10' is not 8-bit 4:2:0"},
        {"YUV4MPEG2 W16 H16 C444", "'444' is not 8-bit 4:2:0"},
        {"YUV4MPEG2 W16 H16 Cmono", "'mono' is not 8-bit 4:2:0"},
        {"YUV4MPEG2 W16 H16 C", "'' is not 8-bit 4:2:0"},
        {"YUV4MPEG2 W16 H16\t\x1B[2J", "height '16??[2J'"},
    };
    for (const auto& [line, reason] : cases) {
        SCOPED_TRACE(line);
        try {
            Y4mHeader::parse(line, "clip.y4m");
            ADD_FAILURE() << "accepted";
        } catch (const ToolError& error) {
            const std::string message = error.what();
            EXPECT_EQ(message.rfind("clip.y4m: ", 0), 0u) << message;
            EXPECT_NE(message.find(reason), std::string::npos) << message;
            EXPECT_EQ(message.find_first_of("\n\x1B"), std::string::npos) << message;
            EXPECT_LT(message.size(), 250u);
        }
    }
}

// A file that goes away with the object.
class TemporaryFile {
public:
    explicit TemporaryFile(const std::string& content)
        : name_(testing::TempDir() + "zolt_y4m_" + std::to_string(getpid())) {
        std::FILE* const file = std::fopen(name_.c_str(), "wb");
        std::fwrite(content.data(), 1, content.size(), file);
        std::fclose(file);
    }
    ~TemporaryFile() { std::remove(name_.c_str()); }
    const std::string& name() const { return name_; }

private:
    std::string name_;
};

constexpr const char* kHeader = "YUV4MPEG2 W17 H17 C420\n";
// 17x17 in a file: luma and two chroma planes of 9x9; in a sample: chroma planes of 8x8.
constexpr std::size_t kFileBytes = 17 * 17 + 2 * 9 * 9;
constexpr std::size_t kSampleBytes = 17 * 17 + 2 * 8 * 8;

std::string picture(int seed) {
    std::string bytes(kFileBytes, '\0');
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        bytes[i] = static_cast<char>(i * 7 + seed);
    }
    return bytes;
}

TEST(Y4mReader, LeavesOutTheChromaOfHalfPairsInPicturesOfOddSize) {
    const std::string stored = picture(1);
    const TemporaryFile file(kHeader + ("FRAME\n" + stored) + "FRAME Ip XFOO=1\n" + picture(2));
    Y4mReader reader{ByteReader(file.name())};
    ASSERT_EQ(reader.format().file_bytes(), kFileBytes);
    ASSERT_EQ(reader.format().sample_bytes(), kSampleBytes);
    EXPECT_EQ(reader.frames_left(), 2);

    std::string expected = stored.substr(0, 17 * 17);
    for (int plane = 0; plane < 2; ++plane) {
        for (int row = 0; row < 8; ++row) {
            expected += stored.substr(17 * 17 + plane * 81 + row * 9, 8);
        }
    }
    std::vector<unsigned char> sample(kSampleBytes);
    ASSERT_TRUE(reader.read(sample));
    EXPECT_EQ(std::string(sample.begin(), sample.end()), expected);
    EXPECT_TRUE(reader.read(sample));
    EXPECT_EQ(sample[0], 2);
    EXPECT_FALSE(reader.read(sample));
}

// Every possible end of a stream of two pictures: a header that is cut off, whole pictures, or the
// report of the picture that is not whole.
TEST(Y4mReader, ReportsACutAtEveryByte) {
    const std::string header = kHeader;
    const std::string frame = "FRAME\n" + picture(3);
    const std::string whole = header + frame + frame;
    std::vector<unsigned char> sample(kSampleBytes);
    for (std::size_t length = 1; length <= whole.size(); ++length) {
        SCOPED_TRACE(length);
        const TemporaryFile file(whole.substr(0, length));
        if (length < header.size()) {
            EXPECT_THROW(Y4mReader{ByteReader(file.name())}, TruncatedInput);
            continue;
        }
        Y4mReader reader{ByteReader(file.name())};
        const std::size_t frames = (length - header.size()) / frame.size();
        for (std::size_t i = 0; i < frames; ++i) {
            EXPECT_TRUE(reader.read(sample));
        }
        if ((length - header.size()) % frame.size() == 0) {
            EXPECT_FALSE(reader.read(sample));
        } else {
            EXPECT_THROW(reader.read(sample), TruncatedInput);
        }
    }
}

TEST(Y4mReader, RefusesWhatIsNoFrameLine) {
    for (const std::string line : {"FRAMES\n", "frame\n", "\n", "FRAM\n"}) {
        SCOPED_TRACE(line);
        const TemporaryFile file(kHeader + line + picture(0));
        Y4mReader reader{ByteReader(file.name())};
        std::vector<unsigned char> sample(kSampleBytes);
        try {
            reader.read(sample);
            FAIL() << "accepted";
        } catch (const TruncatedInput&) {
            FAIL() << "taken for a cut";
        } catch (const ToolError&) {}
    }
}

TEST(Y4mReader, RefusesLinesWithoutEnd) {
    const TemporaryFile header("YUV4MPEG2 W16 H16 X" + std::string(100000, 'x') + "\n");
    EXPECT_THROW(Y4mReader{ByteReader(header.name())}, ToolError);

    const TemporaryFile frame(kHeader + ("FRAME X" + std::string(100000, 'x')));
    Y4mReader reader{ByteReader(frame.name())};
    std::vector<unsigned char> sample(kSampleBytes);
    EXPECT_THROW(reader.read(sample), ToolError);
}

}  // namespace
}  // namespace zolt
