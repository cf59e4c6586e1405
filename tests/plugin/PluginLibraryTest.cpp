#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <random>
#include <vector>

#include "HostErrors.h"
#include "SessionFakes.h"
#include "color/ColorConverter.h"
#include "common/Thread.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/IParallelRunner.h"
#include "media/abi.h"
#include "support/dl.h"
#include "support/os.h"

namespace {

// The shared library as a host has it: three functions found by name.
class PluginLibrary : public testing::Test {
protected:
    void SetUp() override {
        handle = dlopen(ZOLT_PLUGIN_FILE, RTLD_NOW);
        ASSERT_NE(handle, nullptr) << dlerror();
        new_encoder = find<IMediaEncoder*()>("GetNewEncoder");
        ASSERT_NE(new_encoder, nullptr);
    }

    void TearDown() override {
        if (handle != nullptr) {
            EXPECT_EQ(dlclose(handle), 0);
        }
    }

    template <class Function>
    Function* find(const char* name) {
        return reinterpret_cast<Function*>(dlsym(handle, name));
    }

    using Encoder = std::unique_ptr<IMediaEncoder, zolt::Delete>;
    Encoder make_encoder() { return Encoder(new_encoder()); }

    static IVideoEncSettings& settings(IMediaEncoder& encoder) {
        return *static_cast<IVideoEncSettings*>(encoder.GetEncSettings());
    }

