#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdio>
#include <functional>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "RecordingConsumer.h"
#include "avc/VideoAvcParser.h"

// The same stream gives the same samples however it is cut into pieces.

namespace {

using zolt::RecordedSample;
using zolt::RecordingConsumer;
using Bytes = std::vector<unsigned char>;

constexpr double kRate = 25;

// Gives the next piece's length.
using Cutter = std::function<int()>;

std::vector<RecordedSample> samples_of(const Bytes& stream, const Cutter& next_length) {
    RecordingConsumer consumer;
    VideoAvcParser parser(&consumer, kRate);
    for (std::size_t pos = 0; pos < stream.size();) {
        const std::size_t left = stream.size() - pos;
        const int length =
            static_cast<int>(std::min(left, static_cast<std::size_t>(next_length())));
        // A piece of its own, so that a read beyond it is seen.
        const Bytes piece(stream.data() + pos, stream.data() + pos + length);
        parser.PutNextAvcData(piece.data(), length);
        pos += static_cast<std::size_t>(length);
    }
    parser.Flush();
    EXPECT_EQ(consumer.ends, 1);
    return consumer.samples;
}

// The samples by the definition of the byte stream, found without the parser.
std::vector<RecordedSample> expected_samples(const Bytes& stream) {
    std::vector<std::size_t> starts;
    for (std::size_t i = 2; i < stream.size(); ++i) {
        if (stream[i] == 1 && stream[i - 1] == 0 && stream[i - 2] == 0) {
            starts.push_back(i >= 3 && stream[i - 3] == 0 ? i - 3 : i - 2);
        }
    }
    starts.push_back(stream.size());
    std::vector<RecordedSample> samples;
    bool has_sps = false;
    bool has_pps = false;
    bool was_sync = false;
    for (std::size_t unit = 0; unit + 1 < starts.size(); ++unit) {
        const Bytes bytes(stream.begin() + static_cast<std::ptrdiff_t>(starts[unit]),
                          stream.begin() + static_cast<std::ptrdiff_t>(starts[unit + 1]));
        const std::size_t header = bytes[2] == 1 ? 3 : 4;
        const int type = header < bytes.size() ? bytes[header] & 31 : 0;
        const bool is_last = unit + 2 == starts.size();
        if ((has_sps && has_pps) || is_last) {
            const auto time = static_cast<long long>(samples.size()) * 40000;
            samples.push_back({bytes, time, is_last ? was_sync : type == 5});
        }
        has_sps = has_sps || type == 7;
        has_pps = has_pps || type == 8;
        was_sync = type == 5;
    }
    return samples;
}

void expect_same_samples(const Bytes& stream, unsigned seed) {
    std::mt19937 random(seed);
    const std::vector<RecordedSample> expected = expected_samples(stream);
    ASSERT_FALSE(expected.empty());
    const auto up_to = [&](int most) {
        return [&random, most] { return std::uniform_int_distribution<>(1, most)(random); };
    };
    EXPECT_TRUE(samples_of(stream, [&] { return static_cast<int>(stream.size()); }) == expected);
    EXPECT_TRUE(samples_of(stream, [] { return 1; }) == expected);
    EXPECT_TRUE(samples_of(stream, up_to(7)) == expected);
    EXPECT_TRUE(samples_of(stream, up_to(5000)) == expected);
    EXPECT_TRUE(samples_of(stream, up_to(200000)) == expected);
}

// Units of random types and lengths that are rich in zeros, 01 and 03 bytes, behind start codes of
// both lengths. The last unit is long enough not to be held back.
Bytes random_stream(std::mt19937& random) {
    const auto below = [&](int limit) {
        return std::uniform_int_distribution<>(0, limit - 1)(random);
    };
    static constexpr std::array<unsigned char, 6> kFrequent = {0, 0, 0, 1, 2, 3};
    Bytes stream;
    const auto add_zeros = [&](int count) {
        stream.insert(stream.end(), static_cast<std::size_t>(count), 0);
    };
    const int units = 20 + below(50);
    for (int unit = 0; unit < units; ++unit) {
        add_zeros(2 + below(2));
        stream.push_back(1);
        static constexpr std::array<unsigned char, 8> kHeaders = {0x67, 0x68, 0x65, 0x41,
                                                                  0x01, 0x06, 0x09, 0x1f};
        if (below(20) == 0) {
            continue;
        }
        stream.push_back(kHeaders[static_cast<std::size_t>(below(8))]);
        const int length = below(30) == 0 ? 60000 + below(150000) : below(40);
        const bool is_dense = below(2) == 0;
        for (int i = 0; i < length; ++i) {
            stream.push_back(is_dense ? kFrequent[static_cast<std::size_t>(below(6))]
                                      : static_cast<unsigned char>(below(256)));
        }
        add_zeros(below(4) == 0 ? below(9) : 0);
    }
    const Bytes last = {0, 0, 1, 0x41, 0x9a, 0xff, 0xff, 0xff};
    stream.insert(stream.end(), last.begin(), last.end());
    return stream;
}

TEST(StreamCuts, RandomUnits) {
    for (unsigned seed = 0; seed < 30; ++seed) {
        SCOPED_TRACE(seed);
        std::mt19937 random(seed);
        expect_same_samples(random_stream(random), seed);
    }
}

// What a command writes to standard output; nothing when it fails.
Bytes output_of(const std::string& command) {
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> pipe(popen(command.c_str(), "r"), pclose);
    Bytes bytes;
    std::array<unsigned char, 65536> piece;
    while (const std::size_t size = std::fread(piece.data(), 1, piece.size(), pipe.get())) {
        bytes.insert(bytes.end(), piece.data(), piece.data() + size);
    }
    return bytes;
}

TEST(StreamCuts, CodedStreams) {
    const std::string ffmpeg = "ffmpeg -v error ";
    const std::string picture = "-f lavfi -i testsrc2=s=352x288:r=25:d=2 ";
    const std::string raw = "-f h264 - 2>/dev/null";
    const std::vector<std::string> commands = {
        ffmpeg + picture + "-c:v libx264 " + raw,
        ffmpeg + picture + "-c:v libx264 -profile:v baseline -x264-params slices=5:aud=1 " + raw,
        // Through a container, which drops the start codes; the parameter sets come back in-band.
        ffmpeg + picture + "-c:v libx264 -x264-params keyint=10 -f matroska - 2>/dev/null | " +
            ffmpeg + "-i - -c copy -bsf:v h264_mp4toannexb " + raw,
        std::string(ZOLTENC) + " -q -b 300 -g 12 -n 40 -o - synthetic:176x144@25 2>/dev/null",
    };
    int streams = 0;
    for (const std::string& command : commands) {
        SCOPED_TRACE(command);
        const Bytes stream = output_of(command);
        if (stream.empty()) {
            std::printf("not there: %s\n", command.c_str());
            continue;
        }
        ++streams;
        expect_same_samples(stream, 1);
    }
    if (streams == 0) {
        GTEST_SKIP() << "no encoder is there";
    }
}

}  // namespace
