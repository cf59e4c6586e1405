#include "GstZoltH264Enc.h"
#include "library_files.h"

namespace {

gboolean plugin_init(GstPlugin* plugin) {
    // The environment is changed here or never: later there are threads that read it.
    zolt::element_services().announce();
    return GST_ELEMENT_REGISTER(zolth264enc, plugin);
}

}  // namespace

GST_PLUGIN_DEFINE(GST_VERSION_MAJOR, GST_VERSION_MINOR, zolt, "ZOLT H.264 encoder", plugin_init,
                  ZOLT_VERSION, GST_LICENSE_UNKNOWN, "zolt", "unknown")