    void* handle = nullptr;
    IMediaEncoder* (*new_encoder)() = nullptr;
};

Bytes noise(int size, unsigned seed) {
    std::mt19937 random(seed);
    Bytes bytes(static_cast<size_t>(size));
    for (unsigned char& byte : bytes) {
        byte = static_cast<unsigned char>(random());
    }
    return bytes;
}

TEST_F(PluginLibrary, SaysWhatItIs) {
    EXPECT_EQ(find<int()>("GetEncoderType")(), 0x61766331);
    EXPECT_STREQ(find<const char*()>("GetEncoderName")(), "ZOLT H.264 Video Encoder");
    EXPECT_EQ(make_encoder()->GetEncoderMediaType(), 0x61766331);
}

TEST_F(PluginLibrary, GivesTheParameterSetsOfTheStream) {
    struct {
        int width, height;
        Bytes sequence_parameter_set;
    } const kSizes[] = {{176, 144, {0x47, 0x4D, 0x00, 0x16, 0x8D, 0x8D, 0x41, 0x62, 0x62}},
                        {320, 240, {0x47, 0x4D, 0x00, 0x16, 0x8D, 0x8D, 0x40, 0xA0, 0xF8, 0x80}}};
    for (const auto& size : kSizes) {
        const auto encoder = make_encoder();
        InputConfig input(size.width, size.height);
        Consumer consumer;
        encoder->Connect(&consumer);
        ASSERT_EQ(encoder->PutStreamConfig(input.stream()), 0);
        ASSERT_NE(consumer.description, nullptr);
        IConfigVideoAvc& avc = *consumer.description;
        EXPECT_EQ(avc.GetWidth(), size.width);
        EXPECT_EQ(avc.GetHeight(), size.height);
        EXPECT_EQ(Bytes(avc.GetSeqParSetData(), avc.GetSeqParSetData() + avc.GetSeqParSetSize()),
                  size.sequence_parameter_set);
        EXPECT_EQ(Bytes(avc.GetPicParSetData(), avc.GetPicParSetData() + avc.GetPicParSetSize()),
                  (Bytes{0x48, 0xCE, 0x03, 0xC1, 0x78, 0x80}));
    }
}

TEST_F(PluginLibrary, EncodesAKeyFrameEveryInterval) {
    const auto encoder = make_encoder();
    InputConfig input(16, 16);
    Consumer consumer;
    encoder->PutStreamConfig(input.stream());
    encoder->Connect(&consumer);
    for (int i = 0; i < 64; ++i) {
        if (i == 61) {
            settings(*encoder).SetKeyFrameInt(1);
        }
        Frame frame(i * 40000LL, noise(16 * 16 * 3 / 2, static_cast<unsigned>(i)));
        encoder->PutSample(&frame);
    }
    encoder->EndOfSamples();
    ASSERT_EQ(consumer.units.size(), 64u);
    for (int i = 0; i < 64; ++i) {
        SCOPED_TRACE(i);
        const Consumer::Unit& unit = consumer.units[static_cast<size_t>(i)];
        const bool key = i % 30 == 0 || i >= 61;
        EXPECT_EQ(unit.bytes.at(0) & 31, key ? 5 : 1);
        EXPECT_EQ(unit.sync, key);
        EXPECT_EQ(unit.frame_type, key ? 'I' : 0);
        EXPECT_EQ(unit.time, i * 40000LL);
    }
    EXPECT_EQ(consumer.ends, 1);
}

// A session fed with any format codes what one fed with the converted pictures codes.
TEST_F(PluginLibrary, AcceptsEveryColourFormat) {
    for (const int format : {ColorConverter::kBGRA, ColorConverter::kRGBA, ColorConverter::kARGB,
                             ColorConverter::kBGR, ColorConverter::kRGB, ColorConverter::kAYUV,
                             ColorConverter::kYUY2, ColorConverter::kIYUV}) {
        SCOPED_TRACE(format);
        const std::unique_ptr<ColorConverter> converter(
            ColorConverter::GetNewColorConverter(70, 37, format, ColorConverter::kIYUV, 16, 16));
        InputConfig inputs[] = {{70, 37, 25.0, format}, {64, 32}};
        Consumer consumers[2];
        Encoder encoders[] = {make_encoder(), make_encoder()};
        for (int i = 0; i < 2; ++i) {
            encoders[i]->PutStreamConfig(inputs[i].stream());
            ASSERT_EQ(encoders[i]->Connect(&consumers[i]), 0);
        }
        for (int n = 0; n < 3; ++n) {
            const Bytes picture =
                noise(ColorConverter::GetBufferSize(70, 37, format), static_cast<unsigned>(n));
            converter->Convert(picture.data());
            Frame raw(n * 40000LL, picture);
            Frame converted(n * 40000LL,
                            Bytes(converter->GetOutputBuffer(),
                                  converter->GetOutputBuffer() + converter->GetOutputSize()));
            encoders[0]->PutSample(&raw);
            encoders[1]->PutSample(&converted);
        }
        ASSERT_EQ(consumers[0].units.size(), 3u);
        for (size_t n = 0; n < 3; ++n) {
            EXPECT_EQ(consumers[0].units[n].bytes, consumers[1].units[n].bytes);
        }
    }
}

TEST_F(PluginLibrary, ReportsToTheHostsErrorManager) {
    take_errors();
    const auto encoder = make_encoder();
    InputConfig input(15, 15);
    Consumer consumer;
    encoder->Connect(&consumer);
    EXPECT_EQ(encoder->PutStreamConfig(input.stream()), 1);
    EXPECT_EQ(take_errors(),
              "ColorConverter.GetNewColorConverter: Source dimensions (15,15) too small to be the "
              "requested/required multiple of (16,16)\n"
              "VideoH264ZoltEnc.InitEncAndPutConfig: Error constructing a new color converter\n");
}

// Threads that several sessions may ask for at once.
class SharedRunner : public IParallelRunner {
public:
    int GetThreads() noexcept override { return 3; }
    void Run(IParallelTask* task, int workers) noexcept override {
        std::vector<Thread> threads;
        for (int worker = 1; worker < workers; ++worker) {
            threads.emplace_back([task, worker] { task->Run(worker); });
        }
        task->Run(0);
        for (Thread& thread : threads) {
            thread.join();
        }
        ++runs;
    }
    std::atomic<int> runs{0};
};

// Two sessions on threads of their own, one runner between them, which is lent, taken back and lent
// again while they are rebuilt for another size and told another bit rate.
TEST_F(PluginLibrary, SharesARunnerBetweenSessions) {
    SharedRunner runner;
    const auto encode = [&](int session, bool lend, Consumer& consumer) {
        const auto encoder = make_encoder();
        InputConfig inputs[] = {{64 + 16 * session, 96}, {48, 80}};
        encoder->Connect(&consumer);
        for (int n = 0; n < 24; ++n) {
            InputConfig& input = inputs[n / 12];
            if (n % 12 == 0) {
                encoder->PutStreamConfig(input.stream());
            }
            if (n == 5) {
                settings(*encoder).SetBitRateKbs(900);
            }
            settings(*encoder).SetParallelRunner(lend && n % 8 != 7 ? &runner : nullptr);
            Frame frame(n * 40000LL, noise(input.width * input.height * 3 / 2,
                                           static_cast<unsigned>(n + session)));
            encoder->PutSample(&frame);
        }
    };
    Consumer alone[2], threaded[2];
    std::vector<Thread> threads;
    for (int session = 0; session < 2; ++session) {
        encode(session, false, alone[session]);
        threads.emplace_back([&, session] { encode(session, true, threaded[session]); });
    }
    for (Thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(runner.runs, 2 * (24 - 3));
    for (int session = 0; session < 2; ++session) {
        ASSERT_EQ(threaded[session].units.size(), 24u);
        for (std::size_t n = 0; n < 24; ++n) {
            EXPECT_EQ(threaded[session].units[n].bytes, alone[session].units[n].bytes)
                << "session " << session << ", picture " << n;
        }
    }
}

// One thread encodes while others read, set, notify and build the session anew; the thread
// sanitizer watches, and the consumer checks that it is never called by two threads at once.
TEST_F(PluginLibrary, TakesCallsFromManyThreads) {
    class CheckingConsumer : public Consumer {
    public:
        void Notify(IEvent*) override { ++notified; }
        int PutStreamConfig(ISampleStreamConfig*) override {
            const Entry entry(*this);
            ++built;
            return 0;
        }
        void PutSample(ISample* sample) override {
            const Entry entry(*this);
            const bool idr = (sample->GetSampleData()[0] & 31) == 5;
            wrong += sample->SampleIsSync() != idr || sample->GetSampleSize() < 1;
            ++taken;
        }

        std::atomic<int> notified{0}, built{0}, wrong{0};
        int taken = 0;

    private:
        struct Entry {
            explicit Entry(CheckingConsumer& owner) : consumer(owner) {
                consumer.wrong += consumer.inside.exchange(true);
            }
            ~Entry() { consumer.inside = false; }
            CheckingConsumer& consumer;
        };
        std::atomic<bool> inside{false};
    };

    const auto encoder = make_encoder();
    CheckingConsumer consumer;
    Consumer stranger;
    InputConfig input(48, 32, 25.0, ColorConverter::kYUY2);
    encoder->PutStreamConfig(input.stream());
    encoder->Connect(&consumer);
    auto* const avc =
        static_cast<IConfigVideoAvc*>(encoder->GetSampleStreamConfig()->GetMediaConfig());

    std::atomic<bool> done{false};
    const auto repeat = [&](auto action) {
        return Thread([&done, action] {
            for (int i = 0; !done; ++i) {
                action(i);
                zolt::os_sleep(0);
            }
        });
    };
    Thread others[] = {
        repeat([&](int i) {
            settings(*encoder).SetBitRateKbs(100 + i % 900);
            settings(*encoder).SetKeyFrameInt(1 + i % 10);
            encoder->EndOfSamples();
        }),
        repeat([&](int) {
            avc->GetWidth();
            avc->GetFrameRate();
            avc->GetSeqParSetData();
            avc->GetPicParSetSize();
            settings(*encoder).GetBitRateKbs();
            settings(*encoder).GetKeyFrameInt();
            encoder->Notify(nullptr);
            encoder->Disconnect(&stranger);
        }),
        repeat([&](int i) {
            if (i % 8 == 0) {
                encoder->Connect(&consumer);
            }
            zolt::os_sleep(1);
        }),
    };
    // A thread that waits for the session may have to wait long.
    for (int i = 0; i < 200 || (consumer.built < 2 && i < 50000); ++i) {
        Frame frame(i * 40000LL, noise(48 * 32 * 2, static_cast<unsigned>(i)));
        encoder->PutSample(&frame);
    }
    done = true;
    for (Thread& other : others) {
        other.join();
    }
    // Frames that come while the session is being built anew are dropped; afterwards none is.
    const int taken = consumer.taken;
    EXPECT_GT(taken, 0);
    Frame last(200 * 40000LL, noise(48 * 32 * 2, 200));
    encoder->PutSample(&last);
    EXPECT_EQ(consumer.taken, taken + 1);
    EXPECT_EQ(consumer.wrong, 0);
    EXPECT_GT(consumer.built, 1);
}

// The limit is the engine's; the session hands the rate on before the first sample.
TEST_F(PluginLibrary, EndsTheProcessForABitRateAboveTheLevel) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto encoder = make_encoder();
    InputConfig input(176, 144);
    Consumer consumer;
    encoder->PutStreamConfig(input.stream());
    encoder->Connect(&consumer);
    EXPECT_EXIT(settings(*encoder).SetBitRateKbs(4001), testing::ExitedWithCode(109), "");
}

}  // namespace
