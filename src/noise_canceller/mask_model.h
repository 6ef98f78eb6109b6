// A spectral cleaner with its network: everything of a noise cleaner that runs once per hop. Which
// network it is follows from the type of its weights. One thread at a time.
#pragma once

#include <algorithm>
#include <vector>

#include "noise_canceller/networks.h"
#include "noise_canceller/spectral_cleaner.h"
#include "noise_canceller/spectral_params.h"

namespace MORVA::NOISE_CANCELLER {

template <class NetworkWeights>
class MaskModel {
public:
    // The values that the model reads; its checks make every frame call safe.
    struct Params : NetworkWeights, SpectralParams {
        Params(SpectralParams::Environment& environment, std::size_t frameMs,
               Generation const& generation)
            : NetworkWeights(*environment.first),
              SpectralParams(environment, frameMs, generation) {
            NetworkWeights::check(featureWidth(), bands.bands());
        }
        std::size_t stateWidth() const { return NetworkWeights::stateWidth(featureWidth()); }
    };

    MaskModel(Params const& params, CONTAINERS::AnyMap& environment, Generation const& generation)
        : params_(params),
          spectral_(params, environment, generation),
          state_(params.stateWidth()) {}

    void reset() {
        spectral_.reset();
        std::ranges::fill(state_, 0.0f);
        silentInput_ = false;
    }

    // Looks at a session frame before its hops run: digital silence can bypass the network.
    void examineInput(std::vector<float> const& frame) {
        if (!params_.skipFrame || frame.empty()) return;
        auto const [low, high] = std::ranges::minmax(frame);
        silentInput_ = SpectralParams::kSkipThreshold >= std::max(std::abs(high), std::abs(low));
    }

    // One model frame: FrameLength samples in, as many windowed, cleaned samples out. `stage` may
    // change the cleaned frame before it is windowed.
    template <class Stage>
    bool run(float const* in, std::vector<float>& out, Stage&& stage) {
        spectral_.analyse(in, x_);
        if (silentInput_) {
            // As long as the output layer; the state is left alone.
            x_.assign(params_.baesNonLinear.back().size(), 1.0f);
        } else {
            runNetwork(state_, x_, params_, scratch_);
        }
        spectral_.applyMask(x_);
        stage(spectral_.frame());
        spectral_.finish(out);
        return true;
    }

    std::vector<float> const& synthesisWindow() const { return spectral_.synthesisWindow(); }

private:
    Params const& params_;
    SpectralCleaner spectral_;
    std::vector<float> state_;
    std::vector<float> x_;
    NetworkScratch scratch_;
    bool silentInput_ = false;  // set only while frame skipping is enabled
};

}  // namespace MORVA::NOISE_CANCELLER
