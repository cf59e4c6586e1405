#include <dlfcn.h>
#include <gtest/gtest.h>

#include <climits>
#include <fstream>
#include <thread>

#include "ElementHarness.h"

namespace zolt_test {
namespace {

constexpr const char* kCaps = "format=I420,width=64,height=48,framerate=30/1";

#ifdef ZOLT_SANITIZED
constexpr bool kIsSanitized = true;
#else
constexpr bool kIsSanitized = false;
#endif

// Bytes of this process that are in memory.
long resident_bytes() {
    std::ifstream file("/proc/self/statm");
    long pages = 0;
    file >> pages >> pages;
    return pages * 4096;
}

bool is_loaded(const char* library) {
    void* const handle = dlopen(library, RTLD_NOW | RTLD_NOLOAD);
    if (handle != nullptr) {
        dlclose(handle);
    }
    return handle != nullptr;
}

void code_some(const char* properties) {
    const ElementHarness element(properties);
    ASSERT_TRUE(element.set_caps(kCaps));
    ASSERT_EQ(element.types(0, 4), "KPPPP");
}

TEST(Life, StatesGoUpAndDown) {
    const ElementHarness element;
    for (const GstState low : {GST_STATE_NULL, GST_STATE_READY, GST_STATE_PAUSED}) {
        ASSERT_EQ(gst_element_set_state(element.element(), GST_STATE_PLAYING),
                  GST_STATE_CHANGE_SUCCESS);
        gst_harness_push_event(element.harness(), gst_event_new_stream_start("again"));
        ASSERT_TRUE(element.set_caps("format=I420,width=80,height=48,framerate=30/1"));
        GstSegment segment;
        gst_segment_init(&segment, GST_FORMAT_TIME);
        gst_harness_push_event(element.harness(), gst_event_new_segment(&segment));
        EXPECT_EQ(element.types(0, 2), "KPP");
        ASSERT_EQ(gst_element_set_state(element.element(), low), GST_STATE_CHANGE_SUCCESS);
    }
}

TEST(Life, TheLibraryGoesWithTheElement) {
    ASSERT_FALSE(is_loaded(ZOLT_PLUGIN_FILE));
    {
        const ElementHarness element("threads=2");
        ASSERT_TRUE(element.set_caps(kCaps));
        EXPECT_EQ(element.types(0, 2), "KPP");
        EXPECT_TRUE(is_loaded(ZOLT_PLUGIN_FILE));
    }
    EXPECT_FALSE(is_loaded(ZOLT_PLUGIN_FILE));
}

TEST(Life, TwoHundredCyclesTakeNoMemory) {
    constexpr int kCycles = 200;
    constexpr int kWarmUp = 40;
    long before = 0;
    for (int n = 0; n < kCycles; ++n) {
        if (n == kWarmUp) {
            before = resident_bytes();
        }
        code_some("threads=2");
    }
    // A session of this size takes some hundred kilobytes: a few lost ones would be seen. A
    // sanitizer keeps freed memory, and sees lost memory itself.
    EXPECT_LT(resident_bytes() - before, kIsSanitized ? INT_MAX : 1 << 20);
}

TEST(Life, ElementsInThreadsGiveWhatOneAloneGives) {
    const auto code = [](std::vector<std::uint8_t>* bytes) {
        const ElementHarness element("bitrate=300 threads=2");
        element.set_caps("format=RGB,width=100,height=70,framerate=30/1");
        for (int n = 0; n < 40; ++n) {
            element.push(n);
        }
        for (const Output& output : element.take()) {
            bytes->insert(bytes->end(), output.bytes.begin(), output.bytes.end());
        }
    };
    std::vector<std::uint8_t> alone;
    code(&alone);
    ASSERT_FALSE(alone.empty());
    std::vector<std::uint8_t> beside[3];
    std::vector<std::thread> threads;
    for (auto& bytes : beside) {
        threads.emplace_back(code, &bytes);
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (const auto& bytes : beside) {
        EXPECT_EQ(bytes, alone);
    }
}

// Setting properties while pictures are coded is what applications do.
TEST(Life, PropertiesMayBeSetOnAnyThread) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(kCaps));
    std::thread setter([&element] {
        for (guint n = 0; n < 300; ++n) {
            g_object_set(element.element(), "bitrate", 100 + n, "key-int-max", 1 + n % 20, nullptr);
            GstStructure* stats = nullptr;
            g_object_get(element.element(), "stats", &stats, nullptr);
            gst_structure_free(stats);
        }
    });
    EXPECT_EQ(element.types(0, 99).size(), 100u);
    setter.join();
}

// Each keeps what its own thread has set.
TEST(Life, PropertiesSetAtTheSameTimeAreAllKept) {
    const ElementHarness element;
    const auto set_and_get = [&element](const char* name, int* lost) {
        for (guint n = 1; n <= 4000; ++n) {
            guint got = 0;
            g_object_set(element.element(), name, n, nullptr);
            g_object_get(element.element(), name, &got, nullptr);
            *lost += got == n ? 0 : 1;
        }
    };
    int lost[2] = {};
    std::thread other(set_and_get, "key-int-max", &lost[0]);
    set_and_get("bitrate", &lost[1]);
    other.join();
    EXPECT_EQ(lost[0] + lost[1], 0);
}

}  // namespace
}  // namespace zolt_test
