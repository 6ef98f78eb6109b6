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
      powerBefore_(layout.bands()),
      features_(kinds * layout.bands()) {
    for (auto* const values : {&power_, &real_, &imaginary_}) values->reserve(layout.bins());
}

void BandFeatures::reset() {
    std::fill(before_.begin(), before_.end(), 0.0f);
    std::fill(powerBefore_.begin(), powerBefore_.end(), 0.0f);
}

std::span<float const> BandFeatures::of(std::span<std::complex<float> const> spectrum, float gain) {
    power_.resize(layout_.bins());
    for (std::size_t k = 0; k < power_.size(); ++k) {
        float const re = spectrum[k].real();
        float const im = spectrum[k].imag();
        power_[k] = re * re + im * im;
    }
    layout_.compress(power_);
    std::size_t const bands = power_.size();
    for (std::size_t b = 0; b < bands; ++b)
        features_[b] = power_[b] * (gain * gain) + kFeatureOffset;
    UTILS::logarithms({features_.data(), bands});
    if (!before_.empty()) addTurn(spectrum, kFeatureOffset / (gain * gain));
    return features_;
}

void BandFeatures::addTurn(std::span<std::complex<float> const> spectrum, float offset) {
    real_.resize(before_.size());
    imaginary_.resize(before_.size());
    float centre = 1.0f;  // of a bin: in a hop it turns by so many halves of a circle as its number
    for (std::size_t k = 0; k < before_.size(); ++k, centre = -centre) {
        float const re = spectrum[k].real();
        float const im = spectrum[k].imag();
        float const pastRe = before_[k].real() * centre;
        float const pastIm = before_[k].imag() * centre;
        real_[k] = re * pastRe + im * pastIm;
        imaginary_[k] = im * pastRe - re * pastIm;
        before_[k] = spectrum[k];
    }
    layout_.compress(real_);
    layout_.compress(imaginary_);
    std::size_t const bands = power_.size();
    for (std::size_t b = 0; b < bands; ++b) {
        float const scale = 1.0f / std::sqrt((power_[b] + offset) * (powerBefore_[b] + offset));
        features_[bands + b] = real_[b] * scale;
        features_[2 * bands + b] = imaginary_[b] * scale;
        powerBefore_[b] = power_[b];
    }
}

double BandFeatures::powerOf(std::span<float const> shares) const {
    double sum = 0.0;
    for (std::size_t b = 0; b < shares.size(); ++b) {
        sum += static_cast<double>(shares[b]) * static_cast<double>(power_[b]);
    }
    return sum;
}

}  // namespace MORVA::NOISE_CANCELLER
