// A host of the encoder library as another compiler builds it, in the Microsoft C++ ABI: what it
// knows of the library are the headers of the interfaces. It stops at the first fault with a
// message and status 1.
//
// Loads the library from the current directory, and writes the pictures that it made (NAME.raw)
// and their streams (NAME.h264) there, with a line "stream NAME WxH FPS KBPS KEYINT FORMAT" for
// each. The environment variable STREAMING_ENGINE_LIB names the directory of services_msabi.dll.

#include "media/IConfigVideoAvc.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/IEncCapabilities.h"
#include "media/IEncRunTimeControl.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/ISample.h"
#include "media/ISampleConsumer.h"
#include "media/ISampleStreamConfig.h"
#include "media/MediaSample.h"
#include "media/MediaType.h"
#include "media/abi.h"
#include "media/fourcc.h"
#include "plugin/VideoH264ZoltEncDll.h"
#include "system.h"

namespace {

constexpr unsigned char kStartCode[] = {0, 0, 0, 1};
constexpr int kPictures = 12;

// Output and checks

Size length_of(const char* text) {
    Size length = 0;
    while (text[length] != '\0') {
        ++length;
    }
    return length;
}

void print(const char* text) {
    constexpr unsigned long kStandardOutput = 0xFFFFFFF5;
    unsigned long written = 0;
    WriteFile(GetStdHandle(kStandardOutput), text, static_cast<unsigned long>(length_of(text)),
              &written, nullptr);
}

void print(int number) {
    char digits[12];
    char* first = digits + sizeof digits - 1;
    *first = '\0';
    auto rest = static_cast<unsigned>(number < 0 ? -number : number);
    do {
        *--first = static_cast<char>('0' + rest % 10);
        rest /= 10;
    } while (rest != 0);
    if (number < 0) {
        *--first = '-';
    }
    print(first);
}

[[noreturn]] void fail(const char* what, int line) {
    print("host_msabi.cpp:");
    print(line);
    print(": not true: ");
    print(what);
    print("\n");
    ExitProcess(1);
}

#define CHECK(condition) ((condition) ? void() : fail(#condition, __LINE__))

bool equal(const unsigned char* a, const unsigned char* b, Size bytes) {
    for (Size i = 0; i < bytes; ++i) {
        if (a[i] != b[i]) {
            return false;
        }
    }
    return true;
}

bool equal(const char* a, const char* b) {
    const Size bytes = length_of(a) + 1;
    return bytes == length_of(b) + 1 && equal(reinterpret_cast<const unsigned char*>(a),
                                              reinterpret_cast<const unsigned char*>(b), bytes);
}

// Collects bytes and writes them into a file.
class Buffer {
public:
    void clear() { size = 0; }

    void append(const unsigned char* data, Size count) {
        CHECK(size + count <= sizeof bytes);
        memcpy(bytes + size, data, count);
        size += count;
    }

    void save(const char* name, const char* extension) const {
        char path[64];
        const Size length = length_of(name);
        memcpy(path, name, length);
        memcpy(path + length, extension, length_of(extension) + 1);
        constexpr unsigned long kWrite = 0x40000000, kCreateAlways = 2, kNormal = 0x80;
        const Handle file = CreateFileA(path, kWrite, 0, nullptr, kCreateAlways, kNormal, nullptr);
        unsigned long written = 0;
        CHECK(WriteFile(file, bytes, static_cast<unsigned long>(size), &written, nullptr) != 0);
        CHECK(written == size);
        CloseHandle(file);
    }

    unsigned char bytes[1 << 20];
    Size size = 0;
};

Buffer pictures;
Buffer stream;
Buffer other_stream;

// The host's side of the interfaces

class Video : public IConfigVideoUncompressed {
public:
    Video(int picture_width, int picture_height, int frames_per_second, int color_format)
        : width(picture_width),
          height(picture_height),
          rate(frames_per_second),
          format(color_format) {}

    int GetWidth() override { return width; }
    int GetHeight() override { return height; }
    double GetFrameRate() override { return rate; }
    int GetColorFormat() override { return format; }

    // In this ABI the first field and the empty base are at one place.
    const int width, height;
    const double rate;
    const int format;
};

class StreamConfig : public ISampleStreamConfig {
public:
    StreamConfig(int media_type, IMediaConfig* media_config)
        : type(media_type), config(media_config) {}

