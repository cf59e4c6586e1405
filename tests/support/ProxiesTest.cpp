#include <gtest/gtest.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "TempDir.h"
#include "TestPlatform.h"
#include "common/Thread.h"
#include "host/IErrData.h"
#include "host/IEvent.h"
#include "in_own_process.h"
#include "media/IEventListener.h"
#include "support/DllUtils.h"
#include "support/ErrMgr.h"
#include "support/Logger.h"
#include "support/dl.h"
#include "support/os.h"

namespace {

namespace fs = std::filesystem;

constexpr int kEngine = 0x656E6769;
constexpr int kOs = 0x6F732020;

std::string host_file() {
    return std::string("host") + zolt::kDllExtension;
}

// The lines of the calling thread's logging: the host's logger calls back on the thread that logs.
thread_local std::vector<std::string> logged;

void collect(char* line) {
    logged.emplace_back(line);
}

std::vector<std::string> take_logged() {
    return std::exchange(logged, {});
}

using Lines = std::vector<std::string>;

// ---- Without a host ----

void expect_nothing_there() {
    logged.clear();
    errno = 77;
    EXPECT_EQ(nullptr, ErrMgr::GetError());
    EXPECT_EQ(77, errno);
    ErrMgr::AddErr("Class", "Method", nullptr, "message %d", 1);
    ErrMgr::AddErr(kEngine, 2, "Class", "Method", nullptr, "message");
    ErrMgr::SeErr("type", "Class", "Method", nullptr, "message");
    ErrMgr::SeErr(3, "Class", "Method", nullptr, "message");
    ErrMgr::OsErr("Class", "Method", nullptr, "message");
    ErrMgr::SetEventListener(nullptr);
    ErrMgr::ClearErrorTrace();
    ErrMgr::ClearErrorTrace(1);
    EXPECT_EQ(nullptr, ErrMgr::GetErrorTraceRoot());
    EXPECT_EQ(nullptr, ErrMgr::GetErrorTraceRoot(1));
    IErrData** trace = nullptr;
    EXPECT_EQ(0, ErrMgr::GetErrorTrace(&trace));
    EXPECT_EQ(0, ErrMgr::GetErrorTrace(1, &trace));
    EXPECT_EQ(nullptr, ErrMgr::GetErrorTraceString());
    EXPECT_EQ(nullptr, ErrMgr::GetErrorTraceString(1));
    long* ids = nullptr;
    EXPECT_EQ(0, ErrMgr::GetErrorTraceThreadIdList(&ids));
    EXPECT_TRUE(ErrMgr::Load());
    ErrMgr::Unload();

    EXPECT_TRUE(Logger::StartLoggingToStdout());
    EXPECT_TRUE(Logger::StartLoggingToFile(kNullDevice));
    EXPECT_TRUE(Logger::StartLoggingToFunc(collect));
    Logger::EnableLogTimeStamp(true);
    Logger::Enable(1, 2);
    EXPECT_FALSE(Logger::IsEnabled(1, 2));
    Logger::Log("message");
    EXPECT_TRUE(Logger::Load());
    Logger::EndLogging();
    EXPECT_EQ(77, errno);
    EXPECT_TRUE(logged.empty());
}

TEST(ProxiesWithoutHost, DoNothingAndNeverSearchAgain) {
    const TempDir dir;
    in_own_process([&dir] {
        DllUtils::SetDllDir(dir.path().c_str());
        expect_nothing_there();
        fs::copy_file(ZOLT_HOST_LIBRARY, dir.path(host_file()));
        testing::internal::CaptureStdout();
        expect_nothing_there();
        EXPECT_EQ("", testing::internal::GetCapturedStdout());
    });
}

// The search for either library reports the missing directory, which needs both.
TEST(ProxiesWithoutHost, MissingDirectoryDoesNotRecurse) {
    const TempDir dir;
    for (const bool logger_first : {false, true}) {
        in_own_process([&dir, logger_first] {
            DllUtils::SetDllDir(dir.path("missing").c_str());
            if (logger_first) {
                Logger::Log("message");
            }
            expect_nothing_there();
            fs::create_directory(dir.path("missing"));
            fs::copy_file(ZOLT_HOST_LIBRARY, dir.path("missing/" + host_file()));
            expect_nothing_there();
            fs::remove_all(dir.path("missing"));
        });
    }
}

TEST(ProxiesWithoutHost, FactoriesWithoutAnObjectCountAsMissing) {
    const TempDir dir;
    in_own_process([&dir] {
        const std::string path = dir.path(host_file());
        fs::copy_file(std::string(ZOLT_TEST_LIBRARIES "/empty_host") + zolt::kDllExtension, path);
        DllUtils::SetDllDir(dir.path().c_str());
        expect_nothing_there();
        EXPECT_FALSE(library_is_loaded(path));
    });
}

// ---- With a host ----

class ProxiesWithHost : public testing::Test {
protected:
    static void SetUpTestSuite() {
        dir = new TempDir;
        fs::copy_file(ZOLT_HOST_LIBRARY, host_path());
        DllUtils::SetDllDir(dir->path().c_str());
    }

