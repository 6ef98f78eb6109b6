// Noise level: runs the model of the noise cleaner of generation 0.0.5 and reports the level of
// what it removes. Input and output of a hop are compared at the same point of the signal.
#pragma once

#include "noise_canceller/mask_model.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseDBCleaner_v0_0_1 final : public NoiseCleaner {
public:
    using Model = MaskModel<5>;
    using Params = Model::Params;

    NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs);

    // Replaces the frame by one value, the noise level after it in decibels.
    bool cleanNoise(std::vector<float>& frame) override;

    // Restores the start state: the same input gives bit-equal levels again. Allocates nothing.
    bool resetSession() override;

private:
    Model model_;
};

}  // namespace MORVA::NOISE_CANCELLER
