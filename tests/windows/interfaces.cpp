// Classes that implement every host interface, for check_layout.py: what a compiler makes of them
// shows where it puts each operation and each base.

#include "media/IConfigVideoAvc.h"
#include "media/IConfigVideoUncompressed.h"
#include "media/IEncCapabilities.h"
#include "media/IEncRunTimeControl.h"
#include "media/IEncSettings.h"
#include "media/IMediaEncoder.h"
#include "media/IMediaFileSample.h"
#include "media/IParallelRunner.h"
#include "media/ISampleStreamConfig.h"
#include "media/MediaSample.h"
#include "media/abi.h"
#include "support/IErrMgr.h"
#include "support/ILogger.h"

// The bases of VideoH264ZoltEnc.
class Session : public IMediaEncoder,
                public IConfigVideoAvc,
                public IVideoEncCapabilities,
                public IVideoEncSettings,
                public IVideoEncRunTimeControl {
public:
    void Notify(IEvent*) override {}
    int PutStreamConfig(ISampleStreamConfig*) override { return 0; }
    void PutSample(ISample*) override {}
    void EndOfSamples() override {}
    ZOLT_DESTRUCTOR(Session) = default;
    int GetEncoderMediaType() override { return 0; }
    IEncCapabilities* GetEncCapabilities() override { return this; }
    IEncSettings* GetEncSettings() override { return this; }
    IEncRunTimeControl* GetEncRunTimeControl() override { return this; }
    ISampleStreamConfig* GetSampleStreamConfig() override { return nullptr; }
    int Connect(ISampleConsumer*) override { return 0; }
    void Disconnect(ISampleConsumer*) override {}
    int GetWidth() override { return 0; }
    int GetHeight() override { return 0; }
    double GetFrameRate() override { return 0; }
    unsigned char* GetSeqParSetData() override { return nullptr; }
    int GetSeqParSetSize() override { return 0; }
    unsigned char* GetPicParSetData() override { return nullptr; }
    int GetPicParSetSize() override { return 0; }
    bool SupportsBframes() override { return false; }
    int GetBitRateKbs() override { return 0; }
    int SetBitRateKbs(int) override { return 0; }
    int GetKeyFrameIntMsecs() override { return 0; }
    void SetKeyFrameIntMsecs(int) override {}
    int GetKeyFrameInt() override { return 0; }
    void SetKeyFrameInt(int) override {}
    int GetNumBframes() override { return 0; }
    int SetNumBframes(int) override { return 0; }
    bool SupportsChangingBitRate() override { return false; }
    int ChangeBitRateKbs(int) override { return 0; }
    void ForceIntraFrame() override {}
    bool SupportsProducingExtraIntraFrame() override { return false; }
    void ProduceExtraIntraFrame() override {}
    void SetParallelRunner(IParallelRunner*) override {}
};

class Uncompressed : public IConfigVideoUncompressed {
public:
    int GetWidth() override { return 0; }
    int GetHeight() override { return 0; }
    double GetFrameRate() override { return 0; }
    int GetColorFormat() override { return 0; }
};

// MediaStreamConfig without the C++ library, which is not there for every compiler.
class StreamConfig : public ISampleStreamConfig {
public:
    int GetMediaType() override { return 0; }
    IMediaConfig* GetMediaConfig() override { return nullptr; }
    bool IsEncrypted() override { return false; }
    int GetCryptoSessionKey(unsigned char**) override { return 0; }
    void* GetBwAdaptConfig() override { return nullptr; }
    ZOLT_DESTRUCTOR(StreamConfig) = default;
};

class ParallelTask : public IParallelTask {
public:
    void Run(int) noexcept override {}
};

class ParallelRunner : public IParallelRunner {
public:
    int GetThreads() noexcept override { return 0; }
    void Run(IParallelTask*, int) noexcept override {}
};

class FileSample : public IMediaFileSample {
public:
    unsigned char* GetSampleData() override { return nullptr; }
    long GetSampleSize() override { return 0; }
    long long GetSampleTime() override { return 0; }
    long long GetSampleCompTimeOffset() override { return 0; }
    bool SampleIsSync() override { return false; }
    int GetFrameType() override { return 0; }
    long long GetSampleKeyStreamOffset() override { return 0; }
};

class ErrMgr : public IErrMgr {
public:
    void SetEventListener(IEventListener*) override {}
    void AddCodedErr(int, int, const char*, const char*, const char*, const char*) override {}
    void AddTypedErr(const char*, const char*, const char*, const char*, const char*) override {}
    void AddErr(const char*, const char*, const char*, const char*) override {}
    IErrData* GetError() override { return nullptr; }
    IErrData* GetErrorTraceRoot() override { return nullptr; }
    int GetErrorTrace(IErrData***) override { return 0; }
    char* GetErrorTraceString() override { return nullptr; }
    void ClearErrorTrace() override {}
    int GetErrorTraceThreadIdList(long**) override { return 0; }
    IErrData* GetThreadErrorTraceRoot(long) override { return nullptr; }
    int GetThreadErrorTrace(long, IErrData***) override { return 0; }
    char* GetThreadErrorTraceString(long) override { return nullptr; }
    void ClearThreadErrorTrace(long) override {}
};

class Logger : public ILogger {
public:
    bool StartLoggingToFunc(void (*)(char*)) override { return false; }
    bool StartLoggingToFile(const char*) override { return false; }
    bool StartLoggingToStdout() override { return false; }
    void EndLogging() override {}
    void EnableLogTimeStamp(bool) override {}
    void EnableLogPidThreadId(bool) override {}
    void EnableLogClassMethod(bool) override {}
    void LogOsErr(int, const char*, const char*, const char*) override {}
    void LogErr(int, int, const char*, const char*, const char*) override {}
    void Log(const char*, const char*, const char*) override {}
    void Enable(int, int) override {}
    void Disable(int, int) override {}
    bool IsEnabled(int, int) override { return false; }
};

// Where a host finds what it reads of a sample without a call. Compiled without access control.
constexpr bool k64 = sizeof(void*) == 8;
static_assert(__builtin_offsetof(MediaSample, capacity) == (k64 ? 8 : 4));
static_assert(__builtin_offsetof(MediaSample, data) == (k64 ? 16 : 8));
static_assert(__builtin_offsetof(MediaSample, size) == (k64 ? 24 : 12));
static_assert(__builtin_offsetof(MediaSample, time) == (k64 ? 32 : 16));
static_assert(__builtin_offsetof(MediaSample, isSync) == (k64 ? 40 : 24));
static_assert(__builtin_offsetof(MediaSample, frameType) == (k64 ? 44 : 28));
static_assert(__builtin_offsetof(MediaSample, compTimeOffset) == (k64 ? 48 : 32));
static_assert(__builtin_offsetof(MediaSample, keyStreamOffset) == (k64 ? 56 : 40));
static_assert(__builtin_offsetof(MediaSample, subStreamId) == (k64 ? 64 : 48));

// Makes compilers write down the tables.
void use(const void* object);

void use_all() {
    const Session session;
    const Uncompressed uncompressed;
    const StreamConfig stream_config;
    const FileSample file_sample;
    const MediaSample sample;
    const ErrMgr err_mgr;
    const Logger logger;
    const ParallelTask task;
    const ParallelRunner runner;
    use(&session);
    use(&uncompressed);
    use(&stream_config);
    use(&file_sample);
    use(&sample);
    use(&err_mgr);
    use(&logger);
    use(&task);
    use(&runner);
}
