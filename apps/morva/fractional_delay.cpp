#include "fractional_delay.h"

#include <algorithm>
#include <cmath>
#include <numbers>
#include <numeric>

namespace morva::cli {
namespace {

constexpr int reach = 48;            // taps to each side
constexpr double beta = 8.0;         // of the window: ripples below -80 dB
constexpr double negligible = 1e-6;  // samples

double sinc(double x) {
    return std::abs(x) < negligible ? 1.0 : std::sin(std::numbers::pi * x) / (std::numbers::pi * x);
}

// For -1..1. The Bessel function that it is made of, as a series: not every C++ library has it.
double kaiser(double x) {
    double const square = beta * beta * std::max(0.0, 1.0 - x * x) / 4.0;
    double sum = 1.0;
    double term = 1.0;
    for (int k = 1; term > 1e-17 * sum; ++k) sum += term *= square / (k * k);
    return sum;
}

// Delay by reach - fraction.
std::vector<float> tapsFor(double fraction) {
    std::vector<double> exact(std::size_t{2} * reach);
    for (std::size_t i = 0; i < exact.size(); ++i) {
        double const at = static_cast<double>(i) - reach + fraction;
        exact[i] = sinc(at) * kaiser(at / reach);
    }
    double const sum = std::reduce(exact.begin(), exact.end());
    std::vector<float> taps(exact.size());
    std::ranges::transform(exact, taps.begin(),
                           [sum](double tap) { return static_cast<float>(tap / sum); });
    return taps;
}

}  // namespace

FractionalDelay::FractionalDelay(double delay) : wholeDelay_(std::llround(delay)) {
    if (std::abs(delay - static_cast<double>(wholeDelay_)) < negligible) {
        taps_ = {1.0F};
        return;
    }
    auto const below = std::floor(delay);
    taps_ = tapsFor(delay - below);
    wholeDelay_ = static_cast<std::int64_t>(below) + reach;
    window_.resize(taps_.size() - 1);
}

void FractionalDelay::push(std::span<float const> in, std::vector<float>& out) {
    window_.insert(window_.end(), in.begin(), in.end());
    auto const start = out.size();
    out.resize(start + in.size());
    auto* const result = out.data() + start;
    for (std::size_t tap = 0; tap < taps_.size(); ++tap) {
        float const weight = taps_[tap];
        float const* const heard = window_.data() + taps_.size() - 1 - tap;
        for (std::size_t i = 0; i < in.size(); ++i) result[i] += weight * heard[i];
    }
    window_.erase(window_.begin(), window_.begin() + static_cast<std::ptrdiff_t>(in.size()));
}

}  // namespace morva::cli
