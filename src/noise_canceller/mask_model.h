// Everything that the noise cleaners have in common: the hop pipeline around a spectral cleaner
// with its network, and the meter of what it removes. Which network it is follows from the type of
// its weights. One thread at a time, but for the mask floor, which any thread may set.
#pragma once

#include <algorithm>
#include <atomic>
#include <cmath>
#include <vector>

#include "noise_canceller/feature_statistics.h"
#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/networks.h"
#include "noise_canceller/noise_level_meter.h"
#include "noise_canceller/spectral_cleaner.h"
#include "noise_canceller/spectral_params.h"

namespace MORVA::NOISE_CANCELLER {

template <class NetworkWeights>
class MaskModel {
public:
    // The values that the model reads; its checks make every frame call safe.
    struct Params : FeatureStatistics, NetworkWeights, SpectralParams {
        Params(SpectralParams::Environment& environment, std::size_t frameMs,
               Generation const& generation)
            : FeatureStatistics(inOrder(*environment.first, generation)),
              NetworkWeights(*environment.first),
              SpectralParams(environment, frameMs, generation) {
            if (mu.empty() || sd.empty()) refuseWeight("MU or SD is empty");
            if (std::ranges::count(sd, 0.0f) > 0) refuseWeight("SD holds a zero");
            NetworkWeights::check(featureWidth(), bands.bands());
            std::size_t const layers = NetworkWeights::weightNonLinear.size();
            NetworkWeights::packed =
                sharedPackedNetwork(environment.second, static_cast<NetworkWeights const&>(*this),
                                    {layers, layers - 1});
        }
        std::size_t stateWidth() const { return NetworkWeights::stateWidth(featureWidth()); }

    private:
        // What a weight lacks is named in the order in which a generation reads.
        static WEIGHTS::Weight const& inOrder(WEIGHTS::Weight const& weight,
                                              Generation const& generation) {
            if (generation.structureFirst) Structure const missed(weight);
            return weight;
        }
    };

    MaskModel(Params const& params, CONTAINERS::AnyMap& environment, Generation const& generation,
              Synthesis synthesis = Synthesis::FromKept)
        : params_(params),
          spectral_(params, params, environment, generation, synthesis),
          pipeline_(params.pipelineShape()),
          state_(params.stateWidth()) {
        std::size_t const widest = params.widest(params.stateWidth() + params.featureWidth());
        x_.reserve(widest);
        scratch_.reserve(widest);
    }

    // Back to the state after construction; the mask floor stays.
    void reset() {
        spectral_.reset();
        pipeline_.reset();
        meter_.reset();
        std::ranges::fill(state_, 0.0f);
        silentInput_ = false;
    }

    // One session frame at the model's rate, in place.
    template <class Stage>
    void process(std::vector<float>& frame, Stage&& stage) {
        examineInput(frame);
        pipeline_.process(
            frame, [&](float const* in, std::vector<float>& out) { run(in, out, stage); },
            [&](HopPipeline::CompletedHop const& hop) { meter_.measure(hop); });
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
        spectral_.applyMask(x_, maskFloor_.load(std::memory_order_relaxed));
        stage(spectral_.frame());
        spectral_.finish(out);
        return true;
    }

    std::vector<float> const& synthesisWindow() const { return spectral_.synthesisWindow(); }

    // Lowest gain of a bin, 0..1.
    void setMaskFloor(float floor) { maskFloor_.store(floor, std::memory_order_relaxed); }
    float noiseLevelDb() const { return meter_.levelDb(); }

private:
    // Digital silence can bypass the network.
    void examineInput(std::vector<float> const& frame) {
        if (!params_.skipFrame || frame.empty()) return;
        auto const [low, high] = std::ranges::minmax(frame);
        silentInput_ = SpectralParams::kSkipThreshold >= std::max(std::abs(high), std::abs(low));
    }

    Params const& params_;
    SpectralCleaner spectral_;
    HopPipeline pipeline_;
    NoiseLevelMeter meter_;
    std::atomic<float> maskFloor_ = 0.0f;
    std::vector<float> state_;
    std::vector<float> x_;
    NetworkScratch scratch_;
    bool silentInput_ = false;  // set only while frame skipping is enabled
};

}  // namespace MORVA::NOISE_CANCELLER
