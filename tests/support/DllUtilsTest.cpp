#include "support/DllUtils.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "TempDir.h"
#include "in_own_process.h"
#include "support/dl.h"

namespace {

namespace fs = std::filesystem;

const char* const kNames[] = {"first_function", "second_function"};

class DllUtilsTest : public testing::Test {
protected:
    std::string add_library(const std::string& library, const std::string& name) const {
        fs::copy_file(fs::path(ZOLT_TEST_LIBRARIES) / library, dir.path(name));
        return dir.path(name);
    }

    bool is_loaded(const std::string& path) const {
        void* handle = dlopen(path.c_str(), RTLD_LAZY | RTLD_NOLOAD);
        if (handle != nullptr) {
            dlclose(handle);
        }
        return handle != nullptr;
    }

    const TempDir dir;
};

TEST_F(DllUtilsTest, DirectoryComesFromTheEnvironmentOrTheHost) {
    const std::string long_name(400, 'x');
    struct {
        const char* variable;  // null: not set
        std::string expected;
    } const rows[] = {{nullptr, "."},
                      {"", "."},
                      {"/first", "/first"},
                      {long_name.c_str(), std::string(287, 'x')}};
    for (const auto& row : rows) {
        in_own_process([&row] {
            DllUtils::SetDllDir("");  // forgets what other tests have set
            unsetenv(DllUtils::EnvVarStreamingEngineLib);
            if (row.variable != nullptr) {
                setenv("STREAMING_ENGINE_LIB", row.variable, 1);
            }
            EXPECT_EQ(row.expected, DllUtils::GetDllDir());
            setenv("STREAMING_ENGINE_LIB", "/late", 1);
            EXPECT_EQ(row.expected, DllUtils::GetDllDir());  // found out once

            testing::internal::CaptureStdout();
            DllUtils::SetDllDir("/second");
            DllUtils::SetDllDir(nullptr);
            EXPECT_EQ("LOAD_DLLS> Setting shared library (dll) directory to: /second\n",
                      testing::internal::GetCapturedStdout());
            EXPECT_STREQ("/second", DllUtils::GetDllDir());
            EXPECT_STREQ("/second", std::getenv("STREAMING_ENGINE_LIB"));
        });
    }
}

TEST_F(DllUtilsTest, FullPathNameTriesPrefixesInOrder) {
    DllUtils::SetDllDir(dir.path().c_str());
    char out[300] = "untouched";
    EXPECT_EQ(1, DllUtils::ConstructDllFullPathName(out, "codec"));
    EXPECT_STREQ("", out);
    fs::create_directory(dir.path("codec.so"));  // not a library
    for (const char* file : {"libdll_codec.so", "libcodec.so"}) {
        std::ofstream(dir.path(file)) << "x";
        EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec"));
        EXPECT_EQ(dir.path(file), out);
    }
    fs::remove(dir.path("codec.so"));
    std::ofstream(dir.path("codec.so")) << "x";
    std::ofstream(dir.path("libcodec.dll")) << "x";
    EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec"));
    EXPECT_EQ(dir.path("codec.so"), out);
    EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec.dll"));
    EXPECT_EQ(dir.path("libcodec.dll"), out);
}

TEST_F(DllUtilsTest, LoadsALibraryOnlyWithAllItsFunctions) {
    const std::string complete = add_library("complete.so", "complete.so");
    const std::string partial = add_library("partial.so", "partial.so");
    void* functions[2];

    testing::internal::CaptureStdout();
    void* handle = DllUtils::LoadDll(complete.c_str(), 2, kNames, functions);
    EXPECT_EQ("LOAD_DLLS> Loading shared library (dll) " + complete +
                  "\nLOAD_DLLS>   Getting function pointer of: first_function\n"
                  "LOAD_DLLS>   Getting function pointer of: second_function\n"
                  "LOAD_DLLS> Successfully loaded shared library (dll) " +
                  complete + "\n",
              testing::internal::GetCapturedStdout());
    ASSERT_NE(nullptr, handle);
    EXPECT_EQ(2, reinterpret_cast<int (*)()>(functions[1])());
    DllUtils::UnloadDll(nullptr, &handle);
    EXPECT_EQ(nullptr, handle);
    EXPECT_FALSE(is_loaded(complete));

    testing::internal::CaptureStdout();
    EXPECT_EQ(nullptr, DllUtils::LoadDll(partial.c_str(), 2, kNames, functions));
    const std::string lines = testing::internal::GetCapturedStdout();
    EXPECT_NE(std::string::npos, lines.find("LOAD_DLLS>   Error in dlsym: ")) << lines;
    EXPECT_NE(std::string::npos, lines.find("second_function")) << lines;
    EXPECT_EQ(nullptr, functions[0]);
    EXPECT_FALSE(is_loaded(partial));

    functions[0] = functions[1] = this;
    testing::internal::CaptureStdout();
    EXPECT_EQ(nullptr, DllUtils::LoadDll(dir.path("none.so").c_str(), 2, kNames, functions));
    EXPECT_NE(std::string::npos,
              testing::internal::GetCapturedStdout().find("\nLOAD_DLLS> Error in dlopen: "));
    EXPECT_EQ(nullptr, functions[0]);
    EXPECT_EQ(nullptr, functions[1]);
}

TEST_F(DllUtilsTest, LoadsAllFittingLibrariesOfADirectory) {
    add_library("partial.so", "a.SO");
    add_library("complete.so", "b.so");
    add_library("complete.so", ".so");     // too short a name
    add_library("complete.so", "c.so.1");  // not the extension
    std::ofstream(dir.path("text.so")) << "not a library";
    fs::create_directory(dir.path("d.so"));
    fs::create_directory_symlink(dir.path("d.so"), dir.path("e.so"));
    ASSERT_EQ(0, mkfifo(dir.path("f.so").c_str(), 0600));  // opening it would wait for a writer
    char found[288];
    DllUtils::SetDllDir(dir.path().c_str());

    EXPECT_EQ(1, DllUtils::ConstructDllFullPathName(found, "f"));

    char* names[4] = {};
    void* handles[4] = {};
    void* functions[8] = {};
    errno = 77;
    int count = DllUtils::LoadAllDlls(2, kNames, 4, names, handles, functions);
    EXPECT_EQ(77, errno);
    ASSERT_EQ(1, count);
    EXPECT_STREQ("b", names[0]);
    EXPECT_EQ(1, reinterpret_cast<int (*)()>(functions[0])());
    DllUtils::UnloadAllDlls(&count, names, handles);
    EXPECT_EQ(0, count);
    EXPECT_EQ(nullptr, names[0]);
    EXPECT_EQ(nullptr, handles[0]);
    EXPECT_FALSE(is_loaded(dir.path("b.so")));

    // One function: both libraries have it, each in its own slot.
    count = DllUtils::LoadAllDlls(dir.path().c_str(), 1, kNames, 4, nullptr, handles, functions);
    ASSERT_EQ(2, count);
    EXPECT_EQ(0, reinterpret_cast<int (*)()>(functions[0])() +
                     reinterpret_cast<int (*)()>(functions[1])());
    DllUtils::UnloadAllDlls(&count, nullptr, handles);
    EXPECT_EQ(0, DllUtils::LoadAllDlls(1, kNames, 0, nullptr, handles, functions));

    char* name = nullptr;
    void* handle = nullptr;
    ASSERT_EQ(0, DllUtils::LoadFirstDll(2, kNames, &name, &handle, functions));
    EXPECT_STREQ("b", name);
    DllUtils::UnloadDll(&name, &handle);
    EXPECT_EQ(nullptr, name);
    DllUtils::UnloadDll(&name, &handle);

    const char* const unknown[] = {"no_such_function"};
    EXPECT_EQ(1, DllUtils::LoadFirstDll(1, unknown, &name, &handle, functions));
}

}  // namespace
