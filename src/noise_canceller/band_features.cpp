#include "noise_canceller/band_features.h"

#include <algorithm>
#include <cmath>

#include "kernels/elementary.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr float kFeatureOffset = 1000.0f;  // keeps the logarithm of silent bands finite

}  // namespace

BandFeatures::BandFeatures(BandLayout const& layout, std::size_t kinds)
    : layout_(layout),
      before_(kinds > 1 ? layout.bins() : 0),
      power_(layout.bands()),
      powerBefore_(layout.bands()),
      features_(kinds * layout.bands()) {}

void BandFeatures::reset() {
    std::fill(before_.begin(), before_.end(), 0.0f);
    std::fill(power_.begin(), power_.end(), 0.0f);
}

std::span<float const> BandFeatures::of(std::span<std::complex<float> const> spectrum, float gain) {
    std::size_t const bands = power_.size();
    power_.swap(powerBefore_);
    layout_.forEachBand([&](std::size_t band, std::size_t first, std::size_t last) {
        float sum = 0.0f;
        for (std::size_t k = first; k < last; ++k) {
            float const re = spectrum[k].real();
            float const im = spectrum[k].imag();
            sum += re * re + im * im;
        }
        power_[band] = sum;
        features_[band] = sum * (gain * gain) + kFeatureOffset;
    });
    UTILS::logarithms({features_.data(), bands});
    if (!before_.empty()) addTurn(spectrum, kFeatureOffset / (gain * gain));
    return features_;
}

void BandFeatures::addTurn(std::span<std::complex<float> const> spectrum, float offset) {
    std::size_t const bands = power_.size();
    layout_.forEachBand([&](std::size_t band, std::size_t first, std::size_t last) {
        float sumRe = 0.0f;
        float sumIm = 0.0f;
        for (std::size_t k = first; k < last; ++k) {
            // In a hop the centre of a bin turns by as many half circles as its number says.
            float const sign = k % 2 == 0 ? 1.0f : -1.0f;
            float const re = spectrum[k].real();
            float const im = spectrum[k].imag();
            float const pastRe = before_[k].real() * sign;
            float const pastIm = before_[k].imag() * sign;
            sumRe += re * pastRe + im * pastIm;
            sumIm += im * pastRe - re * pastIm;
        }
        float const power = (power_[band] + offset) * (powerBefore_[band] + offset);
        float const scale = 1.0f / std::sqrt(power);
        features_[bands + band] = sumRe * scale;
        features_[2 * bands + band] = sumIm * scale;
    });
    std::copy_n(spectrum.begin(), before_.size(), before_.begin());
}

double BandFeatures::powerOf(std::span<float const> shares) const {
    double sum = 0.0;
    for (std::size_t b = 0; b < shares.size(); ++b) {
        sum += static_cast<double>(shares[b]) * static_cast<double>(power_[b]);
    }
    return sum;
}

}  // namespace MORVA::NOISE_CANCELLER
