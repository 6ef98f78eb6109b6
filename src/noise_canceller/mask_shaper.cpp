#include "noise_canceller/mask_shaper.h"

#include <algorithm>
#include <cmath>

namespace MORVA::NOISE_CANCELLER {
namespace {

// A soft switch at 0.05: keeps smaller values, squares larger ones.
float softSquare(float value) {
    double const m = value;
    double const t = (m - 0.05) / 0.05;
    return static_cast<float>(m / (1.0 + std::exp(t)) + m * m / (1.0 + std::exp(-3.0 * t)));
}

}  // namespace

MaskShaper::MaskShaper(SpectralParams const& params)
    : params_(params),
      expanded_(params.bands.bins()),
      current_(params.coefficientNumber),
      applied_(params.coefficientNumber) {}

void MaskShaper::reset() {
    std::fill(applied_.begin(), applied_.end(), 0.0f);
}

std::vector<float>& MaskShaper::shape(std::vector<float> const& compressed) {
    params_.bands.expand(compressed, expanded_);
    std::copy(expanded_.begin(), expanded_.end(),
              current_.begin() + static_cast<std::ptrdiff_t>(params_.filtrBegin));
    sharpen();
    smooth();
    if (params_.enableRmThreshold) {
        for (float& value : applied_) {
            if (value < params_.rmThreshold) value = value * value / params_.rmThreshold;
        }
    }
    return applied_;
}

// Outside the band current_ stays zero for ever: zero is a fixed point of every step here.
void MaskShaper::sharpen() {
    auto const first = current_.begin() + static_cast<std::ptrdiff_t>(params_.filtrBegin);
    auto const last = current_.begin() + static_cast<std::ptrdiff_t>(params_.filtrEnd);
    if (params_.smootRmModify) {
        std::transform(first, last, first, softSquare);
    } else {
        std::transform(first, last, first, [](float m) { return m * m; });
    }
    if (params_.highFreqSmoot) {
        for (std::size_t i = current_.size() / 2; i < current_.size(); ++i)
            current_[i] *= current_[i];
    }
}

void MaskShaper::smooth() {
    float const c = params_.smootCoef;
    if (c == 1.0f) {
        std::copy(current_.begin(), current_.end(), applied_.begin());
        return;
    }
    for (std::size_t i = 0; i < applied_.size(); ++i) {
        applied_[i] = (1.0f - c) * applied_[i] + c * current_[i];
    }
}

}  // namespace MORVA::NOISE_CANCELLER
