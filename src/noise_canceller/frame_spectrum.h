// A model frame from samples to its spectrum and, under a mask, back to samples: what all noise
// cleaners do around their network.
//
//   analyse(in)        window, FFT
//   levelGain(in)      what brings the level of the active frames to the reference
//   applyMask(mask)    energy gate, inverse FFT, output gain: then there is a frame()
//   finish(out)        synthesis window, peak limiter
//
// Samples are on the 16-bit scale. Windows and transform are shared and only read.
#pragma once

#include <complex>
#include <optional>
#include <span>
#include <vector>

#include "noise_canceller/frame_params.h"
#include "noise_canceller/shared_objects.h"
#include "statistics/en_threshold.h"
#include "statistics/mean_energy.h"

namespace MORVA::NOISE_CANCELLER {

// How the masked spectrum becomes a frame: transformed back as it is, which makes silence of a mask
// of 0 exact; or as the windowed input less the transform of what the mask takes away, which makes
// a mask of 1 exact (what is measured as removed is then not the transforms' rounding).
enum class Synthesis { FromKept, FromRemoved };

class FrameSpectrum {
public:
    // `tunables` must outlive this object.
    FrameSpectrum(FrameShape const& shape, FrameTunables const& tunables,
                  CONTAINERS::AnyMap& environment, WindowPair windows, Synthesis synthesis);

    // Back to the state after construction; allocates nothing.
    void reset();

    // `in` holds FrameLength samples; the result one bin more than half as many.
    std::vector<std::complex<float>> const& analyse(std::span<float const> in);
    float levelGain(std::span<float const> in);

    // `mask` holds one value per bin; the gate changes it in place. No bin is multiplied by less
    // than `floor`.
    void applyMask(std::vector<float>& mask, float floor);
    // The cleaned frame between applyMask and finish.
    std::vector<float>& frame() { return frame_; }
    void finish(std::vector<float>& out);

    // The window that the cleaned frame goes through.
    std::vector<float> const& synthesisWindow() const { return *synthesis_; }

private:
    void synthesise(std::vector<float> const& mask, float floor);

    FrameTunables const& tunables_;
    Synthesis direction_;
    SharedWindow analysis_;
    SharedWindow synthesis_;
    SharedTransform transform_;

    std::optional<UTILS::EnThreshold> gate_;
    std::optional<UTILS::MeanEnergy> meanEnergy_;

    std::vector<float> windowed_;
    std::vector<std::complex<float>> spectrum_;
    std::vector<float> frame_;
};

}  // namespace MORVA::NOISE_CANCELLER
