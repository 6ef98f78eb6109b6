// One instance of a plugin whose host connects numbered ports to memory, as LADSPA's and LV2's do.
//
// Ports: the channels' inputs, the channels' outputs, then the controls of Control, which a kind of
// plugin may cut short. One thread at a time per instance.
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "stream_adapter.h"

namespace morva::plugins {

enum class Control : std::size_t { attenuationLimit, bypass, latency, voice, level, count };

class PortPlugin {
public:
    // Throws as StreamAdapter does.
    PortPlugin(std::size_t channels, int rateHz, bool meters)
        : adapter_({channels, rateHz, meters, {}}), lanes_(channels) {}

    void connect(std::size_t port, float* data);
    // Forgets the sound so far; throws as StreamAdapter does.
    void activate() { adapter_.restart(); }
    void run(std::size_t samples);

private:
    Settings settings() const;
    void report(Control which, float value);
    float* control(Control which) const { return controls_[static_cast<std::size_t>(which)]; }

    StreamAdapter adapter_;
    std::vector<Lane> lanes_;
    std::array<float*, static_cast<std::size_t>(Control::count)> controls_{};
};

}  // namespace morva::plugins
