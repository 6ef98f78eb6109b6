#include "port_plugin.h"

#include <algorithm>

namespace morva::plugins {

void PortPlugin::connect(std::size_t port, float* data) {
    if (port < lanes_.size()) {
        lanes_[port].in = data;
    } else if (port < 2 * lanes_.size()) {
        lanes_[port - lanes_.size()].out = data;
    } else if (port - 2 * lanes_.size() < controls_.size()) {
        controls_[port - 2 * lanes_.size()] = data;
    }
}

Settings PortPlugin::settings() const {
    Settings settings;
    if (auto const* const limit = control(Control::attenuationLimit)) settings.limitDb = *limit;
    if (auto const* const bypass = control(Control::bypass)) settings.bypass = *bypass > 0.0F;
    return settings;
}

void PortPlugin::report(Control which, float value) {
    if (auto* const port = control(which)) *port = value;
}

void PortPlugin::run(std::size_t samples) {
    bool const connected = std::ranges::all_of(
        lanes_, [](Lane const& lane) { return lane.in != nullptr && lane.out != nullptr; });
    if (connected) adapter_.run(lanes_, samples, settings());
    report(Control::latency, static_cast<float>(adapter_.latency()));
    report(Control::voice, adapter_.meters().voice);
    report(Control::level, adapter_.meters().levelDb);
}

}  // namespace morva::plugins
