// One model frame from samples to features and, with the network's mask, back to samples. The
// network runs between the two halves and belongs to the model class:
//
//   analyse(in, x)  window, FFT, level reference, band powers, log features, context
//   ... network: x from features to compressed mask ..
//   applyMask(x)    mask shaping, energy gate, inverse FFT, output gain: then there is a frame()
//   ... stages that work on the cleaned frame ..
//   finish(out)     synthesis window, peak limiter
#pragma once

#include <optional>
#include <span>
#include <vector>

#include "noise_canceller/feature_context.h"
#include "noise_canceller/feature_statistics.h"
#include "noise_canceller/frame_spectrum.h"
#include "noise_canceller/mask_shaper.h"
#include "noise_canceller/spectral_params.h"
#include "statistics/noise.h"

namespace MORVA::NOISE_CANCELLER {

class SpectralCleaner {
public:
    // `params` and `statistics` (indexed modulo their length) must outlive this object.
    SpectralCleaner(SpectralParams const& params, FeatureStatistics const& statistics,
                    CONTAINERS::AnyMap& environment, Generation const& generation,
                    Synthesis synthesis);

    // Back to the state after construction; allocates nothing.
    void reset();

    // `in` holds FrameLength samples; `x` receives the network's input.
    void analyse(std::span<float const> in, std::vector<float>& x);
    // `mask` holds one value per band. No bin is multiplied by less than `floor`, which the mask
    // that the next frame is smoothed against does not see.
    void applyMask(std::vector<float> const& mask, float floor) {
        spectrum_.applyMask(shaper_.shape(mask), floor);
    }
    std::vector<float>& frame() { return spectrum_.frame(); }
    void finish(std::vector<float>& out) { spectrum_.finish(out); }

    std::vector<float> const& synthesisWindow() const { return spectrum_.synthesisWindow(); }

private:
    SpectralParams const& params_;
    FeatureStatistics const& statistics_;
    FrameSpectrum spectrum_;
    std::optional<UTILS::Noise> noiseMean_;
    FeatureContext context_;
    MaskShaper shaper_;
    std::vector<float> features_;
};

}  // namespace MORVA::NOISE_CANCELLER
