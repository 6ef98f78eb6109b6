// Turns the network's compressed mask into the full mask that the spectrum is multiplied by:
// expansion to bins, squaring, smoothing over time, expansion of low values.
#pragma once

#include <vector>

#include "noise_canceller/spectral_params.h"

namespace MORVA::NOISE_CANCELLER {

class MaskShaper {
public:
    explicit MaskShaper(SpectralParams const& params);

    // Forgets the previous mask.
    void reset();

    // `compressed` holds one value per band; the result one per bin of the spectrum, zero outside
    // the model's band. The result is also the mask that the next frame is smoothed against, so
    // whoever changes it in place (the energy gate) changes what is remembered.
    std::vector<float>& shape(std::vector<float> const& compressed);

private:
    void sharpen();
    void smooth();

    SpectralParams const& params_;
    std::vector<float> expanded_;
    std::vector<float> current_;
    std::vector<float> applied_;  // the previous frame's final mask
};

}  // namespace MORVA::NOISE_CANCELLER
