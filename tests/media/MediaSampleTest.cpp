#include <gtest/gtest.h>

#include <climits>
#include <string>
#include <vector>

#include "media/IMediaFileSample.h"
#include "media/MediaSample.h"

namespace {

// A sample of either kind, with values that differ in every field, that notes what it is asked.
template <class Interface>
class RecordingSample : public Interface {
public:
    explicit RecordingSample(std::vector<unsigned char> payload)
        : bytes(std::move(payload)), size(static_cast<long>(bytes.size())) {}

    unsigned char* GetSampleData() override {
        return note("data", hides_data ? nullptr : bytes.data());
    }
    long GetSampleSize() override { return note("size", size); }
    long long GetSampleTime() override { return note("time", 1234567890123LL); }
    bool SampleIsSync() override { return note("sync", false); }
    long long GetSampleCompTimeOffset() override { return note("comp", -40000LL); }
    long long GetSampleKeyStreamOffset() override { return note("key", 77LL); }

    std::vector<unsigned char> bytes;
    long size;
    bool hides_data = false;
    std::string asked;

protected:
    template <class T>
    T note(const char* what, T value) {
        asked += std::string(asked.empty() ? "" : " ") + what;
        return value;
    }
};

class StreamSample : public RecordingSample<ISample> {
public:
    using RecordingSample::RecordingSample;
    int GetSubStreamId() override { return note("id", 5); }
};

class FileSample : public RecordingSample<IMediaFileSample> {
public:
    using RecordingSample::RecordingSample;
    int GetFrameType() override { return note("type", static_cast<int>('B')); }
};

std::vector<unsigned char> bytes_of(MediaSample& sample) {
    return {sample.GetSampleData(), sample.GetSampleData() + sample.GetSampleSize()};
}

TEST(MediaSample, StartsAsAnEmptySyncSample) {
    MediaSample sample;
    EXPECT_EQ(sample.GetSampleData(), nullptr);
    EXPECT_EQ(sample.GetSampleSize(), 0);
    EXPECT_TRUE(sample.SampleIsSync());
    EXPECT_EQ(sample.GetFrameType(), 0);
}

template <class Source>
class MediaSampleCopy : public testing::Test {};
using Sources = testing::Types<StreamSample, FileSample>;
TYPED_TEST_SUITE(MediaSampleCopy, Sources);

TYPED_TEST(MediaSampleCopy, OwnsItsBytesAndKeepsTypeAndId) {
    MediaSample copy;
    copy.SetFrameType('I');
    copy.SetSubStreamId(9);
    {
        TypeParam source({1, 2, 3, 4, 5});
        copy.Copy(&source);
        EXPECT_EQ(source.asked, "size time sync comp key data");
        source.bytes.assign(5, 0);
    }
    EXPECT_EQ(bytes_of(copy), (std::vector<unsigned char>{1, 2, 3, 4, 5}));
    EXPECT_EQ(copy.GetSampleTime(), 1234567890123LL);
    EXPECT_FALSE(copy.SampleIsSync());
    EXPECT_EQ(copy.GetSampleCompTimeOffset(), -40000);
    EXPECT_EQ(copy.GetSampleKeyStreamOffset(), 77);
    EXPECT_EQ(copy.GetFrameType(), 'I');
    EXPECT_EQ(copy.GetSubStreamId(), 9);

    copy.Copy(static_cast<TypeParam*>(nullptr));
    EXPECT_EQ(copy.GetSampleSize(), 5);
}

TYPED_TEST(MediaSampleCopy, ReusesItsBufferUntilASourceIsLarger) {
    MediaSample copy;
    TypeParam medium(std::vector<unsigned char>(100, 1));
    TypeParam small({7, 8});
    TypeParam large(std::vector<unsigned char>(5000, 3));
    copy.Copy(&medium);
    unsigned char* const first_buffer = copy.GetSampleData();
    copy.Copy(&small);
    EXPECT_EQ(copy.GetSampleData(), first_buffer);
    EXPECT_EQ(bytes_of(copy), small.bytes);
    copy.Copy(&medium);
    EXPECT_EQ(copy.GetSampleData(), first_buffer);
    copy.Copy(&large);
    EXPECT_EQ(bytes_of(copy), large.bytes);
}

TYPED_TEST(MediaSampleCopy, CopiesNoBytesWhereThereAreNone) {
    MediaSample copy;
    TypeParam source({1, 2, 3});
    for (const long size : {0L, -1L, -2147483647L}) {
        source.size = size;
        copy.Copy(&source);
        EXPECT_EQ(copy.GetSampleSize(), size);
    }
    source.size = 3;
    copy.Copy(&source);
    EXPECT_EQ(bytes_of(copy), source.bytes);

    // What no buffer can hold counts as nothing.
    if (sizeof(long) > sizeof(int)) {
        source.size = LONG_MAX;
        copy.Copy(&source);
        EXPECT_EQ(copy.GetSampleSize(), 0);
    }
    source.size = 3;
    source.hides_data = true;
    copy.Copy(&source);
    EXPECT_EQ(copy.GetSampleSize(), 0);
}

// The address sanitizer turns a wrong idea of who owns the payload into a failure of these.
TEST(MediaSample, NeverReleasesOrWritesBorrowedBytes) {
    unsigned char borrowed[4] = {1, 2, 3, 4};
    FileSample file({5, 6, 7});
    StreamSample stream({8, 9, 10, 11});
    MediaSample sample;
    sample.SetSampleData(borrowed);
    sample.SetSampleSize(4);
    sample.Copy(&stream);
    EXPECT_NE(sample.GetSampleData(), borrowed);
    EXPECT_EQ(borrowed[0], 1);

    sample.Set(&file);
    EXPECT_EQ(file.asked, "data size time sync type comp key");
    EXPECT_EQ(sample.GetSampleData(), file.bytes.data());
    EXPECT_EQ(sample.GetSampleSize(), 3);
    EXPECT_EQ(sample.GetFrameType(), 'B');
    EXPECT_EQ(sample.GetSampleKeyStreamOffset(), 77);
    sample.Set(nullptr);
    EXPECT_EQ(sample.GetSampleSize(), 3);

    sample.Copy(&stream);
    sample.SetSampleData(borrowed);
    sample.SetSampleData(borrowed);
    EXPECT_EQ(sample.GetSampleData(), borrowed);
}

TEST(MediaSample, CopyOfItselfKeepsTheBytes) {
    unsigned char borrowed[3] = {1, 2, 3};
    MediaSample sample;
    sample.SetSampleData(borrowed);
    sample.SetSampleSize(3);
    sample.Copy(static_cast<ISample*>(&sample));
    EXPECT_NE(sample.GetSampleData(), borrowed);
    sample.Copy(static_cast<ISample*>(&sample));
    EXPECT_EQ(bytes_of(sample), (std::vector<unsigned char>{1, 2, 3}));
}

TEST(MediaSample, MetaInfoLeavesPayloadTimeAndType) {
    unsigned char borrowed[2] = {1, 2};
    MediaSample sample;
    sample.SetSampleData(borrowed);
    sample.SetSampleSize(2);
    sample.SetSampleTime(42);
    sample.SetFrameType('I');
    StreamSample source({9, 9, 9});
    sample.SetSampleMetaInfo(&source);
    EXPECT_EQ(source.asked, "sync comp key id");
    EXPECT_FALSE(sample.SampleIsSync());
    EXPECT_EQ(sample.GetSampleCompTimeOffset(), -40000);
    EXPECT_EQ(sample.GetSampleKeyStreamOffset(), 77);
    EXPECT_EQ(sample.GetSubStreamId(), 5);
    EXPECT_EQ(sample.GetSampleData(), borrowed);
    EXPECT_EQ(sample.GetSampleSize(), 2);
    EXPECT_EQ(sample.GetSampleTime(), 42);
    EXPECT_EQ(sample.GetFrameType(), 'I');
}

}  // namespace
