#include "noise_canceller/frame_spectrum.h"

#include <algorithm>
#include <cmath>

#include "kernels/vector_math.h"
#include "noise_canceller/spectral_kernels.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// Frames that the energy statistics look back.
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

}  // namespace

FrameSpectrum::FrameSpectrum(FrameShape const& shape, FrameTunables const& tunables,
                             CONTAINERS::AnyMap& environment, WindowPair windows,
                             Synthesis synthesis)
    : tunables_(tunables),
      direction_(synthesis),
      transform_(sharedTransform(environment, shape.frameLength)),
      windowed_(shape.frameLength),
      spectrum_(shape.bins()),
      frame_(shape.frameLength) {
    if (windows == WindowPair::Vorbis) {
        analysis_ = synthesis_ = sharedVorbisWindow(environment, shape.frameLength);
    } else {
        analysis_ = sharedHammingWindow(environment, shape.frameLength);
        synthesis_ = triangleOverHamming(*analysis_,
                                         *sharedTriangularWindow(environment, shape.frameLength));
    }
    if (tunables.enableThreshCut) {
        gate_.emplace(kStatisticsFrames, shape.sampleRate * kGateSeconds / shape.frameLength,
                      tunables.threshCutRefEn);
    }
    if (tunables.enableRescale) {
        meanEnergy_.emplace(kStatisticsFrames, shape.sampleRate * kLevelSeconds / shape.step,
                            tunables.rescaleRefEn,
                            tunables.rescaleRefAmpl * tunables.rescaleRefAmpl);
    }
}

void FrameSpectrum::reset() {
    if (gate_) gate_->reset();
    if (meanEnergy_) meanEnergy_->reset();
}

std::vector<std::complex<float>> const& FrameSpectrum::analyse(std::span<float const> in) {
    UTIL_FUNCTIONS::multiply(in.data(), analysis_->data(), windowed_.data(), windowed_.size());
    if (gate_) gate_->setCurrentData(windowed_);
    transform_->computeForward(windowed_, spectrum_);
    return spectrum_;
}

float FrameSpectrum::levelGain(std::span<float const> in) {
    if (!meanEnergy_) return 1.0f;
    float const energy = meanEnergy_->setCurrentData(in.data(), in.size());
    return energy > kSilentEnergy ? tunables_.rescaleRefAmpl / std::sqrt(energy) : 1.0f;
}

void FrameSpectrum::synthesise(std::vector<float> const& mask, float floor) {
    bool const kept = direction_ == Synthesis::FromKept;
    for (std::size_t k = 0; k < spectrum_.size(); ++k) {
        float const gain = std::max(mask[k], floor);
        spectrum_[k] *= kept ? gain : 1.0f - gain;
    }
    transform_->computeBackward(spectrum_, frame_);
    if (kept) return;
    for (std::size_t i = 0; i < frame_.size(); ++i) frame_[i] = windowed_[i] - frame_[i];
}

void FrameSpectrum::applyMask(std::vector<float>& mask, float floor) {
    if (gate_) gate_->applyEnThreshold(mask);
    synthesise(mask, floor);
    if (tunables_.volumeUp) {
        float const gain = 1.0f + tunables_.volumeUpPercent / 100.0f;
        for (float& sample : frame_) sample *= gain;
    }
}

void FrameSpectrum::finish(std::vector<float>& out) {
    out.resize(frame_.size());
    UTIL_FUNCTIONS::multiply(frame_.data(), synthesis_->data(), out.data(), out.size());
    if (tunables_.enableClipFix) NOISE_CLEANER_FUNCTIONS::applyClipFix(out, tunables_);
}

}  // namespace MORVA::NOISE_CANCELLER
