#include "noise_canceller/spectral_cleaner.h"

#include "noise_canceller/spectral_kernels.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// Frames that the running noise mean looks back.
constexpr std::size_t kNoiseFrames = 10;

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
      spectrum_(params, params, environment, generation.windows, synthesis),
      context_(params.previewFrames, params.bands.bands(), contextCapacity(params)),
      shaper_(params) {
    features_.reserve(params.bands.bins());
    if (generation.level == LevelReference::RunningNoiseMean) {
        noiseMean_.emplace(kNoiseFrames, params_.bands.bands());
        noiseMean_->fillWithSilence();
    }
}

void SpectralCleaner::reset() {
    spectrum_.reset();
    context_.reset();
    shaper_.reset();
    if (noiseMean_) noiseMean_->fillWithSilence();
}

void SpectralCleaner::analyse(std::span<float const> in, std::vector<float>& x) {
    auto const& spectrum = spectrum_.analyse(in);
    NOISE_CLEANER_FUNCTIONS::calcFeatures(spectrum, features_, spectrum_.levelGain(in), params_);
    if (noiseMean_) {
        noiseMean_->addFrameNoiseRemoveBack(features_.data(), features_.size());
        noiseMean_->calculateNoise();
        for (std::size_t k = 0; k < features_.size(); ++k) features_[k] -= noiseMean_->mean[k];
    }
    context_.push(features_, statistics_.mu, statistics_.sd, x);
}

}  // namespace MORVA::NOISE_CANCELLER
