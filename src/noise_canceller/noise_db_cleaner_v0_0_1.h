// Noise level: runs the noise cleaner of generation 0.0.5 and reports the level of what it removes.
// Input and output of a hop are compared at the same point of the signal. One thread at a time.
#pragma once

#include "noise_canceller/noise_cleaner_generations.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseDBCleaner_v0_0_1 final : public NoiseCleaner {
public:
    using Model = NoiseCleaner_v0_0_5::Model;
    using Params = NoiseCleaner_v0_0_5::Params;

    NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs);

    // Replaces the frame by one value, the noise level after it in decibels.
    bool cleanNoise(std::vector<float>& frame) override;

    // Restores the start state: the same input gives bit-equal levels again.
    bool resetSession() override;

private:
    Params params_;
    Model model_;
};

}  // namespace MORVA::NOISE_CANCELLER
