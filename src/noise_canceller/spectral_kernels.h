// Small kernels that every noise cleaner runs. No state; any thread.
#pragma once

#include <complex>
#include <vector>

namespace MORVA::NOISE_CANCELLER {

struct FrameTunables;
struct SpectralParams;

namespace NOISE_CLEANER_FUNCTIONS {

// Band power: out_k = (|X_k| gain)^2 for the bins FiltrBegin <= k < FiltrEnd.
void calcRescaleAbsAndFiltr(std::vector<std::complex<float>> const& spectrum,
                            std::vector<float>& out, float gain, SpectralParams const& params);

// Features: log(P_k + 1000) of the band powers P_k after compression, one value per band.
void calcFeatures(std::vector<std::complex<float>> const& spectrum, std::vector<float>& out,
                  float gain, SpectralParams const& params);

// Peak limiter: scales the frame so that its most positive sample is the clip point when it is
// above. Negative peaks are not considered.
void applyClipFix(std::vector<float>& frame, FrameTunables const& tunables);

}  // namespace NOISE_CLEANER_FUNCTIONS
}  // namespace MORVA::NOISE_CANCELLER