    static void TearDownTestSuite() {
        delete dir;
        dir = nullptr;
    }

    void SetUp() override {
        ASSERT_FALSE(Logger::StartLoggingToFunc(collect));
        logged.clear();
    }

    // Every test starts with proxies that have not been tried.
    void TearDown() override {
        ErrMgr::Unload();
        Logger::Unload();
        EXPECT_FALSE(host_is_loaded());
    }

    static std::string host_path() { return dir->path(host_file()); }

    static bool host_is_loaded() { return library_is_loaded(host_path()); }

    static TempDir* dir;
};

TempDir* ProxiesWithHost::dir = nullptr;

TEST_F(ProxiesWithHost, ReportsReachErrorManagerAndLogger) {
    const auto expect_error = [](int domain, int code, const char* type, const char* extra,
                                 const char* message, const char* line) {
        const IErrData* error = ErrMgr::GetError();
        ASSERT_NE(nullptr, error) << message;
        EXPECT_EQ(domain, error->Domain()) << message;
        EXPECT_EQ(code, error->Code()) << message;
        EXPECT_STREQ(type, error->Type()) << message;
        EXPECT_STREQ("Class", error->ClassName()) << message;
        EXPECT_STREQ("Method", error->MethodName()) << message;
        EXPECT_STREQ(message, error->Message());
        EXPECT_STREQ(extra, error->Extra()) << message;
        EXPECT_EQ(Lines{line}, take_logged());
    };
    ErrMgr::AddErr("Class", "Method", nullptr, "100%% of %s", "50%");
    expect_error(0, 0, nullptr, nullptr, "100% of 50%", "Class::Method: 100% of 50%");
    ErrMgr::AddErr(0x61766331, -7, "Class", "Method", "extra", "coded %d", 2);
    expect_error(0x61766331, -7, nullptr, "extra", "coded 2", "Class::Method: coded 2 [avc1 -7]");
    ErrMgr::SeErr("type", "Class", "Method", "extra", "typed %d", 3);
    expect_error(0, 0, "type", "extra", "typed 3", "Class::Method: type: typed 3");
    ErrMgr::SeErr(5, "Class", "Method", nullptr, "engine %d", 4);
    expect_error(kEngine, 5, nullptr, nullptr, "engine 4", "Class::Method: engine 4 [engi 5]");
    zolt::os_set_last_error(ENOENT);
    ErrMgr::OsErr("Class", "Method", "extra", "system %d", 5);
    EXPECT_EQ(ENOENT, zolt::os_last_error());
    char text[200];
    zolt::os_error_text(ENOENT, text, sizeof text);
    expect_error(kOs, ENOENT, nullptr, "extra", "system 5",
                 ("Class::Method: system 5 (" + std::string(text) + ", 2)").c_str());
    ErrMgr::AddErr(nullptr, nullptr, nullptr, "bare");
    EXPECT_EQ(nullptr, ErrMgr::GetError()->ClassName());
    EXPECT_EQ(Lines{"bare"}, take_logged());
}

TEST_F(ProxiesWithHost, OsErrReadsTheCodeBeforeTheFirstLoad) {
    Logger::Unload();
    zolt::os_set_last_error(EACCES);
    ErrMgr::OsErr("Class", "Method", nullptr, "first use");
    EXPECT_EQ(EACCES, zolt::os_last_error());
    EXPECT_EQ(EACCES, ErrMgr::GetError()->Code());
}

TEST_F(ProxiesWithHost, LogLinesAreFilteredAndForwarded) {
    Logger::Log("C", "M", "line %d", 1);
    Logger::Log("bare %d", 2);
    Logger::LogMsg("C", "M", "%d is not a format");
    Logger::LogErr(1, 2, "C", "M", "coded %d", 3);
    EXPECT_EQ((Lines{"C::M: line 1", "bare 2", "C::M: %d is not a format", "C::M: coded 3 [1 2]"}),
              take_logged());

    Logger::Log(1, 2, "C", "M", "before");
    Logger::Enable(1, 2);
    EXPECT_TRUE(Logger::IsEnabled(1, 2));
    EXPECT_FALSE(Logger::IsEnabled(2, 1));
    Logger::Log(1, 2, "C", "M", "while %d", 4);
    Logger::Disable(1, 2);
    Logger::Log(1, 2, "C", "M", "after");
    Logger::EnableLogClassMethod(false);
    Logger::Log("C", "M", "without origin");
    EXPECT_EQ((Lines{"C::M: while 4 [1 2]", "without origin"}), take_logged());

    const std::string path = dir->path("log");
    EXPECT_TRUE(Logger::StartLoggingToFile(dir->path("missing/log").c_str()));
    EXPECT_FALSE(Logger::StartLoggingToFile(path.c_str()));
    Logger::EnableLogTimeStamp(true);
    Logger::EnableLogPidThreadId(true);
    Logger::Log("to a file");
    Logger::EndLogging();
    EXPECT_FALSE(host_is_loaded());
    std::ifstream file(path);
    std::string line;
    std::getline(file, line);
    int matched = 0;
    std::sscanf(line.c_str(), "[%*d.%*3d] [%*d.%*d] to a file%n", &matched);
    EXPECT_EQ(line.size(), static_cast<size_t>(matched)) << line;
    EXPECT_TRUE(logged.empty());
}

TEST_F(ProxiesWithHost, LongMessagesAreCut) {
    const std::string letters(9000, 'x');
    ErrMgr::AddErr("C", "M", nullptr, "%s", letters.substr(0, 300).c_str());
    EXPECT_EQ(letters.substr(0, 199), ErrMgr::GetError()->Message());
    ErrMgr::AddErr("C", "M", nullptr, "%s", letters.substr(0, 199).c_str());
    EXPECT_EQ(letters.substr(0, 199), ErrMgr::GetError()->Message());
    take_logged();
    Logger::Log("%s", letters.c_str());
    EXPECT_EQ(Lines{letters.substr(0, 7999)}, take_logged());
}

TEST_F(ProxiesWithHost, TracesCanBeReadAndCleared) {
    ErrMgr::AddErr("C", "First", nullptr, "one");
    ErrMgr::AddErr(kEngine, 9, "C", "Second", "extra", "two");
    EXPECT_STREQ("one", ErrMgr::GetErrorTraceRoot()->Message());
    IErrData** trace = nullptr;
    ASSERT_EQ(2, ErrMgr::GetErrorTrace(&trace));
    EXPECT_EQ(ErrMgr::GetErrorTraceRoot(), trace[0]);
    EXPECT_EQ(ErrMgr::GetError(), trace[1]);
    delete[] trace;
    const std::unique_ptr<char[]> text(ErrMgr::GetErrorTraceString());
    EXPECT_STREQ("C::First: one\nC::Second: two (extra) [engi 9]\n", text.get());

    long* ids = nullptr;
    ASSERT_EQ(1, ErrMgr::GetErrorTraceThreadIdList(&ids));
    const long own_id = ids[0];
    delete[] ids;
    Thread([own_id] {
        EXPECT_EQ(nullptr, ErrMgr::GetError());
        EXPECT_STREQ("one", ErrMgr::GetErrorTraceRoot(own_id)->Message());
        IErrData** other_trace = nullptr;
        EXPECT_EQ(2, ErrMgr::GetErrorTrace(own_id, &other_trace));
        delete[] other_trace;
        delete[] ErrMgr::GetErrorTraceString(own_id);
        ErrMgr::ClearErrorTrace(own_id);
    }).join();
    EXPECT_EQ(nullptr, ErrMgr::GetError());

    // A trace keeps its first error and the latest hundred.
    for (int i = 0; i < 300; i++) {
        ErrMgr::AddErr("C", "M", nullptr, "%d", i);
    }
    ASSERT_EQ(101, ErrMgr::GetErrorTrace(&trace));
    EXPECT_STREQ("0", trace[0]->Message());
    EXPECT_STREQ("200", trace[1]->Message());
    EXPECT_STREQ("299", trace[100]->Message());
    delete[] trace;
    ErrMgr::ClearErrorTrace();
    EXPECT_EQ(0, ErrMgr::GetErrorTrace(&trace));
}

class CountingListener : public IEventListener {
public:
    void Notify(IEvent* event) override { messages.emplace_back(event->GetError()->Message()); }

