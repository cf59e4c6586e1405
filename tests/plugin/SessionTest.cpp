#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <climits>
#include <cmath>
#include <limits>
#include <numeric>
#include <stdexcept>

#include "FakeEngine.h"
#include "HostErrors.h"
#include "SessionFakes.h"
#include "common/Thread.h"
#include "media/IParallelRunner.h"
#include "plugin/VideoH264ZoltEnc.h"

namespace {

const std::string kBuilt =
    "width=48 height=32 bit_rate=200000 qp=28 frame_rate=25 intra=30 inter=1 initialize sps reset "
    "pps reset ";

class SessionTest : public testing::Test {
protected:
    SessionTest() {
        FakeEngine::take_calls();
        take_errors();
    }

    // Builds the session for 50 x 40 pictures, of which 48 x 32 are coded.
    void build() {
        session.PutStreamConfig(input.stream());
        session.Connect(&consumer);
        FakeEngine::take_calls();
    }

    void put_frame(long long time) {
        Frame frame(time, Bytes(50 * 40 * 3 / 2, 100));
        session.PutSample(&frame);
    }

    InputConfig input{50, 40};
    Consumer consumer;
    VideoH264ZoltEnc session;
};

TEST_F(SessionTest, BuildsWhenBothConfigurationAndConsumerAreThere) {
    consumer.status = 17;
    EXPECT_EQ(session.Connect(&consumer), 0);
    EXPECT_EQ(consumer.configs, 0);
    EXPECT_EQ(session.PutStreamConfig(input.stream()), 17);
    EXPECT_EQ(FakeEngine::take_calls(), kBuilt);
    EXPECT_EQ(consumer.configs, 1);
    EXPECT_EQ(consumer.media_type, zolt::fourcc("avc1"));
    EXPECT_EQ(consumer.description, static_cast<IConfigVideoAvc*>(&session));

    VideoH264ZoltEnc configured_first;
    EXPECT_EQ(configured_first.PutStreamConfig(input.stream()), 0);
    EXPECT_EQ(configured_first.GetWidth(), 50);
    EXPECT_EQ(FakeEngine::take_calls(), "");
    EXPECT_EQ(configured_first.Connect(&consumer), 17);
    EXPECT_EQ(FakeEngine::take_calls(), kBuilt);
    EXPECT_EQ(take_errors(), "");
}

TEST_F(SessionTest, CodesPicturesWhereTheyStandThatNeedNoConversion) {
    const struct {
        int width, height;
        int format;
        bool in_place;
    } cases[] = {{48, 32, zolt::fourcc("IYUV"), true},
                 {50, 32, zolt::fourcc("IYUV"), false},
                 {48, 32, zolt::fourcc("YUY2"), false}};
    for (const auto& c : cases) {
        InputConfig other(c.width, c.height, 25.0, c.format);
        session.PutStreamConfig(other.stream());
        session.Connect(&consumer);
        Frame frame(0, Bytes(50 * 40 * 2, 100));
        session.PutSample(&frame);
        EXPECT_EQ(FakeEngine::address == frame.GetSampleData(), c.in_place)
            << "format " << c.format << ", width " << c.width;
    }
}

TEST_F(SessionTest, DescribesItsOutputStream) {
    build();
    EXPECT_EQ(session.GetWidth(), 48);
    EXPECT_EQ(session.GetHeight(), 32);
    EXPECT_EQ(session.GetFrameRate(), 25.0);
    ASSERT_EQ(session.GetSeqParSetSize(), 3);
    EXPECT_EQ(session.GetSeqParSetData()[2], 2);
    ASSERT_EQ(session.GetPicParSetSize(), 2);
    EXPECT_EQ(session.GetPicParSetData()[0], 0x48);
    EXPECT_EQ(session.GetSampleStreamConfig()->GetMediaType(), zolt::fourcc("avc1"));
    EXPECT_EQ(session.GetEncoderMediaType(), zolt::fourcc("avc1"));

    input.width = 0;
    EXPECT_EQ(session.PutStreamConfig(input.stream()), 0);
    EXPECT_EQ(session.GetWidth(), 0);
    EXPECT_EQ(session.GetHeight(), 40);
    EXPECT_EQ(session.GetSeqParSetSize() + session.GetPicParSetSize(), 0);
    EXPECT_EQ(session.GetSeqParSetData(), nullptr);
    EXPECT_EQ(session.GetPicParSetData(), nullptr);
    EXPECT_EQ(FakeEngine::alive, 0);
}

TEST_F(SessionTest, RefusesWhatIsNoUncompressedVideo) {
    build();
    MediaStreamConfig coded(MediaType::kVideoAvc, &input);
    MediaStreamConfig nothing(MediaType::kVideoUncompressed, nullptr);
    EXPECT_EQ(session.PutStreamConfig(&coded), 1);
    EXPECT_EQ(take_errors(),
              "VideoH264ZoltEnc.PutStreamConfig: Expected media type Video Uncompressed, but got "
              "Video AVC\n");
    EXPECT_EQ(session.PutStreamConfig(&nothing), 1);
    EXPECT_EQ(take_errors(), "VideoH264ZoltEnc.PutStreamConfig: Media config may not be NULL\n");
    EXPECT_EQ(session.PutStreamConfig(nullptr), 1);
    EXPECT_EQ(take_errors(), "VideoH264ZoltEnc.PutStreamConfig: Stream config may not be NULL\n");
    for (const auto& [width, height] :
         {std::pair{16881, 16}, {16, 16881}, {16, 53687040}, {5984, 5968}, {INT_MAX, INT_MAX}}) {
        InputConfig large(width, height);
        EXPECT_EQ(session.PutStreamConfig(large.stream()), 1);
        EXPECT_EQ(take_errors(), "VideoH264ZoltEnc.PutStreamConfig: Source dimensions (" +
                                     std::to_string(width) + "," + std::to_string(height) +
                                     ") are too large\n");
    }
    // The session is as before.
    EXPECT_EQ(FakeEngine::take_calls(), "");
    put_frame(0);
    EXPECT_EQ(consumer.units.size(), 1u);
}

TEST_F(SessionTest, DropsSamplesAfterAFailedBuildUntilOneSucceeds) {
    build();
    input.color_format = zolt::fourcc("????");
    EXPECT_EQ(session.PutStreamConfig(input.stream()), 1);
    EXPECT_EQ(take_errors(),
              "ColorConverter.GetNewColorConverter: Source color format undefined: ????\n"
              "VideoH264ZoltEnc.InitEncAndPutConfig: Error constructing a new color converter\n");
    EXPECT_EQ(session.GetWidth(), 50);
    EXPECT_EQ(session.GetSeqParSetData(), nullptr);
    EXPECT_EQ(FakeEngine::alive, 0);
    put_frame(0);
    EXPECT_EQ(consumer.units.size(), 0u);
    EXPECT_EQ(take_errors(), "");

    input.color_format = zolt::fourcc("IYUV");
    EXPECT_EQ(session.PutStreamConfig(input.stream()), 0);
    put_frame(0);
    EXPECT_EQ(consumer.units.size(), 1u);
}

TEST_F(SessionTest, CountsUnusableFrameRatesAsTheDefault) {
    const double infinity = std::numeric_limits<double>::infinity();
    for (const double rate : {0.0, -0.0, -25.0, infinity, -infinity, std::nan("")}) {
        input.frame_rate = rate;
        session.PutStreamConfig(input.stream());
        EXPECT_EQ(session.GetFrameRate(), 15.0) << rate;
    }
    input.frame_rate = 1e-3;
    session.PutStreamConfig(input.stream());
    EXPECT_EQ(session.GetFrameRate(), 1e-3);
}

TEST_F(SessionTest, SendsOneUnitPerFrameWithTimeAndType) {
    build();
    for (int i = 0; i < 61; ++i) {
        put_frame(i * 40000LL - 80000);
    }
    ASSERT_EQ(consumer.units.size(), 61u);
    for (int i = 0; i < 61; ++i) {
        SCOPED_TRACE(i);
        const Consumer::Unit& unit = consumer.units[static_cast<size_t>(i)];
        const bool key = i % 30 == 0;
        EXPECT_EQ(unit.bytes, (Bytes{static_cast<unsigned char>(key ? 0x65 : 0x41),
                                     static_cast<unsigned char>(i)}));
        EXPECT_EQ(unit.time, i * 40000LL - 80000);
        EXPECT_EQ(unit.frame_type, key ? 'I' : 0);
        EXPECT_EQ(unit.sync, key);
    }
}

TEST_F(SessionTest, EncodesTheConvertedMiddleOfTheInput) {
    build();
    Bytes picture(50 * 40 * 3 / 2);
    std::iota(picture.begin(), picture.end(), static_cast<unsigned char>(0));
    Frame frame(0, picture);
    session.PutSample(&frame);
    ASSERT_EQ(FakeEngine::frame.size(), 48u * 32 * 3 / 2);
    EXPECT_EQ(FakeEngine::frame[0], picture[4 * 50]);  // 4 rows are cut off above
    EXPECT_EQ(FakeEngine::frame[48 * 31 + 47], picture[35 * 50 + 47]);
    EXPECT_EQ(FakeEngine::frame[48 * 32], picture[50 * 40 + 2 * 25]);
}

TEST_F(SessionTest, MeasuresTheFrameRateFromTheTimes) {
    build();
    put_frame(5000000);
    EXPECT_EQ(FakeEngine::take_calls(), "intra=30 encode reset ");
    put_frame(5040000);
    EXPECT_EQ(FakeEngine::take_calls(), "frame_rate=25 intra=30 encode reset ");
    put_frame(5080000);
    EXPECT_EQ(FakeEngine::take_calls(), "frame_rate=25 intra=30 encode reset ");
    put_frame(5580000);  // 0.98 x 0.04 s + 0.02 x 0.5 s
    EXPECT_EQ(FakeEngine::take_calls(), "frame_rate=20.32520325 intra=30 encode reset ");
    EXPECT_EQ(session.GetFrameRate(), 25.0);
}

TEST_F(SessionTest, SurvivesEveryPairOfTimes) {
    build();
    put_frame(0);
    put_frame(0);
    EXPECT_EQ(FakeEngine::take_calls(),
              "intra=30 encode reset frame_rate=1 intra=30 encode reset ");
    for (const long long time : {LLONG_MAX, LLONG_MIN, 0LL, LLONG_MIN, LLONG_MAX}) {
        put_frame(time);
    }
    EXPECT_EQ(consumer.units.size(), 7u);
}

TEST_F(SessionTest, BitRateRebuildsBeforeTheFirstSampleOnly) {
    EXPECT_EQ(session.SetBitRateKbs(300), 300);
    build();
    EXPECT_EQ(consumer.configs, 1);
    EXPECT_EQ(session.SetBitRateKbs(500), 500);
    EXPECT_EQ(FakeEngine::take_calls().substr(0, 32), "width=48 height=32 bit_rate=5000");
    EXPECT_EQ(consumer.configs, 2);

    put_frame(0);
    FakeEngine::take_calls();
    EXPECT_EQ(session.SetBitRateKbs(700), 700);
    EXPECT_EQ(session.GetBitRateKbs(), 700);
    EXPECT_EQ(session.ChangeBitRateKbs(900), 700);
    EXPECT_EQ(session.GetBitRateKbs(), 700);
    session.SetBitRateKbs(INT_MAX);
    session.SetBitRateKbs(INT_MIN);
    session.SetBitRateKbs(-1);
    EXPECT_EQ(FakeEngine::take_calls(),
              "bit_rate=700000 bit_rate=2147483647 bit_rate=-2147483648 bit_rate=-1000 ");
    EXPECT_EQ(consumer.configs, 2);
}

TEST_F(SessionTest, KeyFrameIntervalReachesTheEngineWithTheNextFrame) {
    build();
    session.SetKeyFrameInt(2);
    EXPECT_EQ(session.GetKeyFrameInt(), 2);
    EXPECT_EQ(FakeEngine::take_calls(), "");
    put_frame(0);
    EXPECT_EQ(FakeEngine::take_calls(), "intra=2 encode reset ");
    for (const int refused : {0, -1, INT_MIN}) {
        session.SetKeyFrameInt(refused);
        EXPECT_EQ(take_errors(),
                  "VideoH264ZoltEnc.SetKeyFrameInt: Key frame interval must be positive, but got " +
                      std::to_string(refused) + "\n");
    }
    EXPECT_EQ(session.GetKeyFrameInt(), 2);
    session.Connect(&consumer);
    EXPECT_NE(FakeEngine::take_calls().find("intra=2 "), std::string::npos);
}

TEST_F(SessionTest, ARebuildStartsWithAKeyFrameAndKeepsTheClock) {
    build();
    put_frame(0);
    put_frame(40000);
    session.Connect(&consumer);
    EXPECT_EQ(consumer.configs, 2);
    FakeEngine::take_calls();
    put_frame(80000);
    EXPECT_EQ(FakeEngine::take_calls(), "frame_rate=25 intra=30 encode reset ");
    EXPECT_TRUE(consumer.units.back().sync);
    session.SetBitRateKbs(400);  // still not the first sample
    EXPECT_EQ(FakeEngine::take_calls(), "bit_rate=400000 ");
    EXPECT_EQ(FakeEngine::alive, 1);

    EXPECT_EQ(session.Connect(nullptr), 0);
    put_frame(120000);
    session.SetBitRateKbs(500);
    EXPECT_EQ(FakeEngine::take_calls(), "");
    EXPECT_EQ(consumer.units.size(), 3u);
}

TEST_F(SessionTest, DropsWhatIsNoPicture) {
    put_frame(0);
    EXPECT_EQ(take_errors(), "");  // nothing built yet: no report
    build();
    const int needed = 50 * 40 * 3 / 2;
    Frame frame(0, Bytes(static_cast<size_t>(needed), 1));
    frame.SetSampleSize(needed - 1);
    session.PutSample(&frame);
    EXPECT_EQ(take_errors(),
              "VideoH264ZoltEnc.PutSample: Sample of 2999 bytes is shorter than a picture of 3000 "
              "bytes\n");
    MediaSample empty;
    session.PutSample(&empty);
    EXPECT_EQ(take_errors(), "VideoH264ZoltEnc.PutSample: Sample data may not be NULL\n");
    session.PutSample(nullptr);
    EXPECT_EQ(take_errors(), "VideoH264ZoltEnc.PutSample: Sample may not be NULL\n");
    EXPECT_EQ(FakeEngine::take_calls(), "");
    EXPECT_EQ(session.SetBitRateKbs(500), 500);
    EXPECT_NE(FakeEngine::take_calls(), "bit_rate=500000 ");  // none of these was the first sample

    for (const long unknown_or_enough : {0L, -1L, static_cast<long>(needed), needed + 100L}) {
        frame.SetSampleSize(unknown_or_enough);
        session.PutSample(&frame);
    }
    EXPECT_EQ(consumer.units.size(), 4u);
    EXPECT_EQ(take_errors(), "");
}

TEST_F(SessionTest, TakesSamplesThatHoldTheirPlanes) {
    InputConfig odd(51, 39);
    session.PutStreamConfig(odd.stream());
    session.Connect(&consumer);
    Frame frame(0, Bytes(51 * 39 + 2 * 25 * 19, 1));
    session.PutSample(&frame);
    EXPECT_EQ(consumer.units.size(), 1u);
    frame.SetSampleSize(51 * 39 + 2 * 25 * 19 - 1);
    session.PutSample(&frame);
    EXPECT_EQ(consumer.units.size(), 1u);
    EXPECT_NE(take_errors(), "");
}

TEST_F(SessionTest, ShowsNoOtherSizeWhileItIsRebuilt) {
    build();
    std::atomic<bool> done{false};
    Thread rebuilding([&] {
        for (int i = 0; i < 2000; ++i) {
            session.PutStreamConfig(input.stream());
        }
        done = true;
    });
    int others = 0;
    while (!done) {
        others += session.GetWidth() != 48 || session.GetHeight() != 32;
    }
    rebuilding.join();
    EXPECT_EQ(others, 0);
}

TEST_F(SessionTest, ServesOneConsumerAtATime) {
    Consumer second;
    auto* const event = reinterpret_cast<IEvent*>(&input);
    session.Notify(event);
    session.EndOfSamples();
    build();
    session.Disconnect(&second);
    session.Disconnect(nullptr);
    session.Notify(event);
    put_frame(0);
    session.EndOfSamples();
    EXPECT_EQ(consumer.events, std::vector<IEvent*>{event});
    EXPECT_EQ(consumer.units.size(), 1u);
    EXPECT_EQ(consumer.ends, 1);

    session.Disconnect(&consumer);
    FakeEngine::take_calls();
    put_frame(40000);  // coded all the same: the engine is still there
    session.EndOfSamples();
    session.Notify(event);
    EXPECT_EQ(FakeEngine::take_calls(), "frame_rate=25 intra=30 encode reset ");
    EXPECT_EQ(consumer.units.size(), 1u);
    EXPECT_EQ(consumer.ends, 1);
    EXPECT_EQ(consumer.events.size(), 1u);

    session.Connect(&second);
    put_frame(80000);
    EXPECT_EQ(second.units.size(), 1u);
    EXPECT_EQ(consumer.units.size(), 1u);
}

TEST_F(SessionTest, AThrowingConsumerLeavesTheSessionUsable) {
    build();
    consumer.on_sample = [] { throw std::runtime_error("disk full"); };
    EXPECT_THROW(put_frame(0), std::runtime_error);
    EXPECT_EQ(FakeEngine::take_calls(), "intra=30 encode reset ");
    consumer.on_sample = nullptr;
    // The lock is free: another thread gets through.
    Thread([&] { put_frame(40000); }).join();
    ASSERT_EQ(consumer.units.size(), 2u);
    EXPECT_EQ(consumer.units[1].bytes, (Bytes{0x41, 1}));
}

// Against the rules, but it must not bring the host down.
TEST_F(SessionTest, AConsumerThatRebuildsFromItsSampleDoesNoHarm) {
    build();
    consumer.on_sample = [&] { session.Connect(&consumer); };
    put_frame(0);
    consumer.on_sample = [&] { session.Connect(nullptr); };
    put_frame(40000);
    EXPECT_EQ(consumer.units.size(), 2u);
    EXPECT_EQ(FakeEngine::alive, 0);
}

TEST_F(SessionTest, OffersNoBFramesAndNoForcedIntraFrames) {
    build();
    auto* const settings = static_cast<IVideoEncSettings*>(session.GetEncSettings());
    auto* const control = static_cast<IVideoEncRunTimeControl*>(session.GetEncRunTimeControl());
    EXPECT_FALSE(
        static_cast<IVideoEncCapabilities*>(session.GetEncCapabilities())->SupportsBframes());
    EXPECT_EQ(settings->SetNumBframes(2), 0);
    EXPECT_EQ(settings->GetNumBframes(), 0);
    settings->SetKeyFrameIntMsecs(1000);
    EXPECT_EQ(settings->GetKeyFrameIntMsecs(), 0);
    EXPECT_EQ(settings->GetKeyFrameInt(), 30);
    EXPECT_TRUE(control->SupportsChangingBitRate());
    EXPECT_FALSE(control->SupportsProducingExtraIntraFrame());
    put_frame(0);
    control->ForceIntraFrame();
    control->ProduceExtraIntraFrame();
    put_frame(40000);
    ASSERT_EQ(consumer.units.size(), 2u);
    EXPECT_FALSE(consumer.units[1].sync);
}

TEST_F(SessionTest, LendsTheRunnersThreadsToTheNextPicture) {
    class Runner : public IParallelRunner {
    public:
        explicit Runner(int threads) : m_threads(threads) {}
        int GetThreads() noexcept override { return m_threads; }
        void Run(IParallelTask* task, int workers) noexcept override {
            for (int worker = workers - 1; worker >= 0; --worker) {
                task->Run(worker);
            }
        }

    private:
        int m_threads;
    };
    build();
    const auto calls_of_a_picture = [this] {
        put_frame(0);
        std::string calls = FakeEngine::take_calls();
        return calls.substr(calls.find("encode "));
    };
    const std::string alone = "encode reset ";
    const auto with_threads = [](int count) {
        return "encode threads=" + std::to_string(count) + " worker=1 worker=0 reset ";
    };
    Runner three(3), five(5);
    IVideoEncSettings& settings = session;
    EXPECT_EQ(calls_of_a_picture(), alone);
    settings.SetParallelRunner(&three);
    EXPECT_EQ(FakeEngine::take_calls(), "") << "before the next picture";
    EXPECT_EQ(calls_of_a_picture(), with_threads(3));
    session.PutStreamConfig(input.stream());
    EXPECT_EQ(calls_of_a_picture(), with_threads(3)) << "of the new engine, too";
    settings.SetParallelRunner(&five);
    EXPECT_EQ(calls_of_a_picture(), with_threads(5));
    settings.SetParallelRunner(nullptr);
    EXPECT_EQ(calls_of_a_picture(), alone);
}

// The host finds each interface at its place in the object.
TEST_F(SessionTest, InterfacesStandInTheirOrder) {
    const auto at = [](auto* interface) { return reinterpret_cast<std::uintptr_t>(interface); };
    const std::uintptr_t places[] = {at(static_cast<IMediaEncoder*>(&session)),
                                     at(static_cast<IConfigVideoAvc*>(&session)),
                                     at(static_cast<IVideoEncCapabilities*>(&session)),
                                     at(static_cast<IVideoEncSettings*>(&session)),
                                     at(static_cast<IVideoEncRunTimeControl*>(&session))};
    EXPECT_EQ(places[0], at(&session));
    EXPECT_TRUE(std::is_sorted(std::begin(places), std::end(places)));
}

}  // namespace
