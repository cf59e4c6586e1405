#pragma once

#include <cstdio>

// General helpers of the host framework: numbers, strings, paths, files, pseudo-random values, a
// command loop. Every buffer that an operation returns is allocated as an array (new[]) and belongs
// to the caller, who releases it as an array. Case is ignored for the letters A to Z only; nothing
// here depends on the locale. errno is left as it was by every operation that does not say
// otherwise. Arguments are required unless their description says that null is accepted.
class Util {
public:
    // ---- Numbers ----

    // The element of the `n` elements of `a` that is nearest to `v`, the first of equally near
    // ones; 0 when `n` is below 1.
    static int GetClosest(int v, const int* a, int n);
    static double GetClosest(double v, const double* a, int n);

    // The smallest power of two not below `n`; 1 for n <= 1, 2^30 for n above 2^30.
    static int NextPowerOf2(int n);

    // The smallest power of two p with n < 1.5 p, so that a tie goes up; 1 for n below 2, at most
    // 2^30.
    static int ClosestPowerOf2(int n);

    // floor(log2 n); -1 for n below 1.
    static int IntLog2(int n);

    // v / m * m in integer division: the multiple of `m` (not 0) next to `v` on the side of 0.
    static int RoundDown(int v, int m);

    // The standard deviation of `n` values in integers: truncated mean and mean square, truncated
    // root of mean square - mean^2. 0 for n below 1.
    static int StandardDevShort(const short* a, int n);

    // Writes the four characters of a four-character code, most significant byte first, and a
    // terminating 0 (5 bytes in all) into `out`; returns `out`. Only the low 32 bits of `code`
    // count.
    static char* FourccToString(long code, char* out);

    // Whether a media-type code is one of the audio, resp. video types.
    static bool IsAudio(int code);
    static bool IsVideo(int code);

    // ---- Random numbers ----

    static constexpr long RandomMaxVal = 0x7fffffff;

    // The value after `seed` in the minimal standard sequence: seed * 16807 mod 2^31 - 1, in
    // 1 .. 2^31 - 2. A seed of 0 stands for the time of day in milliseconds; any other seed is
    // first reduced into 1 .. 2^31 - 2.
    static long Random(long seed);

    // Maps a random value r >= 0 into lo .. hi; `lo` when hi is below lo.
    static long ScaleRandomValueToRange(long r, long lo, long hi);
    static double ScaleRandomValueToRange(long r, double lo, double hi);

    // Advances *seed as Random() does and returns the new value mapped into lo .. hi.
    static long GetNextScaledRandomValue(long* seed, long lo, long hi);
    static double GetNextScaledRandomValue(long* seed, double lo, double hi);

    // ---- Strings ----

    // The first position of `sub` in `s` ignoring case, or null.
    static char* StrCaseStr(char* s, const char* sub);

    // The index of the first of `n` entries that equals `s` ignoring case, or -1. Null entries are
    // skipped; null `s` gives -1.
    static int FindStringInList(const char* s, const char* const* list, int n);
    static bool StringIsInList(const char* s, const char* const* list, int n);

    static void StringToLowerCase(char* s);

    // The value of an optional '+' or '-' followed by decimal digits only. Sets errno: 0 on
    // success; EINVAL (result -1) for null, no digits or another character; ERANGE (result -1)
    // beyond the 32-bit signed range.
    static int StringToInt(const char* s);

    // The value of decimal digits only; -1 for null, an empty string, another character or a value
    // above 0x7fffffff.
    static int StringToUnsInt(const char* s);

    // Replaces every `from` by `to`; returns the length of `s`.
    static int ReplaceChar(char* s, char from, char to);

    // A new copy; null for null.
    static char* CopyString(const char* s);

    // A new string of the characters from `begin` up to `end`.
    static char* ExtractString(const char* begin, const char* end);

    // The position after the next CR or LF (one character), or the terminating 0.
    static char* FindNextNewLine(char* s);

    // The next white-space, resp. other character, or the terminating 0.
    static char* FindNextSpace(char* s);
    static char* FindNextNonSpace(char* s);

    // Cuts white space off the end, in place.
    static void RemoveTrailingSpace(char* s);

    // Copies what stands before the first `sep` (or all of `s`), at most outLen - 1 characters of
    // it, into `out` with a terminating 0. Returns the position after `sep`, null without one.
    static char* ExtractToNextSep(char* s, char sep, char* out, int outLen);

    // A list of `n` new buffers of len + 1 characters, each an empty string; its release (null is
    // fine).
    static char** CreateWordsList(int n, int len);
    static void DeleteWordsList(char** list, int n);

