// One model frame from samples to features and, with the network's mask, back to samples. The
// network runs between the two halves and belongs to the model class:
//
//   analyse(in, x)  window, FFT, level reference, band powers, log features, context
//   ... network: x from features to compressed mask ..
//   applyMask(x)    mask shaping, energy gate, inverse FFT, output gain: then there is a frame()
//   ... stages that work on the cleaned frame ..
//   finish(out)     synthesis window, peak limiter
//
// Samples are on the 16-bit scale. Windows and transform are shared and only read.
#pragma once

#include <complex>
#include <optional>
#include <span>
#include <vector>

#include "noise_canceller/feature_context.h"
#include "noise_canceller/feature_statistics.h"
#include "noise_canceller/mask_shaper.h"
#include "noise_canceller/shared_objects.h"
#include "noise_canceller/spectral_params.h"
#include "statistics/en_threshold.h"
#include "statistics/mean_energy.h"
#include "statistics/noise.h"

namespace MORVA::NOISE_CANCELLER {

// How the masked spectrum becomes a frame: transformed back as it is, which makes silence of a mask
// of 0 exact; or as the windowed input less the transform of what the mask takes away, which makes
// a mask of 1 exact (what is measured as removed is then not the transforms' rounding).
enum class Synthesis { FromKept, FromRemoved };

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
    void applyMask(std::vector<float> const& mask, float floor);
    // The cleaned frame between applyMask and finish.
    std::vector<float>& frame() { return frame_; }
    void finish(std::vector<float>& out);

    // The window that the cleaned frame goes through.
    std::vector<float> const& synthesisWindow() const { return *synthesis_; }

private:
    void buildStatistics();
    void synthesise(std::vector<float> const& mask, float floor);
    float levelGain(std::span<float const> in);

    SpectralParams const& params_;
    FeatureStatistics const& statistics_;
    LevelReference level_;
    Synthesis direction_;
    SharedWindow analysis_;
    SharedWindow synthesis_;
    SharedTransform transform_;

    std::optional<UTILS::EnThreshold> gate_;
    std::optional<UTILS::MeanEnergy> meanEnergy_;
    std::optional<UTILS::Noise> noiseMean_;
    FeatureContext context_;
    MaskShaper shaper_;

    std::vector<float> windowed_;
    std::vector<std::complex<float>> spectrum_;
    std::vector<float> features_;
    std::vector<float> frame_;
};

}  // namespace MORVA::NOISE_CANCELLER