    int GetMediaType() override { return type; }
    IMediaConfig* GetMediaConfig() override { return config; }
    bool IsEncrypted() override { return false; }
    int GetCryptoSessionKey(unsigned char** key) override {
        *key = nullptr;
        return 0;
    }
    void* GetBwAdaptConfig() override { return nullptr; }

private:
    const int type;
    IMediaConfig* const config;
};

class Sample : public ISample {
public:
    Sample(unsigned char* picture, long picture_bytes, long long microseconds)
        : data(picture), bytes(picture_bytes), time(microseconds) {}

    unsigned char* GetSampleData() override { return data; }
    long GetSampleSize() override { return bytes; }
    long long GetSampleTime() override { return time; }
    bool SampleIsSync() override { return true; }
    long long GetSampleCompTimeOffset() override { return 0; }
    long long GetSampleKeyStreamOffset() override { return 0; }
    int GetSubStreamId() override { return 0; }

private:
    unsigned char* const data;
    const long bytes;
    const long long time;
};

// Checks what the encoder sends and collects it as an Annex B stream.
class Consumer : public ISampleConsumer {
public:
    Consumer(Buffer& annex_b, int key_frame_interval)
        : output(annex_b), interval(key_frame_interval) {
        output.clear();
    }

    void Notify(IEvent* received) override { event = received; }

    int PutStreamConfig(ISampleStreamConfig* config) override {
        CHECK(config->GetMediaType() == MediaType::kVideoAvc);
        CHECK(!config->IsEncrypted());
        unsigned char byte = 0;
        unsigned char* key = &byte;
        CHECK(config->GetCryptoSessionKey(&key) == 0);
        CHECK(key == nullptr);
        CHECK(config->GetBwAdaptConfig() == nullptr);
        video = static_cast<IConfigVideoAvc*>(config->GetMediaConfig());
        CHECK(video != nullptr);
        CHECK(video->GetSeqParSetSize() > 4 && video->GetPicParSetSize() > 2);
        CHECK((video->GetSeqParSetData()[0] & 31) == 7);
        CHECK((video->GetPicParSetData()[0] & 31) == 8);
        output.clear();
        append(video->GetSeqParSetData(), video->GetSeqParSetSize());
        append(video->GetPicParSetData(), video->GetPicParSetSize());
        return answer;
    }

    void PutSample(ISample* sample) override {
        const bool key = taken % interval == 0;
        CHECK((sample->GetSampleData()[0] & 31) == (key ? 5 : 1));
        CHECK(sample->SampleIsSync() == key);
        CHECK(sample->GetSampleTime() == expected_time);
        CHECK(sample->GetSampleCompTimeOffset() == 0);
        CHECK(sample->GetSampleKeyStreamOffset() == 0);
        CHECK(sample->GetSubStreamId() == 0);
        // Not virtual: read where this compiler lays out the field.
        CHECK(static_cast<MediaSample*>(sample)->GetFrameType() == (key ? 'I' : 0));
        append(sample->GetSampleData(), sample->GetSampleSize());
        ++taken;
    }

    void EndOfSamples() override { ++ends; }

    int answer = 0;
    long long expected_time = 0;
    IEvent* event = nullptr;
    IConfigVideoAvc* video = nullptr;
    int taken = 0;
    int ends = 0;

private:
    void append(const unsigned char* unit, long bytes) {
        output.append(kStartCode, sizeof kStartCode);
        output.append(unit, static_cast<Size>(bytes));
    }

