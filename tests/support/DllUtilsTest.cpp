#include "support/DllUtils.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "TempDir.h"
#include "TestPlatform.h"
#include "in_own_process.h"
#include "support/dl.h"

namespace {

namespace fs = std::filesystem;

// A library's file name.
std::string file(const std::string& name) {
    return name + zolt::kDllExtension;
}

const char* const kNames[] = {"first_function", "second_function"};

class DllUtilsTest : public testing::Test {
protected:
    std::string add_library(const std::string& library, const std::string& name) const {
        fs::copy_file(fs::path(ZOLT_TEST_LIBRARIES) / library, fs::u8path(dir.path(name)));
        return dir.path(name);
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
            set_environment(DllUtils::EnvVarStreamingEngineLib, nullptr);
            if (row.variable != nullptr) {
                set_environment("STREAMING_ENGINE_LIB", row.variable);
            }
            EXPECT_EQ(row.expected, DllUtils::GetDllDir());
            set_environment("STREAMING_ENGINE_LIB", "/late");
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
    const std::string own = dir.path(file("codec"));
    fs::create_directory(fs::u8path(own));  // not a library
    for (const char* name : {"libdll_codec", "libcodec"}) {
        const std::string path = dir.path(file(name));
        std::ofstream(fs::u8path(path)) << "x";
        EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec"));
        EXPECT_EQ(path, out);
    }
    fs::remove(fs::u8path(own));
    std::ofstream(fs::u8path(own)) << "x";
    std::ofstream(fs::u8path(dir.path("libcodec.other"))) << "x";
    EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec"));
    EXPECT_EQ(own, out);
    EXPECT_EQ(0, DllUtils::ConstructDllFullPathName(out, "codec.other"));
    EXPECT_EQ(dir.path("libcodec.other"), out);
}

TEST_F(DllUtilsTest, LoadsALibraryOnlyWithAllItsFunctions) {
    const std::string complete = add_library(file("complete"), file("complete"));
    const std::string partial = add_library(file("partial"), file("partial"));
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
    EXPECT_FALSE(library_is_loaded(complete));

    testing::internal::CaptureStdout();
    EXPECT_EQ(nullptr, DllUtils::LoadDll(partial.c_str(), 2, kNames, functions));
    const std::string lines = testing::internal::GetCapturedStdout();
    EXPECT_NE(std::string::npos, lines.find("LOAD_DLLS>   Error in dlsym: ")) << lines;
    EXPECT_NE(std::string::npos, lines.find("second_function")) << lines;
    EXPECT_EQ(nullptr, functions[0]);
    EXPECT_FALSE(library_is_loaded(partial));

    functions[0] = functions[1] = this;
    testing::internal::CaptureStdout();
    EXPECT_EQ(nullptr, DllUtils::LoadDll(dir.path(file("none")).c_str(), 2, kNames, functions));
    EXPECT_NE(std::string::npos,
              testing::internal::GetCapturedStdout().find("\nLOAD_DLLS> Error in dlopen: "));
    EXPECT_EQ(nullptr, functions[0]);
    EXPECT_EQ(nullptr, functions[1]);
}

TEST_F(DllUtilsTest, LoadsAllFittingLibrariesOfADirectory) {
    std::string capitals = file("");
    std::transform(capitals.begin(), capitals.end(), capitals.begin(), ::toupper);
    add_library(file("partial"), "a" + capitals);
    add_library(file("complete"), file("b"));
    add_library(file("complete"), file("c") + ".1");  // not the extension
    std::ofstream(fs::u8path(dir.path(file("text")))) << "not a library";
    fs::create_directory(fs::u8path(dir.path(file("d"))));
    DllUtils::SetDllDir(dir.path().c_str());

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
    EXPECT_FALSE(library_is_loaded(dir.path(file("b"))));

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
