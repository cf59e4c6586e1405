#include "support/Util.h"

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <chrono>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <memory>

#include "support/ErrnoKeeper.h"
#include "support/os.h"

namespace {

constexpr int kLargestPowerOf2 = 1 << 30;

constexpr int fourcc(const char (&text)[5]) {
    return static_cast<int>(
        static_cast<std::uint32_t>(text[0]) << 24 | static_cast<std::uint32_t>(text[1]) << 16 |
        static_cast<std::uint32_t>(text[2]) << 8 | static_cast<std::uint32_t>(text[3]));
}

constexpr int kAudioTypes[] = {fourcc("g711"), fourcc("g726"), fourcc(".mp3"),
                               fourcc("mp4a"), fourcc("wm9a"), fourcc("unca")};
constexpr int kVideoTypes[] = {fourcc("uncv"), fourcc("h263"), fourcc("mpg1"), fourcc("mpg2"),
                               fourcc("mp4v"), fourcc("avc1"), fourcc("jpeg"), fourcc(".png"),
                               fourcc("mash"), fourcc("wm9v")};

// In a type that holds the distance of any two ints.
long long distance(int a, int b) {
    return std::llabs(static_cast<long long>(a) - b);
}
double distance(double a, double b) {
    return std::fabs(a - b);
}

template <class T>
T closest(T v, const T* a, int n) {
    if (n < 1) {
        return 0;
    }
    return *std::min_element(
        a, a + n, [v](T left, T right) { return distance(left, v) < distance(right, v); });
}

template <size_t N>
bool is_one_of(const int (&codes)[N], int code) {
    return std::find(codes, codes + N, code) != codes + N;
}

// A seed of the generator: 1 .. RandomMaxVal - 1.
long reduce_seed(long seed) {
    if (seed == 0) {
        const auto now = std::chrono::system_clock::now().time_since_epoch();
        const auto msecs = std::chrono::duration_cast<std::chrono::milliseconds>(now).count();
        seed = static_cast<long>(msecs & 0xfffffff);
    } else {
        seed %= Util::RandomMaxVal;
        if (seed < 0) {
            seed += Util::RandomMaxVal;
        }
    }
    return seed == 0 ? 1 : seed;
}

template <class T>
T* copy_array(const T* a, int n) {
    if (a == nullptr) {
        return nullptr;
    }
    const auto count = static_cast<size_t>(std::max(n, 0));
    T* copy = new T[count];
    std::copy_n(a, count, copy);
    return copy;
}

}  // namespace

int Util::GetClosest(int v, const int* a, int n) {
    return closest(v, a, n);
}

double Util::GetClosest(double v, const double* a, int n) {
    return closest(v, a, n);
}

int Util::NextPowerOf2(int n) {
    int power = 1;
    while (power < n && power < kLargestPowerOf2) {
        power *= 2;
    }
    return power;
}

int Util::ClosestPowerOf2(int n) {
    int power = 1;
    while (2LL * n >= 3LL * power && power < kLargestPowerOf2) {
        power *= 2;
    }
    return power;
}

int Util::IntLog2(int n) {
    int log = -1;
    for (; n > 0; n >>= 1) {
        log++;
    }
    return log;
}

int Util::RoundDown(int v, int m) {
    assert(m != 0);
    // In a wider type, because the smallest int divided by -1 leaves the range.
    return static_cast<int>(static_cast<long long>(v) / m * m);
}

int Util::StandardDevShort(const short* a, int n) {
    if (n < 1) {
        return 0;
    }
    long long sum = 0;
    long long sum_of_squares = 0;
    for (int i = 0; i < n; i++) {
        sum += a[i];
        sum_of_squares += static_cast<long long>(a[i]) * a[i];
    }
    const long long mean = sum / n;
    const long long mean_square = sum_of_squares / n;
    return static_cast<int>(std::sqrt(static_cast<double>(mean_square - mean * mean)));
}

char* Util::FourccToString(long code, char* out) {
    for (int i = 0; i < 4; i++) {
        out[i] = static_cast<char>(static_cast<unsigned long>(code) >> (24 - 8 * i) & 0xff);
    }
    out[4] = '\0';
    return out;
}

bool Util::IsAudio(int code) {
    return is_one_of(kAudioTypes, code);
}

