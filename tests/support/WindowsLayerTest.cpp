// What the layer over the operating system does on Windows.

#include <gtest/gtest.h>
#include <windows.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "TempDir.h"
#include "TestPlatform.h"
#include "common/Thread.h"
#include "support/DllUtils.h"
#include "support/ErrMgr.h"
#include "support/ErrnoKeeper.h"
#include "support/Util.h"
#include "support/dl.h"
#include "support/os.h"
#include "support/pdir.h"
#include "support/pthread.h"
#include "support/windows_names.h"

namespace {

namespace fs = std::filesystem;

// A musical symbol takes two UTF-16 units.
const std::string kName = "t\xc3\xb6n \xf0\x9d\x84\x9e";
const char kIllFormed[] = "\xc3(";

void write_file(const std::string& path) {
    std::ofstream(fs::u8path(path)) << "x";
}

std::string library() {
    return std::string(ZOLT_TEST_LIBRARIES) + "/complete.dll";
}

// ---- Libraries ----

TEST(Dl, TellsWhatWasWrong) {
    const auto expect_error = [](const char* text) {
        for (int time = 0; time < 2; time++) {  // asking does not clear it
            EXPECT_STREQ(text, dlerror());
        }
    };
    EXPECT_EQ(nullptr, dlopen("no_such_library.dll", RTLD_LAZY));
    expect_error("Error in dlopen: LoadLibrary() failed with windows error code 126");
    EXPECT_EQ(nullptr, dlopen(kIllFormed, RTLD_LAZY));
    expect_error("Error in dlopen: LoadLibrary() failed with windows error code 1113");
    EXPECT_EQ(nullptr, dlopen(nullptr, RTLD_LAZY));
    expect_error("Error in dlopen: LoadLibrary() failed with windows error code 87");
    EXPECT_EQ(nullptr, dlsym(nullptr, "first_function"));
    expect_error("Error in dlsym: NULL handle");
    EXPECT_EQ(-1, dlclose(nullptr));
    expect_error("Error in dlclose: NULL handle");

    void* handle = dlopen(library().c_str(), RTLD_LAZY);
    ASSERT_NE(nullptr, handle);
    expect_error(nullptr);
    EXPECT_EQ(nullptr, dlsym(handle, "no_such_function"));
    expect_error("Error in dlsym: GetProcAddress() failed with windows error code 127");
    EXPECT_NE(nullptr, dlsym(handle, "first_function"));
    expect_error(nullptr);
    EXPECT_EQ(0, dlclose(handle));
    expect_error(nullptr);
    EXPECT_EQ(-1, dlclose(handle));
    expect_error("Error in dlclose: FreeLibrary() failed with windows error code 126");
}

// ---- Directories ----

class Pdir : public testing::Test {
protected:
    using Entries = std::map<std::string, int>;

    // The entries from here to the end, and their types.
    static Entries read(DIR* listing) {
        Entries entries;
        while (const dirent* entry = readdir(listing)) {
            EXPECT_TRUE(entries.emplace(entry->d_name, entry->d_type).second) << entry->d_name;
        }
        return entries;
    }

