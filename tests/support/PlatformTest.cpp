// What the layer over the operating system does on Linux.

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/time.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <thread>

#include "TempDir.h"
#include "support/DllUtils.h"
#include "support/ErrMgr.h"
#include "support/MutexLock.h"
#include "support/Util.h"
#include "support/dl.h"
#include "support/pdir.h"
#include "support/pthread.h"

namespace {

TEST(SimpleMutex, IsRecursiveAndExcludesOtherThreads) {
    SimpleMutex mutex;
    const auto is_free_for_others = [&mutex] {
        bool taken = false;
        std::thread([&] {
            taken = pthread_mutex_trylock(&mutex.mutex) == 0;
            if (taken) {
                pthread_mutex_unlock(&mutex.mutex);
            }
        }).join();
        return taken;
    };
    try {
        const zolt::MutexLock outer(mutex);
        { const zolt::MutexLock inner(mutex); }
        EXPECT_FALSE(is_free_for_others());
        throw 1;
    } catch (int) {
        EXPECT_TRUE(is_free_for_others());
    }
}

TEST(Pthread, TimeCriticalThreadsAreRealTimeWherePermitted) {
    std::thread([] {
        const int permitted = pthread_setTimeCritical(pthread_self());
        int policy = -1;
        sched_param parameters{};
        ASSERT_EQ(0, pthread_getschedparam(pthread_self(), &policy, &parameters));
        EXPECT_EQ(permitted == 1, policy == SCHED_RR);
    }).join();
}

TEST(Pdir, ListsADirectoryTwice) {
    const TempDir dir;
    const unsigned char byte = 0;
    ASSERT_EQ(0, Util::WriteByteArrayToFile(dir.path("file").c_str(), &byte, 1));
    DIR* listing = opendir(dir.path().c_str());
    ASSERT_NE(nullptr, listing);
    for (int pass = 0; pass < 2; pass++) {
        std::multiset<std::string> names;
        while (const dirent* entry = readdir(listing)) {
            names.insert(entry->d_name);
        }
        EXPECT_EQ((std::multiset<std::string>{".", "..", "file"}), names);
        rewinddir(listing);
    }
    EXPECT_EQ(0, closedir(listing));
    EXPECT_EQ(nullptr, opendir(dir.path("missing").c_str()));
    EXPECT_EQ(ENOENT, errno);
}

// Opening a pipe would wait for a writer.
TEST(DllUtils, LeavesAloneWhatIsNoRegularFile) {
    const TempDir dir;
    const std::string library = std::string(ZOLT_TEST_LIBRARIES) + "/complete.so";
    std::filesystem::copy_file(library, dir.path(".so"));  // too short a name
    std::filesystem::create_directory(dir.path("directory"));
    std::filesystem::create_directory_symlink(dir.path("directory"), dir.path("link.so"));
    ASSERT_EQ(0, mkfifo(dir.path("pipe.so").c_str(), 0600));
    DllUtils::SetDllDir(dir.path().c_str());
    char found[288];
    EXPECT_EQ(1, DllUtils::ConstructDllFullPathName(found, "pipe"));
    void* handles[3];
    testing::internal::CaptureStdout();
    EXPECT_EQ(0, DllUtils::LoadAllDlls(0, nullptr, 3, nullptr, handles, nullptr));
    EXPECT_EQ("", testing::internal::GetCapturedStdout());
}

TEST(UtilFiles, ThatAreNoOrdinaryOnes) {
    // A file whose size is not known beforehand.
    const std::unique_ptr<char[]> status(Util::ReadFileIntoNewString("/proc/self/status"));
    EXPECT_NE(nullptr, std::strstr(status.get(), "Pid:"));
    // The disk is found full when the buffered bytes are written, at the end.
    const unsigned char byte = 1;
    EXPECT_EQ(1, Util::WriteByteArrayToFile("/dev/full", &byte, 1));
}

bool stop = false;

TEST(SleepMsecs, StopsWhenTheFlagRises) {
    ASSERT_NE(SIG_ERR, std::signal(SIGALRM, [](int) { stop = true; }));
    const itimerval soon = {{0, 0}, {0, 60000}};
    setitimer(ITIMER_REAL, &soon, nullptr);
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(1, Util::SleepMsecs(60000, &stop));
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
    std::signal(SIGALRM, SIG_DFL);
}

TEST(Dl, ReportsTheLastError) {
    void* self = dlopen(nullptr, RTLD_LAZY);
    ASSERT_NE(nullptr, self);
    dlerror();
    EXPECT_NE(nullptr, dlsym(self, "malloc"));
    EXPECT_EQ(nullptr, dlerror());
    EXPECT_EQ(nullptr, dlsym(self, "no_such_function"));
    EXPECT_NE(nullptr, dlerror());
    EXPECT_EQ(0, dlclose(self));
}

TEST(GetOsLastErrorString, GivesCodeAndText) {
    char text[64];
    errno = EACCES;
    EXPECT_EQ(EACCES, ErrMgr::GetOsLastErrorString(text, sizeof text));
    EXPECT_STREQ(std::strerror(EACCES), text);
    errno = EACCES;
    EXPECT_EQ(EACCES, ErrMgr::GetOsLastErrorString(text, 5));
    EXPECT_EQ(std::string(std::strerror(EACCES)).substr(0, 4), text);
    errno = 99999;
    EXPECT_EQ(99999, ErrMgr::GetOsLastErrorString(text, sizeof text));
    EXPECT_STREQ("Unknown WIN32 error", text);
    EXPECT_EQ(99999, ErrMgr::GetOsLastErrorString(text, 8));
    EXPECT_STREQ("Unknown", text);
    EXPECT_EQ(99999, ErrMgr::GetOsLastErrorString(text, 0));
    EXPECT_STREQ("Unknown", text);
    EXPECT_EQ(99999, errno);
}

}  // namespace