    // Splits `s` at white space into at most `maxWords` words, each cut to `maxLen` characters;
    // words[i] has room for maxLen + 1. A word that starts with ' or " runs to the next same
    // quote, quotes excluded; an unclosed quote ends the parsing, and its word does not count.
    // Returns the number of words.
    static int ParseString(const char* s, char** words, int maxWords, int maxLen);

    // Reads pairs of characters as hexadecimal bytes into a new array *out of (strlen + 1) / 2
    // bytes; returns their count. A pair that is no number gives 0.
    static int HexStringToBytes(unsigned char** out, const char* hex);

    // A new string of two upper-case hexadecimal digits per byte.
    static char* BytesToHexString(const unsigned char* b, int n);

    // A new string of lines of `perLine` bytes (below 1: a single line), separated by line breaks;
    // each line starts with `prefix` (may be null) and has a space and two digits per byte.
    static char* BytesToHexString(const unsigned char* b, int n, const char* prefix, int perLine);

    // Writes a space and two digits per byte into `out`: all `n` bytes when head + tail >= n, else
    // the first `head`, " ..." and the last `tail` bytes. `out` has room for
    // 3 * min(n, head + tail) + 5 characters.
    static void BytesToHexString(char* out, const unsigned char* b, int n, int head, int tail);

    // ---- Paths and files: separators are '/' and '\\', file names are UTF-8 ----

    // Whether a name starts with a letter and ':', or with a separator.
    static bool IsAbsoluteFileName(const char* name);

    // Copies a relative path into `out` (`outLen` bytes): no separator at the start, every run of
    // separators one '\\'. Returns 0, or 1 with `out` empty when `in` is null, when the result does
    // not fit, or when `in` holds one of " * : < > ? | or a character outside printable ASCII.
    static int FormatRelPathName(const char* in, char* out, int outLen);

    // The same for an absolute path: a drive letter with ':' is kept, and a separator has to come
    // next.
    static int FormatAbsPathName(const char* in, char* out, int outLen);

    // The position after the last separator, or the whole string.
    static char* FindFileName(char* path);
    static const char* FindFileName(const char* path);

    // The position after the last '.', or null when there is none or a separator follows it.
    static const char* FindExtension(const char* path);

    // The version number of a file name: its last extension, when that consists of digits only and
    // is at most 0x7fffffff ("clip.mp4.12" has 12); else -1. `base` receives the name without the
    // number and its dot, `ext` the extension of `base` ("" without one); without a number, the
    // whole name and its extension. Both need room for the whole name.
    static int GetFileVersionNumber(const char* name);
    static int GetFileVersionNumber(const char* name, char* base, char* ext);
    static int GetFileNameWithoutVersionNumber(const char* name, char* out);

    // Opens a file as std::fopen does; errno is what the system's open leaves.
    static std::FILE* Win32FileOpen(const char* path, const char* mode);

    // The whole file in a new buffer with a terminating 0; null when it cannot be read.
    static char* ReadFileIntoNewString(const char* path);

    // The whole file in a new array *buf of *size bytes: 0; or 1 with *buf null and *size 0.
    static int ReadFileIntoNewByteArray(const char* path, unsigned char** buf, long* size);

    // Writes a file of `n` bytes, replacing an older one: 0 when all were written, else 1.
    static int WriteByteArrayToFile(const char* path, const unsigned char* buf, long n);

    // The size of a file in bytes, or -1.
    static long long GetFileSize(const char* path);

    static bool IsDir(const char* path);

    // ---- Other ----

    // A new copy of `n` elements; null for null. A count below 0 counts as 0.
    static int* CopyArrayInt(const int* a, int n);
    static double* CopyArrayDouble(const double* a, int n);
    static unsigned char* CopyArrayByte(const unsigned char* a, int n);

    // Sleeps `ms` milliseconds and returns 0. *stop (null is accepted) is looked at every 50 ms,
    // though not in the last 50 to 99: returns 1 as soon as it is found set. It is read as a plain
    // flag: a caller that sets it from another thread sees to it that this is safe on its platform.
    static int SleepMsecs(long long ms, const bool* stop);

    // The handler of CmdLineInterpreter: command word, the words after it, their number. The words
    // are valid during the call.
    using CmdHandler = void (*)(char* command, char** args, int numArgs);

    // Reads command lines (300 characters at most; what is longer is read as the next line) from
    // standard input until "quit", "exit" or the end of the input. Prints `prompt` (may be null)
    // before each, and hands lines whose first word is one of the `n` commands (ignoring case) to
    // `handler`.
    static void CmdLineInterpreter(const char* prompt, int n, const char* const* commands,
                                   CmdHandler handler);
};
