// A host whose stack is aligned to 4 bytes and no more, as code of other compilers for 32-bit x86
// leaves it. This file is compiled like such a host: its functions keep their frames' alignment as
// they find it.

#include <gtest/gtest.h>

#include <memory>
#include <random>

#include "SessionFakes.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/abi.h"
#include "support/dl.h"

namespace {

constexpr int kWidth = 70;
constexpr int kHeight = 37;
constexpr int kPictures = 5;

struct Trial {
    void* library;
    std::vector<Bytes> units;
};

// Everything that a host does with the library; pictures that move, in a format to be converted.
void encode(Trial* trial) {
    const auto find = [trial](const char* name) { return dlsym(trial->library, name); };
    if (reinterpret_cast<int (*)()>(find("GetEncoderType"))() != MediaType::kVideoAvc ||
        *reinterpret_cast<const char* (*)()>(find("GetEncoderName"))() == '\0') {
        return;
    }
    const std::unique_ptr<IMediaEncoder, zolt::Delete> encoder(
        reinterpret_cast<IMediaEncoder* (*)()>(find("GetNewEncoder"))());
    auto* const settings = static_cast<IVideoEncSettings*>(encoder->GetEncSettings());
    settings->SetBitRateKbs(300);
    settings->SetKeyFrameInt(3);
    InputConfig input(kWidth, kHeight, 25.0, zolt::fourcc("BGRA"));
    Consumer consumer;
    encoder->PutStreamConfig(input.stream());
    encoder->Connect(&consumer);

    constexpr size_t kPictureSize = 4 * kWidth * kHeight;
    constexpr size_t kStep = 4 * kWidth + 4;  // one sample down and one to the right
    std::mt19937 random(1);
    Bytes samples(kPictureSize + kPictures * kStep);
    for (size_t i = 0; i < samples.size(); ++i) {
        samples[i] = static_cast<unsigned char>(i / 8 + random() % 16);
    }
    for (int n = 0; n < kPictures; ++n) {
        const auto first = samples.begin() + static_cast<long>(kStep) * n;
        Frame frame(n * 40000LL, Bytes(first, first + static_cast<long>(kPictureSize)));
        encoder->PutSample(&frame);
    }
    encoder->EndOfSamples();
    for (const Consumer::Unit& unit : consumer.units) {
        trial->units.push_back(unit.bytes);
    }
}

// Calls `function` with a stack pointer that is `offset` bytes below a multiple of 16 before the
// argument and the return address go on the stack.
[[gnu::noinline]] void call_with_stack(unsigned offset, void (*function)(Trial*), Trial* trial) {
    asm volatile(
        "movl %%esp, %%esi\n\t"
        "andl $-16, %%esp\n\t"
        "subl %[offset], %%esp\n\t"
        "pushl %[trial]\n\t"
        "call *%[function]\n\t"
        "movl %%esi, %%esp"
        : [function] "+a"(function), [trial] "+c"(trial), [offset] "+d"(offset)
        :
        : "esi", "memory", "cc");
}

TEST(MisalignedStack, DoesNotMatterToTheLibrary) {
    void* const library = dlopen(ZOLT_PLUGIN_FILE, RTLD_NOW);
    ASSERT_NE(library, nullptr) << dlerror();
    // The offsets that a host's own frames add to these are multiples of 4 that nobody knows: with
    // all four, every call of the library comes with every stack that there is.
    std::vector<Trial> trials;
    for (unsigned offset = 0; offset < 16; offset += 4) {
        trials.push_back({library, {}});
        call_with_stack(offset, encode, &trials.back());
    }
    EXPECT_EQ(dlclose(library), 0);
    ASSERT_EQ(trials[0].units.size(), static_cast<size_t>(kPictures));
    for (const Trial& trial : trials) {
        EXPECT_EQ(trial.units, trials[0].units);
    }
}

}  // namespace
