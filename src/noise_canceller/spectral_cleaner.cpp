#include "noise_canceller/spectral_cleaner.h"

#include <algorithm>
#include <cmath>

#include "kernels/vector_math.h"
#include "noise_canceller/spectral_kernels.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// Frames that the energy statistics and the running noise mean look back.
constexpr std::size_t kStatisticsFrames = 10;
// Seconds of active frames that the energy gate and the level reference remember. The gate counts
// model frames, the level reference hops.
constexpr std::size_t kGateSeconds = 4;
constexpr std::size_t kLevelSeconds = 3;
// Mean energies below this leave the level alone.
constexpr float kSilentEnergy = 1e-6f;

// The synthesis window that undoes a Hamming analysis and leaves a triangle, whose halves sum to
// one.
SharedWindow triangleOverHamming(std::vector<float> const& hamming,
                                 std::vector<float> const& triangle) {
    auto window = std::make_shared<std::vector<float>>(triangle);
    for (std::size_t i = 0; i < window->size(); ++i) (*window)[i] /= hamming[i];
    return window;
}

// The queue's room in feature frames, for P frames of context.
std::size_t contextCapacity(SpectralParams const& params) {
    return (params.filtrEnd - params.filtrBegin) * (5 * params.previewFrames + 5);
}

}  // namespace

SpectralCleaner::SpectralCleaner(SpectralParams const& params, FeatureStatistics const& statistics,
                                 CONTAINERS::AnyMap& environment, Generation const& generation,
                                 Synthesis synthesis)
    : params_(params),
      statistics_(statistics),
      level_(generation.level),
      direction_(synthesis),
      transform_(sharedTransform(environment, params.frameLength)),
      context_(params.previewFrames, params.bands.bands(), contextCapacity(params)),
      shaper_(params),
      windowed_(params.frameLength),
      spectrum_(params.coefficientNumber),
      frame_(params.frameLength) {
    if (generation.windows == WindowPair::Vorbis) {
        analysis_ = synthesis_ = sharedVorbisWindow(environment, params.frameLength);
    } else {
        analysis_ = sharedHammingWindow(environment, params.frameLength);
        synthesis_ = triangleOverHamming(*analysis_,
                                         *sharedTriangularWindow(environment, params.frameLength));
    }
    features_.reserve(params.bands.bins());
    buildStatistics();
}

void SpectralCleaner::reset() {
    context_.reset();
    shaper_.reset();
    if (gate_) gate_->reset();
    if (meanEnergy_) meanEnergy_->reset();
    if (noiseMean_) noiseMean_->fillWithSilence();
}

void SpectralCleaner::buildStatistics() {
    if (params_.enableThreshCut) {
        gate_.emplace(kStatisticsFrames, params_.sampleRate * kGateSeconds / params_.frameLength,
                      params_.threshCutRefEn);
    }
    if (params_.enableRescale) {
        meanEnergy_.emplace(kStatisticsFrames, params_.sampleRate * kLevelSeconds / params_.step,
                            params_.rescaleRefEn, params_.rescaleRefAmpl * params_.rescaleRefAmpl);
    }
    if (level_ == LevelReference::RunningNoiseMean) {
        noiseMean_.emplace(kStatisticsFrames, params_.bands.bands());
        noiseMean_->fillWithSilence();
    }
}

float SpectralCleaner::levelGain(std::span<float const> in) {
    if (!meanEnergy_) return 1.0f;
    float const energy = meanEnergy_->setCurrentData(in.data(), in.size());
    return energy > kSilentEnergy ? params_.rescaleRefAmpl / std::sqrt(energy) : 1.0f;
}

void SpectralCleaner::analyse(std::span<float const> in, std::vector<float>& x) {
    UTIL_FUNCTIONS::multiply(in.data(), analysis_->data(), windowed_.data(), windowed_.size());
    if (gate_) gate_->setCurrentData(windowed_);
    transform_->computeForward(windowed_, spectrum_);
    NOISE_CLEANER_FUNCTIONS::calcFeatures(spectrum_, features_, levelGain(in), params_);
    if (noiseMean_) {
        noiseMean_->addFrameNoiseRemoveBack(features_.data(), features_.size());
        noiseMean_->calculateNoise();
        for (std::size_t k = 0; k < features_.size(); ++k) features_[k] -= noiseMean_->mean[k];
    }
    context_.push(features_, statistics_.mu, statistics_.sd, x);
}

void SpectralCleaner::synthesise(std::vector<float> const& mask, float floor) {
    bool const kept = direction_ == Synthesis::FromKept;
    for (std::size_t k = 0; k < spectrum_.size(); ++k) {
        float const gain = std::max(mask[k], floor);
        spectrum_[k] *= kept ? gain : 1.0f - gain;
    }
    transform_->computeBackward(spectrum_, frame_);
    if (kept) return;
    for (std::size_t i = 0; i < frame_.size(); ++i) frame_[i] = windowed_[i] - frame_[i];
}

void SpectralCleaner::applyMask(std::vector<float> const& mask, float floor) {
    auto& full = shaper_.shape(mask);
    if (gate_) gate_->applyEnThreshold(full);
    synthesise(full, floor);
    if (params_.volumeUp) {
        float const gain = 1.0f + params_.volumeUpPercent / 100.0f;
        for (float& sample : frame_) sample *= gain;
    }
}

void SpectralCleaner::finish(std::vector<float>& out) {
    out.resize(frame_.size());
    UTIL_FUNCTIONS::multiply(frame_.data(), synthesis_->data(), out.data(), out.size());
    if (params_.enableClipFix) NOISE_CLEANER_FUNCTIONS::applyClipFix(out, params_);
}

}  // namespace MORVA::NOISE_CANCELLER