    Buffer& output;
    const int interval;
};

// The library

Handle library;

template <class Function>
Function* find(Handle from, const char* name) {
    void* const address = GetProcAddress(from, name);
    CHECK(address != nullptr);
    return reinterpret_cast<Function*>(address);
}

IMediaEncoder* new_encoder() {
    IMediaEncoder* const encoder = find<decltype(GetNewEncoder)>(library, "GetNewEncoder")();
    CHECK(encoder != nullptr);
    return encoder;
}

IVideoEncSettings* settings_of(IMediaEncoder* encoder) {
    return static_cast<IVideoEncSettings*>(encoder->GetEncSettings());
}

// Pictures

struct Case {
    const char* name;
    const char* format;
    int width, height, frames_per_second, bit_rate_kbs, key_frame_interval;
};

// Both sizes that are coded whole and sizes whose middle is.
constexpr Case kCases[] = {
    {"iyuv", "IYUV", 96, 80, 25, 200, 5},  {"iyuv_cut", "IYUV", 74, 54, 30, 60, 30},
    {"yuy2", "YUY2", 70, 37, 25, 300, 4},  {"ayuv", "AYUV", 48, 48, 10, 100, 12},
    {"bgra", "BGRA", 96, 80, 25, 400, 5},  {"rgba", "RGBA", 65, 50, 30, 150, 6},
    {"argb", "ARGB", 64, 64, 25, 0, 3},    {"bgr", "BGR ", 50, 34, 25, 200, 1},
    {"rgb", "RGB ", 112, 64, 15, 700, 40},
};

int format_code(const char* text) {
    int code = 0;
    for (int i = 0; i < 4; ++i) {
        code = code << 8 | text[i];
    }
    return code;
}

int row_bytes(const Case& of) {
    const bool rgb = of.format[3] == ' ';
    const bool four = of.format[0] == 'A' || of.format[3] == 'A';
    return of.width * (rgb ? 3 : four ? 4 : equal(of.format, "YUY2") ? 2 : 1);
}

long picture_bytes(const Case& of) {
    const long luma = static_cast<long>(row_bytes(of)) * of.height;
    return equal(of.format, "IYUV") ? luma + 2 * (of.width / 2) * (of.height / 2) : luma;
}

// A texture that moves, with some noise.
void draw(const Case& of, int index, unsigned char* picture) {
    unsigned noise = static_cast<unsigned>(index);
    const int bytes_in_row = row_bytes(of);
    const long bytes = picture_bytes(of);
    for (long i = 0; i < bytes; ++i) {
        const int x = static_cast<int>(i) % bytes_in_row + 3 * index;
        const int y = static_cast<int>(i) / bytes_in_row + index;
        noise = noise * 1664525 + 1013904223;
        picture[i] = static_cast<unsigned char>((x * y >> 4) + static_cast<int>(noise >> 29));
    }
}

long long time_of(const Case& of, int index) {
    return index * 1000000 / of.frames_per_second;
}

// Scenarios

void check_settings(IMediaEncoder* encoder, const Case& of) {
    IVideoEncSettings* const settings = settings_of(encoder);
    CHECK(settings->GetBitRateKbs() == 200);
    CHECK(settings->SetBitRateKbs(of.bit_rate_kbs) == of.bit_rate_kbs);
    CHECK(settings->GetBitRateKbs() == of.bit_rate_kbs);
    CHECK(settings->GetKeyFrameInt() == 30);
    settings->SetKeyFrameIntMsecs(1234);
    CHECK(settings->GetKeyFrameIntMsecs() == 0);
    settings->SetKeyFrameInt(of.key_frame_interval);
    CHECK(settings->GetKeyFrameInt() == of.key_frame_interval);
    CHECK(settings->SetNumBframes(2) == 0);
    CHECK(settings->GetNumBframes() == 0);

    auto* const capabilities = static_cast<IVideoEncCapabilities*>(encoder->GetEncCapabilities());
    CHECK(!capabilities->SupportsBframes());

    auto* const control = static_cast<IVideoEncRunTimeControl*>(encoder->GetEncRunTimeControl());
    CHECK(control->SupportsChangingBitRate());
    CHECK(control->ChangeBitRateKbs(77) == of.bit_rate_kbs);
    control->ForceIntraFrame();
    CHECK(!control->SupportsProducingExtraIntraFrame());
    control->ProduceExtraIntraFrame();
}

void check_description(IMediaEncoder* encoder, const Consumer& consumer, const Case& of) {
    ISampleStreamConfig* const config = encoder->GetSampleStreamConfig();
    CHECK(config->GetMediaType() == encoder->GetEncoderMediaType());
    IMediaConfig* const media_config = config->GetMediaConfig();
    IConfigVideo* const video = static_cast<IConfigVideo*>(media_config);
    CHECK(video == consumer.video);
    CHECK(static_cast<IConfigVideoAvc*>(media_config) == consumer.video);
    CHECK(static_cast<IMediaConfig*>(consumer.video) == media_config);
    CHECK(video->GetWidth() == of.width / 16 * 16);
    CHECK(video->GetHeight() == of.height / 16 * 16);
    CHECK(video->GetFrameRate() == of.frames_per_second);
}

void encode(const Case& of, bool connect_first) {
    Video video(of.width, of.height, of.frames_per_second, format_code(of.format));
    StreamConfig config(MediaType::kVideoUncompressed, &video);
    Consumer consumer(stream, of.key_frame_interval);
    Consumer stranger(other_stream, 1);
    IMediaEncoder* const encoder = new_encoder();
    CHECK(encoder->GetEncoderMediaType() == MediaType::kVideoAvc);
    check_settings(encoder, of);
    if (connect_first) {
        CHECK(encoder->Connect(&consumer) == 0);
        CHECK(consumer.video == nullptr);
        consumer.answer = 7;
        CHECK(encoder->PutStreamConfig(&config) == 7);
    } else {
        CHECK(encoder->PutStreamConfig(&config) == 0);
        CHECK(encoder->Connect(&consumer) == 0);
    }
    CHECK(video.width == of.width && video.height == of.height);
    check_description(encoder, consumer, of);

    pictures.clear();
    unsigned char* const place = pictures.bytes;
    const long bytes = picture_bytes(of);
    for (int i = 0; i < kPictures; ++i) {
        CHECK(pictures.size + static_cast<Size>(bytes) <= sizeof pictures.bytes);
        draw(of, i, place + pictures.size);
        consumer.expected_time = time_of(of, i);
        Sample sample(place + pictures.size, bytes, consumer.expected_time);
        encoder->PutSample(&sample);
        CHECK(consumer.taken == i + 1);
        pictures.size += static_cast<Size>(bytes);
    }
    auto* const event = reinterpret_cast<IEvent*>(&video);
    encoder->Notify(event);
    CHECK(consumer.event == event);
    encoder->EndOfSamples();
    CHECK(consumer.ends == 1);
    encoder->Disconnect(&stranger);
    encoder->EndOfSamples();
    CHECK(consumer.ends == 2);
    encoder->Disconnect(&consumer);
    encoder->EndOfSamples();
    CHECK(consumer.ends == 2);
    delete encoder;

    pictures.save(of.name, ".raw");
    stream.save(of.name, ".h264");
    print("stream ");
    print(of.name);
    print(" ");
    print(of.width);
    print("x");
    print(of.height);
    print(" ");
    print(of.frames_per_second);
    print(" ");
    print(of.bit_rate_kbs);
    print(" ");
    print(of.key_frame_interval);
    print(" ");
    print(of.format);
    print("\n");
}

const char* take_reports() {
    const Handle services = GetModuleHandleA("services_msabi.dll");
    CHECK(services != nullptr);
    return find<const char*()>(services, "TakeReports")();
}

// Reports reach slot 3 of the host's error manager and slot 9 of its logger.
void check_reports() {
    Video video(64, 64, 25, format_code("IYUV"));
    StreamConfig coded(MediaType::kVideoAvc, &video);
    StreamConfig nothing(MediaType::kVideoUncompressed, nullptr);
    IMediaEncoder* const encoder = new_encoder();
    CHECK(encoder->PutStreamConfig(&coded) == 1);
    CHECK(equal(take_reports(),
                "log|VideoH264ZoltEnc|PutStreamConfig|Expected media type Video Uncompressed, but "
                "got Video AVC\n"
                "err|VideoH264ZoltEnc|PutStreamConfig|Expected media type Video Uncompressed, but "
                "got Video AVC|(null)\n"));
    // A null pointer stays null, whatever a cast adds to others.
    CHECK(encoder->PutStreamConfig(&nothing) == 1);
    CHECK(equal(take_reports(),
                "log|VideoH264ZoltEnc|PutStreamConfig|Media config may not be NULL\n"
                "err|VideoH264ZoltEnc|PutStreamConfig|Media config may not be NULL|(null)\n"));
    settings_of(encoder)->SetKeyFrameInt(-3);
    CHECK(equal(take_reports(),
                "log|VideoH264ZoltEnc|SetKeyFrameInt|Key frame interval must be positive, but got "
                "-3\n"
                "err|VideoH264ZoltEnc|SetKeyFrameInt|Key frame interval must be positive, but got "
                "-3|(null)\n"));
    delete encoder;
}

Size committed() {
    MemoryCounters counters{};
    counters.bytes = sizeof counters;
    CHECK(K32GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof counters) != 0);
    return counters.committed;
}

