#include "noise_canceller/noise_db_cleaner_v0_0_1.h"

#include <cmath>

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr float kSmoothing = 0.9f;
constexpr float kLevelFloor = 1e-6f;  // -60 dB

}  // namespace

NoiseDBCleaner_v0_0_1::NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)),
      params_(*environment(), frameMs, generation(5)),
      model_(params_, environment()->second, generation(5)),
      pipeline_(params_.pipelineShape()) {}

bool NoiseDBCleaner_v0_0_1::cleanNoise(std::vector<float>& frame) {
    model_.examineInput(frame);
    pipeline_.process(
        frame,
        [this](float const* in, std::vector<float>& out) {
            model_.run(in, out, [](std::vector<float>&) {});
        },
        [this](HopPipeline::CompletedHop const& hop) { measure(hop); });
    frame.assign(1, 10.0f * std::log10(level_ + kLevelFloor));
    return true;
}

void NoiseDBCleaner_v0_0_1::measure(HopPipeline::CompletedHop const& hop) {
    double sum = 0.0;
    for (std::size_t i = 0; i < hop.input.size(); ++i) {
        float const removed = hop.input[i] - hop.output[i];
        sum += static_cast<double>(removed) * static_cast<double>(removed);
    }
    auto const power = static_cast<float>(sum / static_cast<double>(hop.input.size()));
    level_ = level_ * kSmoothing + power * (1.0f - kSmoothing);
}

bool NoiseDBCleaner_v0_0_1::resetSession() {
    level_ = 0.0f;
    model_.reset();
    pipeline_.reset();
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