    Lines messages;
};

TEST_F(ProxiesWithHost, TheListenerHearsOfEveryError) {
    CountingListener listener;
    ErrMgr::SetEventListener(&listener);
    ErrMgr::AddErr("C", "M", nullptr, "one");
    ErrMgr::SeErr(2, "C", "M", nullptr, "two");
    ErrMgr::SetEventListener(nullptr);
    ErrMgr::AddErr("C", "M", nullptr, "three");
    EXPECT_EQ((Lines{"one", "two"}), listener.messages);
}

// Constructed before the proxies' objects and so destroyed after them.
struct LateUser {
    void (*use)() = nullptr;
    ~LateUser() {
        if (use != nullptr) {
            use();
        }
    }
};
[[gnu::init_priority(101)]] LateUser late_user;

// For late users, which are too late for an expectation.
void require(bool holds, const char* what) {
    if (!holds) {
        std::fprintf(stderr, "after the proxies' end: not so: %s\n", what);
        std::_Exit(1);
    }
}

int late_lines = 0;

// The proxy in question is the only one that holds the host's library, so that giving its object
// back would unload that.
TEST_F(ProxiesWithHost, StayAsTheyAreAfterTheirEnd) {
    in_own_process([] {
        Logger::Unload();
        EXPECT_FALSE(ErrMgr::Load());
        late_user.use = [] {
            ErrMgr::Unload();
            require(host_is_loaded(), "ErrMgr::Unload keeps the library");
            ErrMgr::ClearErrorTrace();
            ErrMgr::AddErr("C", "M", nullptr, "late");
            const IErrData* error = ErrMgr::GetError();
            require(error != nullptr && error->Message() == std::string("late"),
                    "errors reach the error manager");
        };
    });
    in_own_process([] {
        EXPECT_FALSE(Logger::StartLoggingToFunc([](char*) { late_lines++; }));
        late_user.use = [] {
            Logger::Unload();
            require(host_is_loaded(), "Logger::Unload keeps the library");
            Logger::EndLogging();
            require(host_is_loaded(), "Logger::EndLogging keeps the library");
            Logger::Log("late");
            require(late_lines == 1, "lines reach the logger");
        };
    });
}

TEST_F(ProxiesWithHost, UnloadedProxiesLoadAgain) {
    for (int round = 0; round < 3; round++) {
        EXPECT_EQ(nullptr, ErrMgr::GetError());  // a new object each time
        ErrMgr::AddErr("C", "M", nullptr, "round %d", round);
        EXPECT_EQ("round " + std::to_string(round), ErrMgr::GetError()->Message());
        EXPECT_FALSE(ErrMgr::Load());
        ErrMgr::Unload();
        ErrMgr::Unload();
        Logger::EndLogging();
        EXPECT_FALSE(host_is_loaded());
    }
}

// A host program and the encoder library share one error manager, and neither takes it from the
// other.
TEST_F(ProxiesWithHost, TheHostProgramReadsWhatWasReported) {
    void* library = dlopen(host_path().c_str(), RTLD_LAZY);
    ASSERT_NE(nullptr, library);
    const auto get = reinterpret_cast<IErrMgr* (*)()>(dlsym(library, "GetErrMgr"));
    const auto give_back = reinterpret_cast<void (*)()>(dlsym(library, "DeleteErrMgr"));
    IErrMgr* host = get();
    EXPECT_EQ(nullptr, host->GetError());
    ErrMgr::AddErr("C", "M", nullptr, "shared");
    ErrMgr::Unload();
    ASSERT_NE(nullptr, host->GetError());
    EXPECT_STREQ("shared", host->GetError()->Message());
    give_back();
    host = get();  // both had given it back, so this is a new one
    EXPECT_EQ(nullptr, host->GetError());
    give_back();
    give_back();  // one too many does nothing
    dlclose(library);
}

// First uses of both proxies at once, then reports from all sides.
TEST_F(ProxiesWithHost, ManyThreads) {
    static constexpr int kThreads = 8;
    static constexpr int kReports = 50;
    Logger::Unload();
    std::vector<Thread> threads;
    for (int t = 0; t < kThreads; t++) {
        threads.emplace_back([t] {
            if (t % 2 == 0) {
                Logger::StartLoggingToFunc(collect);
            }
            for (int i = 0; i < kReports; i++) {
                ErrMgr::AddErr("C", "M", nullptr, "thread %d report %d", t, i);
                Logger::Log(t, i, "C", "M", "line");
                Logger::Enable(t, i);
                EXPECT_EQ("thread " + std::to_string(t) + " report " + std::to_string(i),
                          ErrMgr::GetError()->Message());
            }
            IErrData** trace = nullptr;
            EXPECT_EQ(kReports, ErrMgr::GetErrorTrace(&trace));
            delete[] trace;
        });
    }
    for (Thread& thread : threads) {
        thread.join();
    }
    long* ids = nullptr;
    EXPECT_EQ(kThreads, ErrMgr::GetErrorTraceThreadIdList(&ids));
    delete[] ids;
}

// ---- The host's tables of operations ----

// The slot of a virtual operation. On this platform a pointer to one begins with 1 + its offset in
// the table.
template <class Operation>
int slot(Operation operation) {
    std::ptrdiff_t value = 0;
    std::memcpy(&value, &operation, sizeof value);
    return static_cast<int>((value - 1) / static_cast<std::ptrdiff_t>(sizeof(void*)));
}

TEST(HostInterfaces, OperationsKeepTheirSlots) {
    const int err_mgr[] = {
        slot(&IErrMgr::SetEventListener),
        slot(&IErrMgr::AddCodedErr),
        slot(&IErrMgr::AddTypedErr),
        slot(&IErrMgr::AddErr),
        slot(&IErrMgr::GetError),
        slot(&IErrMgr::GetErrorTraceRoot),
        slot(&IErrMgr::GetErrorTrace),
        slot(&IErrMgr::GetErrorTraceString),
        slot(&IErrMgr::ClearErrorTrace),
        slot(&IErrMgr::GetErrorTraceThreadIdList),
        slot(&IErrMgr::GetThreadErrorTraceRoot),
        slot(&IErrMgr::GetThreadErrorTrace),
        slot(&IErrMgr::GetThreadErrorTraceString),
        slot(&IErrMgr::ClearThreadErrorTrace),
    };
    const int logger[] = {
        slot(&ILogger::StartLoggingToFunc),
        slot(&ILogger::StartLoggingToFile),
        slot(&ILogger::StartLoggingToStdout),
        slot(&ILogger::EndLogging),
        slot(&ILogger::EnableLogTimeStamp),
        slot(&ILogger::EnableLogPidThreadId),
        slot(&ILogger::EnableLogClassMethod),
        slot(&ILogger::LogOsErr),
        slot(&ILogger::LogErr),
        slot(&ILogger::Log),
        slot(&ILogger::Enable),
        slot(&ILogger::Disable),
        slot(&ILogger::IsEnabled),
    };
    for (int i = 0; i < 14; i++) {
        EXPECT_EQ(i, err_mgr[i]);
    }
    for (int i = 0; i < 13; i++) {
        EXPECT_EQ(i, logger[i]);
    }
}

}  // namespace
