// The noise cleaners of weight versions 0.0.1 to 0.0.5. They are one class over a table of parts:
// each generation is the next one with fewer of them.
//
//   version  windows               level reference      bands       network
//   0.0.1    Hamming / triangular  running noise mean   every bin   feed-forward
//   0.0.2    Vorbis                running noise mean   every bin   feed-forward
//   0.0.3    Vorbis                mean energy          every bin   gated
//   0.0.4    Vorbis                mean energy          compressed  gated
//   0.0.5    Vorbis                mean energy          compressed  gated
#pragma once

#include <type_traits>
#include <utility>

#include "noise_canceller/mask_controls.h"
#include "noise_canceller/mask_model.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

inline constexpr Generation kGenerations[] = {
    {"_v0_0_1", WindowPair::HammingTriangular, LevelReference::RunningNoiseMean, false, false},
    {"_v0_0_2", WindowPair::Vorbis, LevelReference::RunningNoiseMean, false, false},
    {"_v0_0_3", WindowPair::Vorbis, LevelReference::MeanEnergy, false, false},
    {"_v0_0_4", WindowPair::Vorbis, LevelReference::MeanEnergy, true, false},
    {"_v0_0_5", WindowPair::Vorbis, LevelReference::MeanEnergy, true, false},
    {"_v0_0_6", WindowPair::Vorbis, LevelReference::MeanEnergy, true, true},
};
constexpr Generation const& generation(int number) {
    return kGenerations[number - 1];
}

template <int number>
class NoiseCleanerGeneration final : public NoiseCleaner, public MaskControls {
public:
    using Model = MaskModel<std::conditional_t<number <= 2, FeedForwardWeights, GatedWeights>>;
    using Params = typename Model::Params;

    NoiseCleanerGeneration(ModelEnvironment model, std::size_t frameMs)
        : NoiseCleaner(std::move(model)),
          params_(*environment(), frameMs, generation(number)),
          model_(params_, environment()->second, generation(number)) {}

    bool cleanNoise(std::vector<float>& frame) override {
        model_.process(frame, noStage);
        return true;
    }

    // One model frame of FrameLength samples.
    bool mainCleaner(float const* in, std::vector<float>& out) {
        return model_.run(in, out, noStage);
    }

    void setMaskFloor(float floor) override { model_.setMaskFloor(floor); }
    float noiseLevelDb() const override { return model_.noiseLevelDb(); }

private:
    static void noStage(std::vector<float>&) {}

    Params params_;
    Model model_;
};

using NoiseCleaner_v0_0_1 = NoiseCleanerGeneration<1>;
using NoiseCleaner_v0_0_2 = NoiseCleanerGeneration<2>;
using NoiseCleaner_v0_0_3 = NoiseCleanerGeneration<3>;
using NoiseCleaner_v0_0_4 = NoiseCleanerGeneration<4>;
using NoiseCleaner_v0_0_5 = NoiseCleanerGeneration<5>;

}  // namespace MORVA::NOISE_CANCELLER