    const TempDir dir;
};

TEST_F(Pdir, ListsNamesInUtf8) {
    const std::string own = dir.path(kName);
    fs::create_directory(fs::u8path(own));
    write_file(own + "/file");
    write_file(own + "/" + kName + ".dll");
    fs::create_directory(fs::u8path(own + "/folder"));
    const Entries expected = {{".", 4}, {"..", 4}, {"file", 8}, {kName + ".dll", 8}, {"folder", 4}};
    for (const char* end : {"", "/", "\\"}) {
        DIR* listing = opendir((own + end).c_str());
        ASSERT_NE(nullptr, listing) << end;
        EXPECT_EQ(expected, read(listing)) << end;
        EXPECT_EQ(nullptr, readdir(listing));
        rewinddir(listing);
        EXPECT_NE(nullptr, readdir(listing));
        EXPECT_NE(nullptr, readdir(listing));
        rewinddir(listing);
        EXPECT_EQ(expected, read(listing)) << end;
        EXPECT_EQ(0, closedir(listing));
    }
}

TEST_F(Pdir, SetsErrno) {
    write_file(dir.path("file"));
    const std::pair<std::string, int> rows[] = {{dir.path("missing"), ENOENT},
                                                {dir.path("missing/folder"), ENOENT},
                                                {dir.path(kIllFormed), ENOENT},
                                                {dir.path("a?b"), ENOENT}};
    for (const auto& [path, error] : rows) {
        errno = 77;
        EXPECT_EQ(nullptr, opendir(path.c_str())) << path;
        EXPECT_EQ(error, errno) << path;
    }
    // Not every version of Wine tells a file from a missing directory.
    WIN32_FIND_DATAW found;
    const HANDLE search = FindFirstFileW(fs::u8path(dir.path("file/*")).c_str(), &found);
    const int error_of_file = zolt::errno_of_listing(GetLastError());
    EXPECT_EQ(INVALID_HANDLE_VALUE, search);
    EXPECT_EQ(nullptr, opendir(dir.path("file").c_str()));
    EXPECT_EQ(error_of_file, errno);
    EXPECT_EQ(ENOTDIR, zolt::errno_of_listing(267));
    EXPECT_EQ(EACCES, zolt::errno_of_listing(5));

    const auto expect_errno = [](int error) {
        EXPECT_EQ(error, errno);
        errno = 77;
    };
    EXPECT_EQ(nullptr, opendir(nullptr));
    expect_errno(ENOENT);
    EXPECT_EQ(nullptr, readdir(nullptr));
    expect_errno(EBADF);
    EXPECT_EQ(-1, closedir(nullptr));
    expect_errno(EBADF);
    rewinddir(nullptr);
    expect_errno(EBADF);
}

// ---- Mutexes and threads ----

TEST(Mutex, IsRecursiveAndExcludesOtherThreads) {
    pthread_mutex_t mutex;
    EXPECT_EQ(0, pthread_mutex_init(&mutex, nullptr));
    int status = -1;
    const auto try_elsewhere = [&] {
        Thread([&] {
            status = pthread_mutex_trylock(&mutex);
            if (status == 0) {
                pthread_mutex_unlock(&mutex);
            }
        }).join();
        return status;
    };
    EXPECT_EQ(0, pthread_mutex_lock(&mutex));
    EXPECT_EQ(0, pthread_mutex_lock(&mutex));
    EXPECT_EQ(0, pthread_mutex_trylock(&mutex));
    EXPECT_EQ(1, try_elsewhere());
    EXPECT_EQ(0, pthread_mutex_unlock(&mutex));
    EXPECT_EQ(0, pthread_mutex_unlock(&mutex));
    EXPECT_EQ(1, try_elsewhere());
    EXPECT_EQ(0, pthread_mutex_unlock(&mutex));
    EXPECT_EQ(0, try_elsewhere());
    EXPECT_EQ(0, pthread_mutex_destroy(&mutex));
}

struct Seen {
    std::atomic<unsigned long> id{0};
    std::atomic<int> join_own_status{0};
    std::atomic<pthread_t> own{nullptr};
    std::atomic<int> priority{0};
};

// Waits for the creator to tell it which thread it is.
void* look_around(void* argument) {
    Seen& seen = *static_cast<Seen*>(argument);
    while (seen.own.load() == nullptr) {
        Sleep(1);
    }
    seen.id = pthread_self();
    seen.join_own_status = pthread_join(seen.own, nullptr);
    seen.priority = GetThreadPriority(GetCurrentThread());
    return &seen;
}

TEST(Threads, AreCreatedRaisedAndJoined) {
    Seen seen;
    pthread_t thread = nullptr;
    ASSERT_EQ(0, pthread_create(&thread, nullptr, look_around, &seen));
    const unsigned long id = thread->id;
    EXPECT_EQ(look_around, thread->start);
    EXPECT_EQ(&seen, thread->argument);
    EXPECT_NE(0, pthread_setTimeCritical(thread->handle));
    HANDLE handle = nullptr;
    ASSERT_TRUE(DuplicateHandle(GetCurrentProcess(), thread->handle, GetCurrentProcess(), &handle,
                                0, FALSE, DUPLICATE_SAME_ACCESS));
    seen.own = thread;
    EXPECT_EQ(0, pthread_join(thread, nullptr));
    EXPECT_EQ(id, seen.id);
    EXPECT_NE(id, pthread_self());
    EXPECT_EQ(36, seen.join_own_status);
    EXPECT_EQ(15, seen.priority);
    DWORD status = 77;
    EXPECT_TRUE(GetExitCodeThread(handle, &status));
    EXPECT_EQ(0u, status);
    CloseHandle(handle);
    EXPECT_EQ(0, pthread_setTimeCritical(nullptr));
}

TEST(Threads, RunOnWhenTheyAreDetached) {
    constexpr int kThreads = 200;
    static std::atomic<int> ended{0};
    static int one = 1;
    for (int i = 0; i < kThreads; i++) {
        pthread_t thread = nullptr;
        ASSERT_EQ(0, pthread_create(
                         &thread, nullptr,
                         [](void* argument) -> void* {
                             ended += *static_cast<const int*>(argument);
                             return nullptr;
                         },
                         &one));
        EXPECT_EQ(0, pthread_detach(thread));
    }
    for (int wait = 0; wait < 1000 && ended != kThreads; wait++) {
        Sleep(10);
    }
    EXPECT_EQ(kThreads, ended);
}

// ---- What the C++ library promises in the win32 thread model ----

struct SlowToConstruct {
    SlowToConstruct() {
        constructed++;
        Sleep(200);
        value = 1;
    }
    static std::atomic<int> constructed;
    int value = 0;
};

std::atomic<int> SlowToConstruct::constructed{0};

int first_use() {
    static const SlowToConstruct object;
    return object.value;
}

// The library relies on it for its own first uses.
TEST(Win32ThreadModel, FunctionLocalObjectsAreConstructedOnce) {
    std::atomic<int> values{0};
    std::vector<Thread> threads;
    for (int i = 0; i < 4; i++) {
        threads.emplace_back([&] { values += first_use(); });
    }
    for (Thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(1, SlowToConstruct::constructed);
    EXPECT_EQ(4, values);
}

TEST(Win32ThreadModel, ExceptionsAndThreadLocalObjectsArePerThread) {
    static thread_local int depth = 0;
    std::atomic<int> right{0};
    std::vector<Thread> threads;
    for (int t = 0; t < 4; t++) {
        threads.emplace_back([&right, t] {
            for (int i = 0; i < 2000; i++) {
                try {
                    depth++;
                    throw t;
                } catch (int thrown) {
                    right += thrown == t && depth == i + 1;
                }
            }
        });
    }
    for (Thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(8000, right);
    EXPECT_EQ(0, depth);
}

// ---- The support library over the layer ----

class Layer : public testing::Test {
protected:
    const TempDir dir;
};

TEST_F(Layer, FindsLibrariesInADirectoryWithAnyEndAndName) {
    const std::string own = dir.path(kName);
    fs::create_directory(fs::u8path(own));
    fs::copy_file(library(), fs::u8path(own + "\\" + kName + ".DLL"));
    const char* const functions[] = {"first_function"};
    for (const char* end : {"", "/", "\\"}) {
        const std::string given = own + end;
        DllUtils::SetDllDir(given.c_str());
        char found[300];
        EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(found, kName.c_str()));
        EXPECT_EQ(given + "\\" + kName + ".dll", found);
        char* name = nullptr;
        void* handle = nullptr;
        void* function = nullptr;
        ASSERT_EQ(0, DllUtils::LoadFirstDll(1, functions, &name, &handle, &function)) << end;
        EXPECT_EQ(kName, name);
        EXPECT_EQ(1, reinterpret_cast<int (*)()>(function)());
        DllUtils::UnloadDll(&name, &handle);
        EXPECT_FALSE(library_is_loaded(own + "\\" + kName + ".dll"));
    }
}

TEST_F(Layer, ShowsTheLibraryDirectoryToOtherComponents) {
    const std::string own = dir.path(kName);
    DllUtils::SetDllDir(own.c_str());
    EXPECT_EQ(own, zolt::os_environment("STREAMING_ENGINE_LIB"));
    wchar_t value[400];
    ASSERT_LT(GetEnvironmentVariableW(L"STREAMING_ENGINE_LIB", value, 400), 400u);
    EXPECT_EQ(fs::u8path(own), value);
    ASSERT_NE(nullptr, _wgetenv(L"STREAMING_ENGINE_LIB"));
    EXPECT_EQ(fs::u8path(own), _wgetenv(L"STREAMING_ENGINE_LIB"));
    EXPECT_EQ("", zolt::os_environment("NO_SUCH_VARIABLE"));
}

TEST_F(Layer, NamesThatAreNotUtf8AreErrors) {
    const std::string path = dir.path(kIllFormed);
    const unsigned char byte = 1;
    EXPECT_EQ(1, Util::WriteByteArrayToFile(path.c_str(), &byte, 1));
    EXPECT_EQ(nullptr, Util::ReadFileIntoNewString(path.c_str()));
    EXPECT_EQ(-1, Util::GetFileSize(path.c_str()));
    EXPECT_FALSE(Util::IsDir(path.c_str()));
    errno = 77;
    EXPECT_EQ(nullptr, Util::Win32FileOpen(path.c_str(), "rb"));
    EXPECT_EQ(EILSEQ, errno);
    DllUtils::SetDllDir(path.c_str());
    char found[300];
    EXPECT_EQ(1, DllUtils::ConstructDllFullPathName(found, "codec"));
    EXPECT_TRUE(fs::is_empty(fs::u8path(dir.path())));
}

TEST_F(Layer, KeepsBothErrors) {
    SetLastError(4711);
    errno = 77;
    Util::GetFileSize(dir.path("missing").c_str());
    ErrMgr::AddErr("Class", "Method", nullptr, "no host");
    const DWORD last = GetLastError();
    EXPECT_EQ(4711u, last);
    EXPECT_EQ(77, errno);
}

TEST(GetOsLastErrorString, GivesCodeAndText) {
    char text[200];
    SetLastError(ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(2, ErrMgr::GetOsLastErrorString(text, sizeof text));
    const std::string whole = text;
    EXPECT_GT(whole.size(), 5u);
    EXPECT_EQ(std::string::npos, whole.find_first_of("\r\n")) << whole;
    SetLastError(ERROR_FILE_NOT_FOUND);
    ErrMgr::GetOsLastErrorString(text, 5);
    EXPECT_EQ(whole.substr(0, 4), text);
    SetLastError(0x2fffffff);
    EXPECT_EQ(0x2fffffff, ErrMgr::GetOsLastErrorString(text, sizeof text));
    EXPECT_STREQ("Unknown WIN32 error", text);
    SetLastError(0x2fffffff);
    ErrMgr::GetOsLastErrorString(text, 0);
    EXPECT_STREQ("Unknown WIN32 error", text);
}

}  // namespace