bool Util::IsVideo(int code) {
    return is_one_of(kVideoTypes, code);
}

long Util::Random(long seed) {
    // Schrage's method: the product is taken without leaving 32 bits.
    constexpr long kMultiplier = 16807;
    constexpr long kQuotient = 127773;
    constexpr long kRemainder = 2836;
    seed = reduce_seed(seed);
    const long next = kMultiplier * (seed % kQuotient) - kRemainder * (seed / kQuotient);
    return next < 0 ? next + RandomMaxVal : next;
}

long Util::ScaleRandomValueToRange(long r, long lo, long hi) {
    if (hi < lo) {
        return lo;
    }
    // Unsigned, because a wide range has more values than a long can count; 0 stands for all.
    const unsigned long count = static_cast<unsigned long>(hi) - static_cast<unsigned long>(lo) + 1;
    const bool countable = count != 0 && count <= static_cast<unsigned long>(LONG_MAX);
    const long offset = countable ? r % static_cast<long>(count) : r;
    return static_cast<long>(static_cast<unsigned long>(lo) + static_cast<unsigned long>(offset));
}

double Util::ScaleRandomValueToRange(long r, double lo, double hi) {
    if (hi < lo) {
        return lo;
    }
    return lo + static_cast<double>(r) / static_cast<double>(RandomMaxVal) * (hi - lo);
}

long Util::GetNextScaledRandomValue(long* seed, long lo, long hi) {
    *seed = Random(*seed);
    return ScaleRandomValueToRange(*seed, lo, hi);
}

double Util::GetNextScaledRandomValue(long* seed, double lo, double hi) {
    *seed = Random(*seed);
    return ScaleRandomValueToRange(*seed, lo, hi);
}

int* Util::CopyArrayInt(const int* a, int n) {
    return copy_array(a, n);
}

double* Util::CopyArrayDouble(const double* a, int n) {
    return copy_array(a, n);
}

unsigned char* Util::CopyArrayByte(const unsigned char* a, int n) {
    return copy_array(a, n);
}

int Util::SleepMsecs(long long ms, const bool* stop) {
    using std::chrono::steady_clock;
    constexpr int kSliceMsecs = 50;
    if (ms <= 0) {
        return 0;
    }
    const zolt::ErrnoKeeper keep_errno;
    const auto start = steady_clock::now();
    // Volatile: the flag changes behind the compiler's back, in a signal handler or another thread.
    const volatile bool* const flag = stop;
    for (long long slice = ms / kSliceMsecs - 1; slice > 0; slice--) {
        if (flag != nullptr && *flag) {
            return 1;
        }
        zolt::os_sleep(kSliceMsecs);
    }
    const auto end = start + std::chrono::milliseconds(ms);
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - steady_clock::now());
    if (left.count() > 0) {
        zolt::os_sleep(static_cast<int>(left.count()));
    }
    return 0;
}

void Util::CmdLineInterpreter(const char* prompt, int n, const char* const* commands,
                              CmdHandler handler) {
    constexpr int kMaxWords = 20;
    constexpr int kMaxWordLength = 256;
    constexpr int kMaxLineLength = 300;
    constexpr const char* kStopWords[] = {"quit", "exit"};

    const zolt::ErrnoKeeper keep_errno;
    const auto release = [](char** list) { DeleteWordsList(list, kMaxWords); };
    const std::unique_ptr<char*, decltype(release)> owner(
        CreateWordsList(kMaxWords, kMaxWordLength), release);
    char** const words = owner.get();
    char line[kMaxLineLength + 1];
    for (;;) {
        if (prompt != nullptr) {
            std::printf("%s", prompt);
            std::fflush(stdout);
        }
        errno = 0;  // the end of the input sets none, and an older one would mislead
        if (std::fgets(line, sizeof line, stdin) == nullptr) {
            std::perror("\nError reading command line - exiting");
            return;
        }
        const int count = ParseString(line, words, kMaxWords, kMaxWordLength);
        if (count == 0) {
            continue;
        }
        if (StringIsInList(words[0], kStopWords, 2)) {
            return;
        }
        if (StringIsInList(words[0], commands, n)) {
            handler(words[0], words + 1, count - 1);
        } else {
            std::printf("Unknown command: %s\n", words[0]);
        }
    }
}
