// The caller's frame, which the engine reads where it stands.

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "common/Encoding.h"

namespace {

using zolt_test::Encoding;
using zolt_test::Sequence;
using zolt_test::Settings;
using Bytes = std::vector<std::uint8_t>;

// Memory that can only be read, between pages that cannot be touched at all.
class GuardedFrame {
public:
    // at_end: the frame ends with the memory, otherwise it starts with it.
    GuardedFrame(const Bytes& frame, bool at_end) {
        const std::size_t page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
        const std::size_t room = (frame.size() + page - 1) / page * page;
        m_size = room + 2 * page;
        m_memory = mmap(nullptr, m_size, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        std::uint8_t* start = static_cast<std::uint8_t*>(m_memory) + page;
        if (m_memory == MAP_FAILED || mprotect(start, room, PROT_READ | PROT_WRITE) != 0) {
            ADD_FAILURE() << "no guarded memory";
            return;
        }
        std::uint8_t* const samples = start + (at_end ? room - frame.size() : 0);
        std::copy(frame.begin(), frame.end(), samples);
        EXPECT_EQ(mprotect(start, room, PROT_READ), 0);
        m_samples = samples;
    }
    GuardedFrame(const GuardedFrame&) = delete;
    GuardedFrame& operator=(const GuardedFrame&) = delete;
    ~GuardedFrame() { munmap(m_memory, m_size); }

    const std::uint8_t* samples() const { return m_samples; }

private:
    void* m_memory;
    std::size_t m_size = 0;
    const std::uint8_t* m_samples = nullptr;
};

// The top left width x height samples of a planar picture.
Bytes crop(const Bytes& picture, const Sequence& from, int width, int height) {
    Bytes cropped;
    auto plane = picture.begin();
    const auto take = [&](int from_width, int from_height, int columns, int rows) {
        for (int y = 0; y < rows; ++y) {
            const auto row = plane + static_cast<std::ptrdiff_t>(y) * from_width;
            cropped.insert(cropped.end(), row, row + columns);
        }
        plane += static_cast<std::ptrdiff_t>(from_width) * from_height;
    };
    take(from.width, from.height, width, height);
    take(from.width / 2, from.height / 2, width / 2, height / 2);
    take(from.width / 2, from.height / 2, width / 2, height / 2);
    return cropped;
}

class CallersFrame : public testing::TestWithParam<const zolt::Kernels*> {};

// Whatever lies around a frame, and however its rows are aligned: it gives what its macroblocks
// give alone in a picture. "cut" has intra macroblocks in P pictures, too.
TEST_P(CallersFrame, IsReadWhereItStands) {
    constexpr struct {
        int width, height;
    } kSizes[] = {{16, 16}, {17, 16}, {16, 31}, {31, 33}, {48, 32}, {49, 47}, {83, 35}, {150, 34}};
    for (const auto& [width, height] : kSizes) {
        const int width16 = width / 16 * 16, height16 = height / 16 * 16;
        const Sequence sequence = zolt_test::generated("cut", width, height, 7);
        for (const int qp : {4, 28}) {
            SCOPED_TRACE(sequence.name + ", QP " + std::to_string(qp));
            const Settings settings = {qp, 0, 30};
            Encoding expected(width16, height16, settings, GetParam());
            Encoding at_start(width, height, settings, GetParam());
            Encoding at_end(width, height, settings, GetParam());
            Bytes picture(sequence.picture_size());
            for (int n = 0; n < sequence.pictures; ++n) {
                sequence.draw(n, picture.data());
                const Bytes cropped = crop(picture, sequence, width16, height16);
                const Bytes unit = expected.encode(cropped.data());
                ASSERT_EQ(at_start.encode(GuardedFrame(picture, false).samples()), unit)
                    << "picture " << n;
                ASSERT_EQ(at_end.encode(GuardedFrame(picture, true).samples()), unit)
                    << "picture " << n;
                ASSERT_EQ(at_end.reconstruction(), expected.reconstruction()) << "picture " << n;
            }
        }
    }
}

std::vector<const zolt::Kernels*> tables() {
    std::vector<const zolt::Kernels*> list;
    for (const zolt::Kernels& table : zolt::kernel_tables()) {
        list.push_back(&table);
    }
    return list;
}
INSTANTIATE_TEST_SUITE_P(Tables, CallersFrame, testing::ValuesIn(tables()),
                         [](const auto& test) { return std::string(test.param->name); });

}  // namespace
