#include "noise_canceller/noise_level_meter.h"

#include <cmath>

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr float kSmoothing = 0.9f;
constexpr float kPowerFloor = 1e-6f;  // -60 dB

}  // namespace

void NoiseLevelMeter::measure(HopPipeline::CompletedHop const& hop) {
    double sum = 0.0;
    for (std::size_t i = 0; i < hop.input.size(); ++i) {
        float const removed = hop.input[i] - hop.output[i];
        sum += static_cast<double>(removed) * static_cast<double>(removed);
    }
    add(static_cast<float>(sum / static_cast<double>(hop.input.size())));
}

void NoiseLevelMeter::add(float power) {
    power_ = power_ * kSmoothing + power * (1.0f - kSmoothing);
}

float NoiseLevelMeter::levelDb() const {
    return 10.0f * std::log10(power_ + kPowerFloor);
}

}  // namespace MORVA::NOISE_CANCELLER
