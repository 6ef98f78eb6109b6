// Noise level: runs the noise cleaner of generation 0.0.5 and measures what it removes. The level
// is the mean square of input minus output over a hop, smoothed by 0.9 per hop, in decibels re one
// squared unit of the 16-bit sample scale (-60 for nothing). Input and output of a hop are compared
// at the same point of the signal. One thread at a time.
#pragma once

#include "noise_canceller/noise_cleaner_generations.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseDBCleaner_v0_0_1 final : public NoiseCleaner {
public:
    using Model = NoiseCleaner_v0_0_5::Model;
    using Params = NoiseCleaner_v0_0_5::Params;

    NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs);

    // Replaces the frame by one value, the noise level after it.
    bool cleanNoise(std::vector<float>& frame) override;

    // Restores the start state: the same input gives bit-equal levels again.
    bool resetSession() override;

private:
    void measure(HopPipeline::CompletedHop const& hop);

    Params params_;
    Model model_;
    HopPipeline pipeline_;
    float level_ = 0.0f;  // smoothed noise power
};

}  // namespace MORVA::NOISE_CANCELLER
