#include "noise_canceller/spectral_kernels.h"

#include <algorithm>
#include <cmath>

#include "kernels/elementary.h"
#include "noise_canceller/spectral_params.h"

namespace MORVA::NOISE_CANCELLER::NOISE_CLEANER_FUNCTIONS {

void calcRescaleAbsAndFiltr(std::vector<std::complex<float>> const& spectrum,
                            std::vector<float>& out, float gain, SpectralParams const& params) {
    std::size_t const bins = params.filtrEnd - params.filtrBegin;
    out.resize(bins);
    auto const* const band = spectrum.data() + params.filtrBegin;
    for (std::size_t k = 0; k < bins; ++k) {
        // A spectrum of 16-bit samples is far from the overflow that hypot would guard against.
        float const re = band[k].real();
        float const im = band[k].imag();
        float const magnitude = std::sqrt(re * re + im * im) * gain;
        out[k] = magnitude * magnitude;
    }
}

void calcFeatures(std::vector<std::complex<float>> const& spectrum, std::vector<float>& out,
                  float gain, SpectralParams const& params) {
    constexpr float kFeatureOffset = 1000.0f;  // keeps the logarithm of silent bands finite
    calcRescaleAbsAndFiltr(spectrum, out, gain, params);
    params.bands.compress(out);
    for (float& value : out) value += kFeatureOffset;
    UTILS::logarithms(out);
}

void applyClipFix(std::vector<float>& frame, FrameTunables const& tunables) {
    if (frame.empty()) return;
    float const peak = *std::max_element(frame.begin(), frame.end());
    if (!(peak > tunables.clipFixPoint)) return;
    float const scale = tunables.clipFixPoint / peak;
    for (float& sample : frame) sample *= scale;
}

}  // namespace MORVA::NOISE_CANCELLER::NOISE_CLEANER_FUNCTIONS
