#include "Pipeline.h"

#include <cstdlib>
#include <memory>
#include <stdexcept>

namespace {

/** The text of an error or a warning, with the element's name in front. */
std::string text_of(GstMessage* message) {
    GError* error = nullptr;
    gchar* details = nullptr;
    if (GST_MESSAGE_TYPE(message) == GST_MESSAGE_ERROR) {
        gst_message_parse_error(message, &error, &details);
    } else {
        gst_message_parse_warning(message, &error, &details);
    }
    const std::string text = std::string(GST_MESSAGE_SRC_NAME(message)) + ": " + error->message +
                             (details == nullptr ? "" : std::string("\n") + details);
    g_error_free(error);
    g_free(details);
    return text;
}

}  // namespace

std::string encoder(const std::string& properties) {
    const char* other = std::getenv("ZOLT_GST_ENCODER");
    return std::string(other == nullptr ? "zolth264enc" : other) + " name=enc " + properties;
}

bool has_elements(std::initializer_list<const char*> names, std::string* missing) {
    for (const char* name : names) {
        GstElementFactory* factory = gst_element_factory_find(name);
        if (factory == nullptr) {
            *missing = name;
            return false;
        }
        gst_object_unref(factory);
    }
    return true;
}

Pipeline::Pipeline(const std::string& description) {
    GError* error = nullptr;
    pipeline_ = gst_parse_launch(description.c_str(), &error);
    if (error != nullptr) {
        const std::string text = error->message;
        g_error_free(error);
        gst_clear_object(&pipeline_);
        throw std::runtime_error(text + "\n" + description);
    }
}

Pipeline::~Pipeline() {
    stop();
    gst_object_unref(pipeline_);
}

GstElement* Pipeline::element(const std::string& name) const {
    GstElement* element = gst_bin_get_by_name(bin(), name.c_str());
    if (element == nullptr) {
        throw std::runtime_error("The pipeline has no element " + name);
    }
    gst_object_unref(element);
    return element;
}

void Pipeline::watch(const std::string& name, const char* pad, GstPadProbeType type, Probe see) {
    GstPad* watched = gst_element_get_static_pad(element(name), pad);
    gst_pad_add_probe(
        watched, type,
        [](GstPad*, GstPadProbeInfo* info, gpointer data) {
            return (*static_cast<Probe*>(data))(info);
        },
        new Probe(std::move(see)), [](gpointer data) { delete static_cast<Probe*>(data); });
    gst_object_unref(watched);
}

void Pipeline::play() {
    gst_element_set_state(pipeline_, GST_STATE_PLAYING);
}

void Pipeline::stop() {
    gst_element_set_state(pipeline_, GST_STATE_NULL);
}

bool Pipeline::wait(Seconds limit, const std::function<bool()>& done) {
    const auto end = std::chrono::steady_clock::now() + limit;
    GstBus* bus = gst_element_get_bus(pipeline_);
    const std::unique_ptr<GstBus, void (*)(gpointer)> held(bus, gst_object_unref);
    while (std::chrono::steady_clock::now() < end) {
        if (done && done()) {
            return true;
        }
        GstMessage* message = gst_bus_timed_pop_filtered(
            bus, 5 * GST_MSECOND,
            static_cast<GstMessageType>(GST_MESSAGE_EOS | GST_MESSAGE_ERROR | GST_MESSAGE_WARNING));
        if (message == nullptr) {
            continue;
        }
        const std::unique_ptr<GstMessage, void (*)(GstMessage*)> taken(message, gst_message_unref);
        if (GST_MESSAGE_TYPE(message) != GST_MESSAGE_EOS) {
            throw std::runtime_error(text_of(message));
        }
        return !done || done();
    }
    return false;
}
