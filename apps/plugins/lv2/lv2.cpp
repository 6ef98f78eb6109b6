// The LV2 plugins of this library: the functions behind them. What hosts see stands in morva.ttl.
// No exception leaves; a failed instantiate says why on standard error and answers null.
#include <lv2/core/lv2.h>

#include <array>
#include <cstdio>
#include <exception>
#include <memory>

#include "port_plugin.h"

namespace morva::plugins {
namespace {

PortPlugin& plugin(LV2_Handle handle) {
    return *static_cast<PortPlugin*>(handle);
}

template <std::size_t channels>
LV2_Handle instantiate(LV2_Descriptor const*, double rateHz, char const*,
                       LV2_Feature const* const*) {
    try {
        return std::make_unique<PortPlugin>(channels, static_cast<int>(rateHz), true).release();
    } catch (std::exception const& failure) {
        std::fprintf(stderr, "morva_lv2: %s\n", failure.what());
        return nullptr;
    }
}

void connectPort(LV2_Handle handle, uint32_t port, void* data) {
    plugin(handle).connect(port, static_cast<float*>(data));
}

void activate(LV2_Handle handle) {
    try {
        plugin(handle).activate();
    } catch (std::exception const& failure) {  // the old sessions go on
        std::fprintf(stderr, "morva_lv2: %s\n", failure.what());
    }
}

void run(LV2_Handle handle, uint32_t samples) {
    plugin(handle).run(samples);
}

void cleanup(LV2_Handle handle) {
    std::unique_ptr<PortPlugin> const owned(&plugin(handle));
}

template <std::size_t channels>
constexpr LV2_Descriptor describe(char const* uri) {
    return {uri, &instantiate<channels>, &connectPort, &activate, &run, nullptr, &cleanup, nullptr};
}

constexpr std::array kPlugins{describe<1>("urn:morva:mono"), describe<2>("urn:morva:stereo")};

}  // namespace
}  // namespace morva::plugins

extern "C" __attribute__((visibility("default"))) LV2_Descriptor const* lv2_descriptor(
    uint32_t index) {
    using morva::plugins::kPlugins;
    return index < kPlugins.size() ? &kPlugins[index] : nullptr;
}
