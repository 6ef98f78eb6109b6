// The cleaners of version NC_1.0.0, one for each kind of session: they differ in which of the
// model's answers they give.
#pragma once

#include <utility>

#include "noise_canceller/band_model.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseCleaner_v1_0_0 final : public NoiseCleaner {
public:
    using Model = BandModel;
    using Params = Model::Params;

    NoiseCleaner_v1_0_0(ModelEnvironment model, std::size_t frameMs)
        : NoiseCleaner(std::move(model)), model_(*environment(), frameMs) {}

    bool cleanNoise(std::vector<float>& frame) override {
        model_.clean(frame);
        return true;
    }

    SoundControls& controls() { return model_; }

private:
    Model model_;
};

// Replaces each frame by one value of the model.
template <float (SoundControls::*value)() const>
class BandListener final : public NoiseCleaner {
public:
    BandListener(ModelEnvironment model, std::size_t frameMs)
        : NoiseCleaner(std::move(model)), model_(*environment(), frameMs) {}

    bool cleanNoise(std::vector<float>& frame) override {
        model_.listen(frame);
        frame.assign(1, (model_.*value)());
        return true;
    }

    // Restores the start state.
    bool resetSession() override {
        model_.reset();
        return true;
    }

private:
    BandModel model_;
};

using VadCleaner_v1_0_0 = BandListener<&SoundControls::voiceScore>;
using NoiseDBCleaner_v1_0_0 = BandListener<&SoundControls::noiseLevelDb>;

}  // namespace MORVA::NOISE_CANCELLER
