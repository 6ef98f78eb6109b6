// What hosts see: the two plugins of this library and the functions behind them. No exception
// leaves; a failed instantiate says why on standard error and answers null.
#include <ladspa.h>

#include <array>
#include <cstdio>
#include <exception>
#include <memory>

#include "port_plugin.h"

namespace morva::plugins {
namespace {

PortPlugin& plugin(LADSPA_Handle handle) {
    return *static_cast<PortPlugin*>(handle);
}

template <std::size_t channels>
LADSPA_Handle instantiate(LADSPA_Descriptor const*, unsigned long rateHz) {
    try {
        return std::make_unique<PortPlugin>(channels, static_cast<int>(rateHz), false).release();
    } catch (std::exception const& failure) {
        std::fprintf(stderr, "morva_ladspa: %s\n", failure.what());
        return nullptr;
    }
}

void connectPort(LADSPA_Handle handle, unsigned long port, LADSPA_Data* data) {
    plugin(handle).connect(port, data);
}

void activate(LADSPA_Handle handle) {
    try {
        plugin(handle).activate();
    } catch (std::exception const& failure) {  // the old sessions go on
        std::fprintf(stderr, "morva_ladspa: %s\n", failure.what());
    }
}

void run(LADSPA_Handle handle, unsigned long samples) {
    plugin(handle).run(samples);
}

void cleanup(LADSPA_Handle handle) {
    std::unique_ptr<PortPlugin> const owned(&plugin(handle));
}

struct Port {
    LADSPA_PortDescriptor kind;
    char const* name;
    LADSPA_PortRangeHint hint;
};

constexpr auto kAudioIn = LADSPA_PORT_AUDIO | LADSPA_PORT_INPUT;
constexpr auto kAudioOut = LADSPA_PORT_AUDIO | LADSPA_PORT_OUTPUT;
constexpr auto kControlIn = LADSPA_PORT_CONTROL | LADSPA_PORT_INPUT;
constexpr auto kControlOut = LADSPA_PORT_CONTROL | LADSPA_PORT_OUTPUT;

// In the order of Control; LADSPA's hosts have no use for the meters behind these.
constexpr std::array kControls{
    Port{kControlIn,
         "Attenuation limit (dB)",
         {LADSPA_HINT_BOUNDED_BELOW | LADSPA_HINT_BOUNDED_ABOVE | LADSPA_HINT_DEFAULT_MAXIMUM, 0.0F,
          kNoLimitDb}},
    Port{kControlIn, "Bypass", {LADSPA_HINT_TOGGLED | LADSPA_HINT_DEFAULT_0, 0.0F, 1.0F}},
    // Hosts know this port by its name.
    Port{kControlOut, "latency", {0, 0.0F, 0.0F}},
};
static_assert(kControls.size() == static_cast<std::size_t>(Control::latency) + 1);

template <std::size_t channels>
class Descriptor {
public:
    Descriptor(unsigned long id, char const* label, char const* name,
               std::array<char const*, 2 * channels> const& audio) {
        std::size_t at = 0;
        for (auto const* const port : audio) {
            put(at, {at < channels ? kAudioIn : kAudioOut, port, {}});
            ++at;
        }
        for (auto const& port : kControls) put(at++, port);
        descriptor_.UniqueID = id;
        descriptor_.Label = label;
        descriptor_.Properties = LADSPA_PROPERTY_HARD_RT_CAPABLE;
        descriptor_.Name = name;
        descriptor_.Maker = "the Morva project";
        descriptor_.Copyright = "Apache-2.0";
        descriptor_.PortCount = kPorts;
        descriptor_.PortDescriptors = kinds_.data();
        descriptor_.PortNames = names_.data();
        descriptor_.PortRangeHints = hints_.data();
        descriptor_.instantiate = &instantiate<channels>;
        descriptor_.connect_port = &connectPort;
        descriptor_.activate = &activate;
        descriptor_.run = &run;
        descriptor_.cleanup = &cleanup;
    }

    LADSPA_Descriptor const* get() const { return &descriptor_; }

private:
    static constexpr std::size_t kPorts = 2 * channels + kControls.size();

    void put(std::size_t at, Port const& port) {
        kinds_[at] = port.kind;
        names_[at] = port.name;
        hints_[at] = port.hint;
    }

    std::array<LADSPA_PortDescriptor, kPorts> kinds_{};
    std::array<char const*, kPorts> names_{};
    std::array<LADSPA_PortRangeHint, kPorts> hints_{};
    LADSPA_Descriptor descriptor_{};
};

}  // namespace
}  // namespace morva::plugins

extern "C" __attribute__((visibility("default"))) LADSPA_Descriptor const* ladspa_descriptor(
    unsigned long index) {
    using morva::plugins::Descriptor;
    static Descriptor<1> const mono(5068353, "morva_mono", "Morva noise suppression (mono)",
                                    {"Input", "Output"});
    static Descriptor<2> const stereo(
        5068354, "morva_stereo", "Morva noise suppression (stereo)",
        {"Input (left)", "Input (right)", "Output (left)", "Output (right)"});
    if (index == 0) return mono.get();
    return index == 1 ? stereo.get() : nullptr;
}
