// Feeds the input to the parser at once and in pieces, and lists its units as avcdump does. The
// first byte of the input decides how it is cut.

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "avc/VideoAvcParser.h"
#include "avcdump/RowFormat.h"
#include "avcdump/UnitLister.h"
#include "check.h"
#include "media/ISample.h"
#include "media/ISampleConsumer.h"

namespace {

using zolt::check;
using Bytes = std::vector<unsigned char>;

struct Sample {
    Bytes bytes;
    long long time;
    bool is_sync;

    bool operator==(const Sample& other) const {
        return bytes == other.bytes && time == other.time && is_sync == other.is_sync;
    }
};

// A parser with everything that can be attached to it.
class Run : private ISampleConsumer {
public:
    Run() : parser_(this, 30) {
        static std::FILE* const nowhere = std::fopen("/dev/null", "w");
        parser_.SetDiagnosticOutput(nowhere);
        parser_.SetUnitListener([this](const unsigned char* unit, int size) {
            rows += format_->row(lister_.add(unit, size));
            stream.insert(stream.end(), unit, unit + size);
        });
    }

    void put(const unsigned char* data, std::size_t size, bool in_two_steps) {
        // A piece of its own, so that a read beyond it is seen.
        const Bytes piece(data, data + size);
        const int length = static_cast<int>(size);
        if (in_two_steps) {
            parser_.AddDataToBuffer(piece.data(), length);
            parser_.PutNextAvcData(nullptr, 0);
        } else {
            parser_.PutNextAvcData(piece.data(), length);
        }
    }

    void end() {
        parser_.Flush();
        rows += format_->tail(lister_.summary());
    }

    int first_sample_offset() const { return parser_.GetFirstSampleOffset(); }

    std::vector<Sample> samples;
    std::string rows;  // the listing
    Bytes stream;      // the units put together again

private:
    void Notify(IEvent*) override {}
    int PutStreamConfig(ISampleStreamConfig*) override { return 0; }
    void PutSample(ISample* sample) override {
        const unsigned char* const data = sample->GetSampleData();
        samples.push_back({Bytes(data, data + sample->GetSampleSize()), sample->GetSampleTime(),
                           sample->SampleIsSync()});
    }
    void EndOfSamples() override {}

    VideoAvcParser parser_;
    zolt::UnitLister lister_{zolt::FrameRate{}};
    std::unique_ptr<zolt::RowFormat> format_ = zolt::RowFormat::csv();
};

// Every syntax parser on bytes that were not cut out of a stream.
void parse_syntax(const Bytes& bytes) {
    const int size = static_cast<int>(bytes.size());
    VideoAvcSeqParSet sps;
    VideoAvcPicParSet pps;
    VideoAvcSliceHeader header;
    int width = 0;
    int height = 0;
    VideoAvcParser::ParseSeqParSet(bytes.data(), size, &sps);
    VideoAvcParser::ParseSeqParSet(bytes.data(), size, &width, &height);
    check(width >= 0 && width <= 65535 * 16 && height >= 0 && height <= 65535 * 16, "a size");
    VideoAvcParser::ParsePicParSet(bytes.data(), size, &pps);
    static std::FILE* const nowhere = std::fopen("/dev/null", "w");
    VideoAvcParser::ParseSliceHeader(bytes.data(), size, &sps, &pps, &header, nowhere);
    VideoAvcParser::ParseSliceHeader(bytes.data(), size, &sps, &header, nowhere);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const unsigned char* input, std::size_t size) {
    if (size == 0) {
        return 0;
    }
    const std::size_t piece_size = input[0] % 64 + 1U;
    const bool in_two_steps = input[0] >= 128;
    Bytes stream(input + 1, input + size);
    parse_syntax(stream);

    // A last unit that is long enough not to be held back with what is before it.
    const Bytes last = {0, 0, 1, 12, 0xff, 0xff, 0xff, 0xff};
    stream.insert(stream.end(), last.begin(), last.end());

    Run whole;
    whole.put(stream.data(), stream.size(), false);
    whole.end();
    check(whole.stream == stream, "the units are the stream");

    Run cut;
    for (std::size_t pos = 0; pos < stream.size(); pos += piece_size) {
        cut.put(stream.data() + pos, std::min(piece_size, stream.size() - pos), in_two_steps);
    }
    cut.end();
    check(cut.rows == whole.rows, "the units of a cut stream");
    check(cut.samples == whole.samples, "the samples of a cut stream");
    check(cut.first_sample_offset() == whole.first_sample_offset(), "the first sample's offset");
    return 0;
}