// `delete` destroys the session with all that it owns.
void check_deletion() {
    Video video(1280, 720, 25, format_code("IYUV"));
    StreamConfig config(MediaType::kVideoUncompressed, &video);
    Size smallest = 0, largest = 0, session = 0;
    for (int i = 0; i < 24; ++i) {
        Consumer consumer(stream, 1);
        const Size before = committed();
        IMediaEncoder* const encoder = new_encoder();
        encoder->PutStreamConfig(&config);
        encoder->Connect(&consumer);
        const Size during = committed();
        delete encoder;
        if (i >= 4) {  // the allocator has what it keeps
            smallest = i == 4 || before < smallest ? before : smallest;
            largest = before > largest ? before : largest;
        } else if (during > before && during - before > session) {
            session = during - before;
        }
    }
    CHECK(session > 1280 * 720 * 3 / 2);
    CHECK(largest - smallest < 2 * session);
}

#ifdef _M_IX86

// Calls `function` with `argument` as its only argument and `object` as the object, with the stack
// pointer `offset` bytes above a multiple of 16 at the call, of which compilers like to be sure.
// What remains of the argument on the stack, if the function does not remove it, goes with the
// frame.
__attribute__((naked)) void* __cdecl call_misaligned(void*, void*, const void*, unsigned) {
    asm("push %ebp\n"
        "mov %esp, %ebp\n"
        "mov 8(%ebp), %eax\n"
        "mov 12(%ebp), %ecx\n"
        "and $-16, %esp\n"
        "sub $28, %esp\n"
        "add 20(%ebp), %esp\n"
        "push 16(%ebp)\n"
        "call *%eax\n"
        "mov %ebp, %esp\n"
        "pop %ebp\n"
        "ret\n");
}

