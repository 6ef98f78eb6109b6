// The GObject side of the element morvadenoise: class, properties, which call of GStreamer goes
// where, and the plugin that holds it.
#include <array>
#include <memory>
#include <string>
#include <utility>

#include "denoiser.h"
#include "morva-sdk/morva-sdk.h"

namespace morva::plugins {
namespace {

struct Element {
    GstBaseTransform base;
    Denoiser* denoiser;  // owned from init to finalize
};

GstBaseTransformClass* parent = nullptr;

enum Property : guint { kLimit = 1, kBypass, kModel, kInterval };

Denoiser& denoiser(void* element) {
    return *static_cast<Element*>(element)->denoiser;
}

void finalize(GObject* object) {
    std::unique_ptr<Denoiser>(&denoiser(object)).reset();
    G_OBJECT_CLASS(parent)->finalize(object);
}

void setModel(GObject* object, char const* model) {
    GST_OBJECT_LOCK(object);
    denoiser(object).properties.model = model != nullptr ? model : "";
    GST_OBJECT_UNLOCK(object);
}

void setProperty(GObject* object, guint id, GValue const* value, GParamSpec* spec) {
    auto& properties = denoiser(object).properties;
    switch (id) {
        case kLimit:
            properties.limitDb = g_value_get_float(value);
            break;
        case kBypass:
            properties.bypass = g_value_get_boolean(value) != FALSE;
            break;
        case kModel:
            setModel(object, g_value_get_string(value));
            break;
        case kInterval:
            properties.interval = g_value_get_uint64(value);
            break;
        default:
            G_OBJECT_WARN_INVALID_PROPERTY_ID(object, id, spec);
    }
}

void getProperty(GObject* object, guint id, GValue* value, GParamSpec* spec) {
    auto const& properties = denoiser(object).properties;
    switch (id) {
        case kLimit:
            g_value_set_float(value, properties.limitDb);
            break;
        case kBypass:
            g_value_set_boolean(value, properties.bypass ? TRUE : FALSE);
            break;
        case kModel:
            GST_OBJECT_LOCK(object);
            g_value_set_string(value, properties.model.c_str());
            GST_OBJECT_UNLOCK(object);
            break;
        case kInterval:
            g_value_set_uint64(value, properties.interval);
            break;
        default:
            G_OBJECT_WARN_INVALID_PROPERTY_ID(object, id, spec);
    }
}

gboolean setCaps(GstBaseTransform* element, GstCaps* in, GstCaps*) {
    auto const* const format = gst_caps_get_structure(in, 0);
    int rateHz = 0;
    int channels = 0;
    gst_structure_get(format, "rate", G_TYPE_INT, &rateHz, "channels", G_TYPE_INT, &channels,
                      nullptr);
    return denoiser(element).begin(rateHz, channels) ? TRUE : FALSE;
}

gboolean stop(GstBaseTransform* element) {
    denoiser(element).end();
    return TRUE;
}

GstFlowReturn transform(GstBaseTransform* element, GstBuffer* buffer) {
    return denoiser(element).transform(buffer);
}

gboolean sinkEvent(GstBaseTransform* element, GstEvent* event) {
    switch (GST_EVENT_TYPE(event)) {
        case GST_EVENT_EOS:
        case GST_EVENT_GAP:
        case GST_EVENT_SEGMENT:
        case GST_EVENT_SEGMENT_DONE:
            denoiser(element).drain();
            break;
        case GST_EVENT_FLUSH_STOP:
            denoiser(element).flush();
            break;
        default:
            break;
    }
    return parent->sink_event(element, event);
}

gboolean query(GstBaseTransform* element, GstPadDirection side, GstQuery* question) {
    if (side == GST_PAD_SRC && GST_QUERY_TYPE(question) == GST_QUERY_LATENCY) {
        return denoiser(element).answerLatency(question) ? TRUE : FALSE;
    }
    return parent->query(element, side, question);
}

void addProperties(GObjectClass* object) {
    constexpr auto kAlways = static_cast<GParamFlags>(G_PARAM_READWRITE | G_PARAM_STATIC_STRINGS |
                                                      GST_PARAM_MUTABLE_PLAYING);
    constexpr auto kReady = static_cast<GParamFlags>(G_PARAM_READWRITE | G_PARAM_STATIC_STRINGS |
                                                     GST_PARAM_MUTABLE_READY);
    g_object_class_install_property(
        object, kLimit,
        g_param_spec_float("limit", "Attenuation limit",
                           "By how many decibels noise is lowered at most (100: no limit)", 0.0F,
                           kNoLimitDb, kNoLimitDb, kAlways));
    g_object_class_install_property(
        object, kBypass,
        g_param_spec_boolean("bypass", "Bypass", "Lets the sound through, at the same latency",
                             FALSE, kAlways));
    g_object_class_install_property(
        object, kModel,
        g_param_spec_string("model", "Model",
                            "Weight file: a path with a slash, or the name of a shipped one "
                            "(empty: chosen by the rate)",
                            "", kReady));
    g_object_class_install_property(
        object, kInterval,
        g_param_spec_uint64("interval", "Interval",
                            "Nanoseconds of sound between messages with voice score and noise "
                            "level (0: no messages)",
                            0, G_MAXUINT64, 100 * GST_MSECOND, kReady));
}

void addPads(GstElementClass* element) {
    std::string rates;
#define MORVA_ADD_RATE(hz) rates += rates.empty() ? #hz : ", " #hz;
    MORVA_SAMPLING_RATES(MORVA_ADD_RATE)
#undef MORVA_ADD_RATE
    auto const format =
        "audio/x-raw, format = (string) F32LE, layout = (string) interleaved, "
        "channels = (int) [ 1, 64 ], rate = (int) { " +
        rates + " }";
    auto* const caps = gst_caps_from_string(format.c_str());
    for (auto const& [name, side] :
         std::array{std::pair{"sink", GST_PAD_SINK}, std::pair{"src", GST_PAD_SRC}}) {
        gst_element_class_add_pad_template(element,
                                           gst_pad_template_new(name, side, GST_PAD_ALWAYS, caps));
    }
    gst_caps_unref(caps);
}

void initialise(GTypeInstance* instance, void*) {
    auto* const element = reinterpret_cast<Element*>(instance);
    element->denoiser = std::make_unique<Denoiser>(element->base).release();
}

void initialiseClass(void* type, void*) {
    parent = static_cast<GstBaseTransformClass*>(g_type_class_peek_parent(type));

    auto* const object = static_cast<GObjectClass*>(type);
    object->finalize = &finalize;
    object->set_property = &setProperty;
    object->get_property = &getProperty;
    addProperties(object);

    auto* const element = static_cast<GstElementClass*>(type);
    gst_element_class_set_static_metadata(element, "Morva noise suppression", "Filter/Effect/Audio",
                                          "Takes the noise out of voices, scores voice and noise",
                                          "the Morva project");
    addPads(element);

    auto* const base = static_cast<GstBaseTransformClass*>(type);
    base->set_caps = &setCaps;
    base->stop = &stop;
    base->transform_ip = &transform;
    base->sink_event = &sinkEvent;
    base->query = &query;
}

gboolean registerElement(GstPlugin* plugin) {
    auto const type = g_type_register_static_simple(GST_TYPE_BASE_TRANSFORM, "MorvaDenoise",
                                                    sizeof(GstBaseTransformClass), &initialiseClass,
                                                    sizeof(Element), &initialise, GTypeFlags{});
    return gst_element_register(plugin, "morvadenoise", GST_RANK_NONE, type);
}

}  // namespace
}  // namespace morva::plugins

#define PACKAGE "morva"  // by which GStreamer's macro knows the source
extern "C" {
GST_PLUGIN_DEFINE(GST_VERSION_MAJOR, GST_VERSION_MINOR, morva, "Morva noise suppression",
                  morva::plugins::registerElement, MORVA_VERSION, "Apache 2.0", "Morva",
                  "urn:morva")
}
