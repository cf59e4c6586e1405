#include <gst/gst.h>
#include <gtest/gtest.h>

int main(int argc, char** argv) {
    testing::InitGoogleTest(&argc, argv);
    // This build's element, and a list of plug-ins of its own.
    g_setenv("GST_PLUGIN_PATH", ZOLT_ELEMENT_FOLDER, TRUE);
    g_setenv("GST_REGISTRY", ZOLT_REGISTRY, TRUE);
    gst_init(&argc, &argv);
    const int result = RUN_ALL_TESTS();
    gst_deinit();  // tracers report then
    return result;
}