void* slot(void* object, int number) {
    return (*static_cast<void***>(object))[number];
}

// The stream is the same when every call comes with the stack aligned to 4 bytes only.
void check_misaligned() {
    const Case& of = kCases[4];
    encode(of, false);
    for (unsigned offset = 0; offset < 16; offset += 4) {
        Video video(of.width, of.height, of.frames_per_second, format_code(of.format));
        StreamConfig config(MediaType::kVideoUncompressed, &video);
        Consumer consumer(other_stream, of.key_frame_interval);
        void* const new_object = GetProcAddress(library, "GetNewEncoder");
        auto* const encoder =
            static_cast<IMediaEncoder*>(call_misaligned(new_object, nullptr, nullptr, offset));
        settings_of(encoder)->SetBitRateKbs(of.bit_rate_kbs);
        settings_of(encoder)->SetKeyFrameInt(of.key_frame_interval);
        call_misaligned(slot(encoder, 1), encoder, &config, offset);
        ISampleProducer* const producer = encoder;
        call_misaligned(slot(producer, 1), producer, &consumer, offset);
        const long bytes = picture_bytes(of);
        for (int i = 0; i < kPictures; ++i) {
            consumer.expected_time = time_of(of, i);
            Sample sample(pictures.bytes + i * bytes, bytes, consumer.expected_time);
            call_misaligned(slot(encoder, 2), encoder, &sample, offset);
        }
        CHECK(consumer.taken == kPictures);
        CHECK(stream.size == other_stream.size);
        CHECK(equal(stream.bytes, other_stream.bytes, stream.size));
        delete encoder;
    }
    print("frames aligned to 4 bytes: same stream\n");
}

#endif

}  // namespace

extern "C" void host_main() {
    library = LoadLibraryA("VideoH264ZoltEnc.dll");
    CHECK(library != nullptr);
    CHECK(find<decltype(GetEncoderType)>(library, "GetEncoderType")() == MediaType::kVideoAvc);
    CHECK(equal(find<decltype(GetEncoderName)>(library, "GetEncoderName")(),
                "ZOLT H.264 Video Encoder"));
    bool connect_first = false;
    for (const Case& of : kCases) {
        encode(of, connect_first);
        connect_first = !connect_first;
    }
    check_reports();
    check_deletion();
#ifdef _M_IX86
    check_misaligned();
#endif
    CHECK(FreeLibrary(library) != 0);
    print("host_msabi: all is as it should be\n");
    ExitProcess(0);
}
