// Coding pictures takes no memory: every way to ask for some is counted.

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <memory>

#include "common/Encoding.h"
#include "common/Workers.h"

namespace {

std::atomic<long> allocations{0};

}  // namespace

#ifdef ZOLT_SANITIZED

// The sanitizers own malloc, under operator new too; they tell of every call.
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*malloc_hook)(const volatile void*,
                                                                             std::size_t),
                                                         void (*free_hook)(const volatile void*));

namespace {

void count_allocation(const volatile void*, std::size_t) {
    ++allocations;
}

void ignore_release(const volatile void*) {}

const int installed = __sanitizer_install_malloc_and_free_hooks(count_allocation, ignore_release);

}  // namespace

#else

// The C library's functions under the names it keeps for those who replace them; operator new calls
// malloc or aligned_alloc.
extern "C" {

void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);

void* malloc(std::size_t size) {
    ++allocations;
    return __libc_malloc(size);
}

void* calloc(std::size_t count, std::size_t size) {
    ++allocations;
    return __libc_calloc(count, size);
}

void* realloc(void* block, std::size_t size) {
    ++allocations;
    return __libc_realloc(block, size);
}

void* aligned_alloc(std::size_t alignment, std::size_t size) {
    ++allocations;
    return __libc_memalign(alignment, size);
}

}  // extern "C"

#endif

namespace {

// Keeps the compiler from leaving out an allocation that nobody looks at.
void* volatile seen;

template <typename Allocate>
long counted(Allocate allocate) {
    const long before = allocations;
    allocate();
    return allocations - before;
}

TEST(Allocation, IsCounted) {
    struct alignas(64) Wide {
        char bytes[64];
    };
    const auto after = [](void (*allocate)(), void (*release)()) {
        const long count = counted(allocate);
        release();
        return count;
    };
    const auto free_seen = [] { std::free(seen); };
    EXPECT_GT(after([] { seen = new int; }, [] { delete static_cast<int*>(seen); }), 0);
    EXPECT_GT(after([] { seen = new Wide; }, [] { delete static_cast<Wide*>(seen); }), 0);
    EXPECT_GT(after([] { seen = std::malloc(100); }, free_seen), 0);
    EXPECT_GT(after([] { seen = std::calloc(3, 7); }, free_seen), 0);
    EXPECT_GT(after([] { seen = std::realloc(nullptr, 50); }, free_seen), 0);
    EXPECT_EQ(counted([] { seen = nullptr; }), 0);
}

// Intra and P pictures, macroblocks of all kinds, rate control, and pictures that are coded again.
TEST(Allocation, NoneForAPicture) {
    using zolt_test::generated;
    for (const char* kind : {"zoom", "cut", "noise"}) {
        const zolt_test::Sequence sequence = generated(kind, 176, 144, 12);
        for (const int bit_rate : {0, 500000}) {
            zolt_test::Encoding encoding(176, 144, {kind[0] == 'n' ? 1 : 26, bit_rate, 5});
            CEncoder& engine = encoding.engine();
            std::vector<std::uint8_t> picture(sequence.picture_size());
            long count = 0;
            for (int n = 0; n < sequence.pictures; ++n) {
                sequence.draw(n, picture.data());
                count += counted([&] {
                    engine.encode_frame(picture.data());
                    engine.reset_nal_buffer();
                });
            }
            EXPECT_EQ(count, 0) << kind << " at bit rate " << bit_rate;
        }
    }
}

// Further workers have their memory when a picture first asks for them, which is no more than one a
// row; then pictures take none with any number of them. They run on the caller's thread, since
// threads take some.
TEST(Allocation, NoneForAPictureWithWorkers) {
    using zolt_test::Order;
    const zolt_test::Sequence sequence = zolt_test::generated("noise", 176, 144, 12);
    zolt_test::Encoding encoding(176, 144, {1, 0, 5});
    CEncoder& engine = encoding.engine();
    zolt_test::Workers serial(1, Order::kSerial), reversed(1, Order::kReversed);
    std::vector<std::uint8_t> picture(sequence.picture_size());
    constexpr int kWorkers[12] = {1, 3, 2, 3, 9, 1, 1000, 8, 0, 5, 9, 2};
    for (int n = 0; n < sequence.pictures; ++n) {
        sequence.draw(n, picture.data());
        zolt_test::Workers& workers = n % 3 == 2 ? reversed : serial;
        workers.set_count(kWorkers[n]);
        engine.set_worker_pool(&workers);
        const long count = counted([&] {
            engine.encode_frame(picture.data());
            engine.reset_nal_buffer();
        });
        if (n == 1 || n == 4) {
            EXPECT_GT(count, 0) << "picture " << n;
        } else {
            EXPECT_EQ(count, 0) << "picture " << n;
        }
    }
}

}  // namespace
