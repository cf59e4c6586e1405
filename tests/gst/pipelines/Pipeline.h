#pragma once

#include <gst/gst.h>

#include <chrono>
#include <functional>
#include <string>

/** The encoder of all pipelines here: what ZOLT_GST_ENCODER says as in gst-launch-1.0, properties
 *  included, else zolth264enc. It has the name "enc". */
std::string encoder(const std::string& properties = "");

/** Whether GStreamer has all of these elements; the first that it lacks is in `missing`. */
bool has_elements(std::initializer_list<const char*> names, std::string* missing);

/** A pipeline in this process. The destructor stops it. */
class Pipeline {
public:
    using Seconds = std::chrono::duration<double>;

    /** @param description as for gst-launch-1.0. @throws std::runtime_error where it is wrong. */
    explicit Pipeline(const std::string& description);
    ~Pipeline();
    Pipeline(const Pipeline&) = delete;
    Pipeline& operator=(const Pipeline&) = delete;

    GstBin* bin() const { return GST_BIN(pipeline_); }

    /** An element by its name, the pipeline's own as long as it lives. */
    GstElement* element(const std::string& name) const;

    /** Calls `see` for what passes an element's pad; the answer is the probe's. The call comes on
     * the thread of the pad. */
    using Probe = std::function<GstPadProbeReturn(GstPadProbeInfo*)>;
    void watch(const std::string& name, const char* pad, GstPadProbeType type, Probe see);

    void play();
    void stop();

    /** Waits until `done` or the end of the stream. @return whether it came to `done`, or to the
     * end where there is none. @throws std::runtime_error for an element's error or warning. */
    bool wait(Seconds limit, const std::function<bool()>& done = nullptr);

private:
    GstElement* pipeline_;
};
