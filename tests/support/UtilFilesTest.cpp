#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>

#include "TempDir.h"
#include "support/Util.h"

namespace {

TEST(UtilPaths, AreFormattedWithOneKindOfSeparator) {
    struct {
        const char* in;
        const char* relative;  // null: refused
        const char* absolute;
        bool is_absolute;
    } const rows[] = {
        {"a/b\\c", "a\\b\\c", nullptr, false},
        {"/a//b\\/c", "a\\b\\c", "\\a\\b\\c", true},
        {"//a", "a", "\\a", true},
        {"a/", "a\\", nullptr, false},
        {"c:/a", nullptr, "c:\\a", true},
        {"Z:\\\\a b", nullptr, "Z:\\a b", true},
        {"c:a", nullptr, nullptr, true},
        {"1:/a", nullptr, nullptr, false},
        {"c:", nullptr, nullptr, true},
        {"/", "", "\\", true},
        {"", "", nullptr, false},
        {"/a\tb", nullptr, nullptr, true},
        {"/a\xc3\xa4", nullptr, nullptr, true},
        {"/a*", nullptr, nullptr, true},
        {"/a\"", nullptr, nullptr, true},
        {"/a<", nullptr, nullptr, true},
        {"/a>", nullptr, nullptr, true},
        {"/a?", nullptr, nullptr, true},
        {"/a|", nullptr, nullptr, true},
        {"/a:b", nullptr, nullptr, true},
    };
    for (const auto& row : rows) {
        char out[20] = "untouched";
        EXPECT_EQ(row.relative ? 0 : 1, Util::FormatRelPathName(row.in, out, 20)) << row.in;
        EXPECT_STREQ(row.relative ? row.relative : "", out) << row.in;
        EXPECT_EQ(row.absolute ? 0 : 1, Util::FormatAbsPathName(row.in, out, 20)) << row.in;
        EXPECT_STREQ(row.absolute ? row.absolute : "", out) << row.in;
        EXPECT_EQ(row.is_absolute, Util::IsAbsoluteFileName(row.in)) << row.in;
    }
}

TEST(UtilPaths, ThatDoNotFitAreRefused) {
    char out[8] = "1234567";
    EXPECT_EQ(1, Util::FormatRelPathName(nullptr, out, 8));
    EXPECT_STREQ("", out);
    EXPECT_EQ(0, Util::FormatRelPathName("/abc", out, 4));
    EXPECT_STREQ("abc", out);
    EXPECT_EQ(1, Util::FormatRelPathName("abcd", out, 4));
    EXPECT_STREQ("", out);
    EXPECT_EQ(1, Util::FormatAbsPathName("/abc", out, 4));
    out[0] = 'x';
    EXPECT_EQ(1, Util::FormatRelPathName("a", out, 0));
    EXPECT_EQ('x', out[0]);
}

TEST(UtilPaths, FileNamesExtensionsAndVersions) {
    struct {
        const char* name;
        const char* file_name;
        const char* extension;  // null: none
        int version;
        const char* base;
        const char* base_extension;
    } const rows[] = {
        {"clip.mp4.12", "clip.mp4.12", "12", 12, "clip.mp4", "mp4"},
        {"clip.7", "clip.7", "7", 7, "clip", ""},
        {"dir.v2/file", "file", nullptr, -1, "dir.v2/file", ""},
        {"dir.v2\\clip.7", "clip.7", "7", 7, "dir.v2\\clip", ""},
        {"a.b.c", "a.b.c", "c", -1, "a.b.c", "c"},
        {"a.2147483647", "a.2147483647", "2147483647", 2147483647, "a", ""},
        {"a.2147483648", "a.2147483648", "2147483648", -1, "a.2147483648", "2147483648"},
        {"a.mp4.-1", "a.mp4.-1", "-1", -1, "a.mp4.-1", "-1"},
        {"a.", "a.", "", -1, "a.", ""},
        {"dir/", "", nullptr, -1, "dir/", ""},
        {"", "", nullptr, -1, "", ""},
    };
    for (const auto& row : rows) {
        EXPECT_STREQ(row.file_name, Util::FindFileName(row.name)) << row.name;
        EXPECT_STREQ(row.extension, Util::FindExtension(row.name)) << row.name;
        EXPECT_EQ(row.version, Util::GetFileVersionNumber(row.name)) << row.name;
        char base[32];
        char extension[32];
        EXPECT_EQ(row.version, Util::GetFileVersionNumber(row.name, base, extension)) << row.name;
        EXPECT_STREQ(row.base, base) << row.name;
        EXPECT_STREQ(row.base_extension, extension) << row.name;
        EXPECT_EQ(row.version, Util::GetFileNameWithoutVersionNumber(row.name, base)) << row.name;
        EXPECT_STREQ(row.base, base) << row.name;
    }
}

TEST(UtilFiles, AreWrittenAndReadWhole) {
    const TempDir dir;
    const std::string path = dir.path("d\xc3\xa4ten.bin");
    std::string bytes(100000, 'x');
    bytes[5] = '\0';
    bytes += "\r\n";
    const auto* data = reinterpret_cast<const unsigned char*>(bytes.data());
    const long size = static_cast<long>(bytes.size());
    errno = 77;
    ASSERT_EQ(0, Util::WriteByteArrayToFile(path.c_str(), data, size));
    EXPECT_EQ(size, Util::GetFileSize(path.c_str()));

    unsigned char* read = nullptr;
    long read_size = 0;
    ASSERT_EQ(0, Util::ReadFileIntoNewByteArray(path.c_str(), &read, &read_size));
    EXPECT_EQ(bytes, std::string(reinterpret_cast<char*>(read), static_cast<size_t>(read_size)));
    delete[] read;

    const std::unique_ptr<char[]> text(Util::ReadFileIntoNewString(path.c_str()));
    EXPECT_EQ(bytes, std::string(text.get(), bytes.size()));
    EXPECT_EQ('\0', text[bytes.size()]);

    ASSERT_EQ(0, Util::WriteByteArrayToFile(path.c_str(), data, 0));
    EXPECT_EQ(0, Util::GetFileSize(path.c_str()));
    ASSERT_EQ(0, Util::ReadFileIntoNewByteArray(path.c_str(), &read, &read_size));
    EXPECT_NE(nullptr, read);
    EXPECT_EQ(0, read_size);
    delete[] read;
    EXPECT_EQ(77, errno);
}

TEST(UtilFiles, FailuresAreReported) {
    const TempDir dir;
    const std::string missing = dir.path("missing");
    unsigned char byte = 1;
    for (const std::string& path : {missing, dir.path()}) {
        unsigned char* read = &byte;
        long size = 5;
        errno = 77;
        EXPECT_EQ(1, Util::ReadFileIntoNewByteArray(path.c_str(), &read, &size)) << path;
        EXPECT_EQ(nullptr, read) << path;
        EXPECT_EQ(0, size) << path;
        EXPECT_EQ(nullptr, Util::ReadFileIntoNewString(path.c_str())) << path;
        EXPECT_EQ(-1, Util::GetFileSize(path.c_str())) << path;
        EXPECT_EQ(path == dir.path(), Util::IsDir(path.c_str())) << path;
        EXPECT_EQ(77, errno) << path;
    }
    EXPECT_EQ(1, Util::WriteByteArrayToFile(dir.path().c_str(), &byte, 1));
    EXPECT_EQ(1, Util::WriteByteArrayToFile(missing.c_str(), &byte, -1));
    EXPECT_FALSE(std::filesystem::exists(std::filesystem::u8path(missing)));
}

}  // namespace
