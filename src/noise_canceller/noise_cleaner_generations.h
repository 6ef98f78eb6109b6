// The noise cleaners of weight versions 0.0.1 to 0.0.5, which differ in their parts only.
#pragma once

#include <utility>

#include "noise_canceller/mask_model.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

template <int number>
class NoiseCleanerGeneration final : public NoiseCleaner {
public:
    using Model = MaskModel<number>;
    using Params = typename Model::Params;

    NoiseCleanerGeneration(ModelEnvironment model, std::size_t frameMs)
        : NoiseCleaner(std::move(model)), model_(*environment(), frameMs) {}

    bool cleanNoise(std::vector<float>& frame) override {
        model_.process(frame, [this](auto in, auto& out) { mainCleaner(in.data(), out); });
        return true;
    }

    // One model frame of FrameLength samples.
    bool mainCleaner(float const* in, std::vector<float>& out) { return model_.run(in, out); }

    SoundControls& controls() { return model_; }

private:
    Model model_;
};

using NoiseCleaner_v0_0_1 = NoiseCleanerGeneration<1>;
using NoiseCleaner_v0_0_2 = NoiseCleanerGeneration<2>;
using NoiseCleaner_v0_0_3 = NoiseCleanerGeneration<3>;
using NoiseCleaner_v0_0_4 = NoiseCleanerGeneration<4>;
using NoiseCleaner_v0_0_5 = NoiseCleanerGeneration<5>;

}  // namespace MORVA::NOISE_CANCELLER
