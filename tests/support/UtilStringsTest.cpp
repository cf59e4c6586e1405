#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "TempDir.h"
#include "TestPlatform.h"
#include "in_own_process.h"
#include "support/Util.h"

namespace {

std::string take(char* text) {
    const std::unique_ptr<char[]> owner(text);
    return text;
}

TEST(UtilStrings, SearchesIgnoreCase) {
    char text[] = "Content-Type: VIDEO/avc";
    EXPECT_EQ(text + 14, Util::StrCaseStr(text, "video"));
    EXPECT_EQ(text + 20, Util::StrCaseStr(text, "AVC"));
    EXPECT_EQ(nullptr, Util::StrCaseStr(text, "avc1"));
    EXPECT_EQ(text, Util::StrCaseStr(text, ""));
    char repeating[] = "aaab";
    EXPECT_EQ(repeating + 1, Util::StrCaseStr(repeating, "AAB"));

    const char* list[] = {nullptr, "one", "Two", "TWO"};
    EXPECT_EQ(2, Util::FindStringInList("two", list, 4));
    EXPECT_EQ(-1, Util::FindStringInList("tw", list, 4));
    EXPECT_EQ(-1, Util::FindStringInList("twos", list, 4));
    EXPECT_EQ(-1, Util::FindStringInList("two", list, 2));
    EXPECT_EQ(-1, Util::FindStringInList(nullptr, list, 4));
    EXPECT_TRUE(Util::StringIsInList("ONE", list, 4));

    char mixed[] = "[AZ]\xc4";  // neighbours of the letters and other bytes stay
    Util::StringToLowerCase(mixed);
    EXPECT_STREQ("[az]\xc4", mixed);
}

TEST(UtilStrings, NumbersAreReadWhole) {
    struct {
        const char* text;
        int value, error, unsigned_value;
    } const rows[] = {
        {"0", 0, 0, 0},
        {"+7", 7, 0, -1},
        {"-1", -1, 0, -1},
        {"007", 7, 0, 7},
        {"2147483647", 2147483647, 0, 2147483647},
        {"2147483648", -1, ERANGE, -1},
        {"-2147483648", -2147483647 - 1, 0, -1},
        {"-2147483649", -1, ERANGE, -1},
        {"99999999999999999999999", -1, ERANGE, -1},
        {"99999999999999999999999x", -1, EINVAL, -1},
        {"12a", -1, EINVAL, -1},
        {" 1", -1, EINVAL, -1},
        {"+-1", -1, EINVAL, -1},
        {"-", -1, EINVAL, -1},
        {"", -1, EINVAL, -1},
        {nullptr, -1, EINVAL, -1},
    };
    for (const auto& row : rows) {
        errno = 77;
        EXPECT_EQ(row.unsigned_value, Util::StringToUnsInt(row.text)) << row.text;
        EXPECT_EQ(77, errno) << row.text;
        EXPECT_EQ(row.value, Util::StringToInt(row.text)) << row.text;
        EXPECT_EQ(row.error, errno) << row.text;
    }
}

TEST(UtilStrings, PartsOfStrings) {
    char text[] = "a,b,,c";
    EXPECT_EQ(6, Util::ReplaceChar(text, ',', ';'));
    EXPECT_STREQ("a;b;;c", text);
    EXPECT_EQ("a;b;;c", take(Util::CopyString(text)));
    EXPECT_EQ(nullptr, Util::CopyString(nullptr));
    EXPECT_EQ("b;", take(Util::ExtractString(text + 2, text + 4)));
    EXPECT_EQ("", take(Util::ExtractString(text, text)));

    char lines[] = "one\r\ntwo";
    EXPECT_EQ(lines + 4, Util::FindNextNewLine(lines));
    EXPECT_EQ(lines + 5, Util::FindNextNewLine(lines + 4));
    EXPECT_EQ(lines + 8, Util::FindNextNewLine(lines + 5));

    char spaced[] = "ab \t cd \v\n";
    EXPECT_EQ(spaced + 2, Util::FindNextSpace(spaced));
    EXPECT_EQ(spaced + 5, Util::FindNextNonSpace(spaced + 2));
    EXPECT_EQ(spaced + 10, Util::FindNextNonSpace(spaced + 7));
    Util::RemoveTrailingSpace(spaced);
    EXPECT_STREQ("ab \t cd", spaced);
    EXPECT_EQ(spaced + 7, Util::FindNextSpace(spaced + 5));
    char blank[] = " \t";
    Util::RemoveTrailingSpace(blank);
    EXPECT_STREQ("", blank);
}

TEST(UtilStrings, ExtractsUpToTheSeparatorWithinTheBuffer) {
    char text[] = "first:second";
    char out[4] = "xxx";
    EXPECT_EQ(text + 6, Util::ExtractToNextSep(text, ':', out, 4));
    EXPECT_STREQ("fir", out);
    char wide[20];
    EXPECT_EQ(nullptr, Util::ExtractToNextSep(text + 6, ':', wide, 20));
    EXPECT_STREQ("second", wide);
    EXPECT_EQ(nullptr, Util::ExtractToNextSep(text, '\0', wide, 20));
    EXPECT_STREQ("first:second", wide);
    EXPECT_EQ(text + 6, Util::ExtractToNextSep(text, ':', out, 0));
    EXPECT_STREQ("fir", out);
}

TEST(UtilStrings, ParsesWordsAndQuotes) {
    using Words = std::vector<std::string>;
    struct {
        const char* line;
        int max_words, max_length;
        Words expected;
    } const rows[] = {
        {"cmd 'two words' x", 9, 20, {"cmd", "two words", "x"}},
        {"  a\tb\r\n", 9, 20, {"a", "b"}},
        {" \n", 9, 20, {}},
        {"\"it's\" 'say \"hi\"'", 9, 20, {"it's", "say \"hi\""}},
        {"'' x", 9, 20, {"", "x"}},
        {"a'b c'd", 9, 20, {"a'b", "c'd"}},
        {"'a'b", 9, 20, {"a", "b"}},
        {"a 'open b", 9, 20, {"a"}},
        {"a '", 9, 20, {"a"}},
        {"abcdef 'ghi jkl' m", 9, 3, {"abc", "ghi", "m"}},
        {"a b c", 2, 20, {"a", "b"}},
        {"a b c", 0, 20, {}},
    };
    for (const auto& row : rows) {
        char** words = Util::CreateWordsList(row.max_words, row.max_length);
        const int count = Util::ParseString(row.line, words, row.max_words, row.max_length);
        EXPECT_EQ(row.expected, Words(words, words + count)) << row.line;
        Util::DeleteWordsList(words, row.max_words);
    }
}

TEST(UtilStrings, HexadecimalBothWays) {
    unsigned char* bytes = nullptr;
    ASSERT_EQ(4, Util::HexStringToBytes(&bytes, "00fFzz7"));
    EXPECT_EQ(0x00, bytes[0]);
    EXPECT_EQ(0xff, bytes[1]);
    EXPECT_EQ(0x00, bytes[2]);
    EXPECT_EQ(0x07, bytes[3]);
    EXPECT_EQ("00FF0007", take(Util::BytesToHexString(bytes, 4)));
    EXPECT_EQ("", take(Util::BytesToHexString(bytes, 0)));

    EXPECT_EQ("> 00 FF 00\n> 07", take(Util::BytesToHexString(bytes, 4, ">", 3)));
    EXPECT_EQ(" 00 FF\n 00 07", take(Util::BytesToHexString(bytes, 4, nullptr, 2)));
    EXPECT_EQ("> 00 FF 00 07", take(Util::BytesToHexString(bytes, 4, ">", 0)));
    EXPECT_EQ("", take(Util::BytesToHexString(bytes, 0, ">", 2)));

    char out[17];
    Util::BytesToHexString(out, bytes, 4, 1, 2);
    EXPECT_STREQ(" 00 ... 00 07", out);
    Util::BytesToHexString(out, bytes, 4, 2, 2);
    EXPECT_STREQ(" 00 FF 00 07", out);
    Util::BytesToHexString(out, bytes, 4, 2147483647, 2147483647);
    EXPECT_STREQ(" 00 FF 00 07", out);
    Util::BytesToHexString(out, bytes, 4, -1, 0);
    EXPECT_STREQ(" ...", out);
    delete[] bytes;
    ASSERT_EQ(0, Util::HexStringToBytes(&bytes, ""));
    delete[] bytes;
}

// What the command handler was called with: words joined by '|'.
std::vector<std::string> handled;

void handle(char* command, char** args, int num_args) {
    std::string call = command;
    for (int i = 0; i < num_args; i++) {
        call += std::string("|") + args[i];
    }
    handled.push_back(call);
}

TEST(CmdLineInterpreter, RunsCommandsUntilQuit) {
    const TempDir dir;
    std::ofstream(dir.path("input"), std::ios::binary)
        << "\n  \nEcho 'two words' x\nother\necho " << std::string(294, 'a')
        << " echo 2\nQuit now\necho 3\n";
    in_own_process([&dir] {
        ASSERT_NE(nullptr, std::freopen(dir.path("input").c_str(), "r", stdin));
        testing::internal::CaptureStdout();
        const char* commands[] = {"list", "echo"};
        Util::CmdLineInterpreter("> ", 2, commands, handle);
        EXPECT_EQ("> > > > Unknown command: other\n> > > ", testing::internal::GetCapturedStdout());
        // A word is cut to 256 characters; what follows the 300th of a line is the next line.
        const std::vector<std::string> expected = {"Echo|two words|x",
                                                   "echo|" + std::string(256, 'a'), "echo|2"};
        EXPECT_EQ(expected, handled);
    });
}

TEST(CmdLineInterpreter, StopsAtTheEndOfTheInput) {
    in_own_process(
        [] {
            ASSERT_NE(nullptr, std::freopen(kNullDevice, "r", stdin));
            errno = EIO;
            Util::CmdLineInterpreter(nullptr, 0, nullptr, handle);
            EXPECT_EQ(EIO, errno);
            EXPECT_TRUE(handled.empty());
        },
        ("\nError reading command line - exiting: " + std::string(std::strerror(0))).c_str());
}

}  // namespace
