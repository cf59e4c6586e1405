#pragma once

#include <functional>
#include <string>
#include <vector>

#include "media/IConfigVideoAvc.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/ISampleConsumer.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"
#include "media/MediaType.h"
#include "media/fourcc.h"

using Bytes = std::vector<unsigned char>;

// The description of an input stream, and the stream configuration that carries it.
class InputConfig : public IConfigVideoUncompressed {
public:
    InputConfig(int picture_width, int picture_height, double rate = 25.0,
                int format = zolt::fourcc("IYUV"))
        : width(picture_width), height(picture_height), frame_rate(rate), color_format(format) {}

    int GetWidth() override { return width; }
    int GetHeight() override { return height; }
    double GetFrameRate() override { return frame_rate; }
    int GetColorFormat() override { return color_format; }

    MediaStreamConfig* stream() { return &stream_config; }

    int width, height;
    double frame_rate;
    int color_format;

private:
    MediaStreamConfig stream_config{MediaType::kVideoUncompressed, this};
};

// A frame at a time in microseconds; the sample borrows the bytes.
class Frame : public MediaSample {
public:
    Frame(long long microseconds, Bytes picture) : bytes(std::move(picture)) {
        SetSampleData(bytes.data());
        SetSampleSize(static_cast<long>(bytes.size()));
        SetSampleTime(microseconds);
    }

private:
    Bytes bytes;
};

// Keeps what a session sends.
class Consumer : public ISampleConsumer {
public:
    struct Unit {
        Bytes bytes;
        long long time;
        int frame_type;
        bool sync;
    };

    void Notify(IEvent* event) override { events.push_back(event); }

    int PutStreamConfig(ISampleStreamConfig* config) override {
        ++configs;
        media_type = config->GetMediaType();
        description = static_cast<IConfigVideoAvc*>(config->GetMediaConfig());
        return status;
    }

    void PutSample(ISample* sample) override {
        units.push_back(
            {{sample->GetSampleData(), sample->GetSampleData() + sample->GetSampleSize()},
             sample->GetSampleTime(),
             static_cast<MediaSample*>(sample)->GetFrameType(),
             sample->SampleIsSync()});
        if (on_sample) {
            on_sample();
        }
    }

    void EndOfSamples() override { ++ends; }

    int status = 0;                   // what PutStreamConfig answers
    std::function<void()> on_sample;  // called when a sample has been kept

    std::vector<IEvent*> events;
    int configs = 0;
    int media_type = 0;
    IConfigVideoAvc* description = nullptr;
    std::vector<Unit> units;
    int ends = 0;
};
