#pragma once

#include <stdexcept>
#include <vector>

#include "media/ISample.h"
#include "media/ISampleConsumer.h"
#include "media/ISampleStreamConfig.h"

namespace zolt {

struct RecordedSample {
    std::vector<unsigned char> bytes;
    long long time = 0;
    bool is_sync = false;

    bool operator==(const RecordedSample& other) const {
        return bytes == other.bytes && time == other.time && is_sync == other.is_sync;
    }
};

// Keeps what it is given.
class RecordingConsumer : public ISampleConsumer {
public:
    void Notify(IEvent*) override {}
    int PutStreamConfig(ISampleStreamConfig* config) override {
        configs.push_back(config);
        return status;
    }
    void PutSample(ISample* sample) override {
        if (throws) {
            throw std::runtime_error("consumer");
        }
        const unsigned char* const data = sample->GetSampleData();
        samples.push_back({{data, data + sample->GetSampleSize()},
                           sample->GetSampleTime(),
                           sample->SampleIsSync()});
    }
    void EndOfSamples() override { ++ends; }

    std::vector<ISampleStreamConfig*> configs;
    std::vector<RecordedSample> samples;
    int ends = 0;
    int status = 0;
    bool throws = false;
};

}  // namespace zolt
