// The streams of generated sequences against digests kept in a file, with every kernel table: any
// change of a decision shows as the first picture whose NAL unit differs. With the environment
// variable ZOLT_WRITE_GOLDEN set the program writes the file anew.

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <map>
#include <sstream>

#include "common/Encoding.h"
#include "common/Workers.h"

namespace {

using zolt_test::Encoding;
using zolt_test::generated;
using zolt_test::Sequence;
using zolt_test::Settings;

const char kFile[] = ZOLT_GOLDEN_DIRECTORY "/digests.txt";

struct Case {
    const char* kind;
    int width, height, pictures;
    Settings settings;

    Sequence sequence() const { return generated(kind, width, height, pictures); }
    std::string name() const { return sequence().name + "_" + settings.name(); }
};

const Case kCases[] = {
    {"gradient", 64, 48, 12, {10, 0, 5}},
    {"gradient", 178, 146, 6, {28, 200000, 30}},
    {"zoom", 176, 144, 20, {28, 0, 30}},
    {"zoom", 176, 144, 40, {28, 200000, 15, 15}},
    {"zoom", 352, 288, 5, {18, 0, 300}},
    {"noise", 48, 80, 5, {0, 0, 2}},
    {"noise", 64, 64, 30, {40, 4000000, 30}},
    {"still", 64, 48, 8, {22, 0, 30}},
    {"cut", 176, 144, 20, {34, 0, 30}},
    {"cut", 176, 144, 40, {28, 64000, 20, 30}},
    {"flat", 64, 48, 12, {51, 0, 30}},
    {"fade", 176, 144, 30, {35, 0, 30}},
    {"fade", 176, 144, 48, {24, 800000, 30, 30}},
    {"pan", 176, 144, 12, {26, 0, 30}},
    {"pan", 16, 144, 24, {28, 100000, 7}},
    {"drop", 48, 208, 10, {24, 0, 30}},
    {"pan", 176, 16, 24, {6, 0, 7}},
    {"checker", 48, 80, 12, {1, 0, 7}},
    {"checker", 48, 80, 20, {45, 200000, 300}},
};

using Digests = std::vector<std::string>;

// FNV-1a, 64 bits, in hexadecimal digits.
std::string digest(const std::vector<std::uint8_t>& bytes) {
    std::uint64_t hash = 0xcbf29ce484222325u;
    for (const std::uint8_t byte : bytes) {
        hash = (hash ^ byte) * 0x100000001b3u;
    }
    std::ostringstream digits;
    digits << std::hex << hash;
    return digits.str();
}

Digests digests(const Case& c, const zolt::Kernels* kernels, WorkerPool* pool = nullptr) {
    const Sequence sequence = c.sequence();
    Encoding encoding(sequence.width, sequence.height, c.settings, kernels);
    encoding.engine().set_worker_pool(pool);
    std::vector<std::uint8_t> picture(sequence.picture_size());
    Digests result;
    for (int n = 0; n < sequence.pictures; ++n) {
        sequence.draw(n, picture.data());
        result.push_back(digest(encoding.encode(picture.data())));
    }
    return result;
}

// A line of the file: the name of a case, then the digests of its pictures.
std::map<std::string, Digests> read_golden() {
    std::map<std::string, Digests> golden;
    std::ifstream file(kFile);
    for (std::string line; std::getline(file, line);) {
        std::istringstream words(line);
        std::string name;
        words >> name;
        for (std::string word; words >> word;) {
            golden[name].push_back(word);
        }
    }
    return golden;
}

void write_golden() {
    std::ofstream file(kFile);
    for (const Case& c : kCases) {
        file << c.name();
        for (const std::string& d : digests(c, &zolt::scalar_kernels())) {
            file << ' ' << d;
        }
        file << '\n';
    }
}

class Golden : public testing::TestWithParam<Case> {
protected:
    static void SetUpTestSuite() {
        if (std::getenv("ZOLT_WRITE_GOLDEN")) {
            write_golden();
        }
        golden = read_golden();
    }

    static void expect_golden(const Digests& actual, const std::string& how) {
        const Digests& expected = golden[GetParam().name()];
        ASSERT_EQ(actual.size(), expected.size()) << kFile << " does not have it, or not so long";
        for (std::size_t n = 0; n < actual.size(); ++n) {
            ASSERT_EQ(actual[n], expected[n])
                << "picture " << n << " is the first that differs, " << how;
        }
    }

    static std::map<std::string, Digests> golden;
};

std::map<std::string, Digests> Golden::golden;

TEST_P(Golden, EveryTableGivesTheStream) {
    for (const zolt::Kernels& kernels : zolt::kernel_tables()) {
        expect_golden(digests(GetParam(), &kernels), kernels.name);
        for (const int count : {2, 3, 8}) {
            zolt_test::Workers workers(count);
            expect_golden(digests(GetParam(), &kernels, &workers),
                          kernels.name + std::string(", workers: ") + std::to_string(count));
        }
    }
}

TEST_P(Golden, EveryRunnerGivesTheStream) {
    using zolt_test::Order;
    const std::pair<int, Order> runners[] = {
        {2, Order::kAtOnce},   {3, Order::kAtOnce},  {5, Order::kAtOnce},    {4, Order::kSerial},
        {4, Order::kReversed}, {3, Order::kDelayed}, {1000, Order::kSerial}, {-1, Order::kSerial}};
    for (const auto& [count, order] : runners) {
        zolt_test::Workers workers(count, order);
        expect_golden(digests(GetParam(), nullptr, &workers),
                      order_name(order) + ", workers: " + std::to_string(count));
    }
}

INSTANTIATE_TEST_SUITE_P(Cases, Golden, testing::ValuesIn(kCases),
                         [](const auto& test) { return test.param.name(); });

}  // namespace
