// Everything that the noise cleaners have in common: the hop pipeline around a spectral cleaner
// with its network and stage, and the meter of what it removes. Which parts they are follows from
// the generation.
#pragma once

#include <algorithm>
#include <atomic>
#include <cmath>
#include <span>
#include <vector>

#include "noise_canceller/feature_statistics.h"
#include "noise_canceller/generations.h"
#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/networks.h"
#include "noise_canceller/noise_level_meter.h"
#include "noise_canceller/sound_controls.h"
#include "noise_canceller/spectral_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

template <int number>
class MaskModel final : public SoundControls {
public:
    using Network = NetworkOf<number>;
    using Stage = StageOf<number>;

    // The values that the model reads; its checks make every frame call safe.
    struct Params : FeatureStatistics, Network, SpectralParams, Stage::Params {
        Params(SpectralParams::Environment& environment, std::size_t frameMs)
            : FeatureStatistics(inOrder(*environment.first)),
              Network(*environment.first),
              SpectralParams(environment, frameMs, generation(number)),
              Stage::Params(ParameterReader(environment, generation(number).suffix)) {
            if (mu.empty() || sd.empty()) refuseWeight("MU or SD is empty");
            if (std::count(sd.begin(), sd.end(), 0.0f) > 0) refuseWeight("SD holds a zero");
            Network::check(featureWidth(), bands.bands());
            std::size_t const layers = Network::weightNonLinear.size();
            Network::packed = sharedPackedNetwork(
                environment.second, static_cast<Network const&>(*this), {layers, layers - 1});
        }
        std::size_t stateWidth() const { return Network::stateWidth(featureWidth()); }

    private:
        // What a weight lacks is named in the order in which a generation reads.
        static WEIGHTS::Weight const& inOrder(WEIGHTS::Weight const& weight) {
            if (generation(number).structureFirst) Structure const missed(weight);
            return weight;
        }
    };

    MaskModel(SpectralParams::Environment& environment, std::size_t frameMs,
              Synthesis synthesis = Synthesis::FromKept)
        : params_(environment, frameMs),
          spectral_(params_, params_, environment.second, generation(number), synthesis),
          stage_(params_, params_.modelFrameMs, spectral_.synthesisWindow()),
          pipeline_(params_.pipelineShape()),
          state_(params_.stateWidth()) {
        std::size_t const widest = params_.widest(params_.stateWidth() + params_.featureWidth());
        x_.reserve(widest);
        scratch_.reserve(widest);
    }

    // Back to the state after construction; the mask floor stays.
    void reset() {
        spectral_.reset();
        pipeline_.reset();
        meter_.reset();
        std::fill(state_.begin(), state_.end(), 0.0f);
        silentInput_ = false;
    }

    // One session frame at the model's rate, in place; `step` cleans a model frame, as run() does.
    template <class Step>
    void process(std::vector<float>& frame, Step&& step) {
        examineInput(frame);
        pipeline_.process(frame, step,
                          [&](HopPipeline::CompletedHop const& hop) { meter_.measure(hop); });
    }

    // One model frame: FrameLength samples in, as many windowed, cleaned samples out.
    bool run(std::span<float const> in, std::vector<float>& out) {
        spectral_.analyse(in, x_);
        if (silentInput_) {
            // As long as the output layer; the state is left alone.
            x_.assign(params_.baesNonLinear.back().size(), 1.0f);
        } else {
            runNetwork(state_, x_, params_, scratch_);
        }
        spectral_.applyMask(x_, maskFloor_.load(std::memory_order_relaxed));
        stage_(spectral_.frame());
        spectral_.finish(out);
        return true;
    }

    // The same for a caller who vouches for the length.
    bool run(float const* in, std::vector<float>& out) {
        return run({in, params_.frameLength}, out);
    }

    void setMaskFloor(float floor) override { maskFloor_.store(floor, std::memory_order_relaxed); }
    bool switchBackgroundSpeaker(bool on) override { return stage_.switchTo(on); }
    float noiseLevelDb() const override { return meter_.levelDb(); }
    std::size_t delay() const override { return pipeline_.delay(); }

private:
    // Digital silence can bypass the network.
    void examineInput(std::vector<float> const& frame) {
        if (!params_.skipFrame || frame.empty()) return;
        auto const [low, high] = std::minmax_element(frame.begin(), frame.end());
        silentInput_ = SpectralParams::kSkipThreshold >= std::max(std::abs(*high), std::abs(*low));
    }

    Params const params_;
    SpectralCleaner spectral_;
    Stage stage_;
    HopPipeline pipeline_;
    NoiseLevelMeter meter_;
    std::atomic<float> maskFloor_ = 0.0f;
    std::vector<float> state_;
    std::vector<float> x_;
    NetworkScratch scratch_;
    bool silentInput_ = false;  // set only while frame skipping is enabled
};

}  // namespace MORVA::NOISE_CANCELLER
