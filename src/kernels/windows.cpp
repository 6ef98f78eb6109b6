#include "kernels/windows.h"

#include <cmath>
#include <numbers>

namespace MORVA::UTIL_FUNCTIONS {
namespace {

constexpr double kPi = std::numbers::pi;

}  // namespace

void generateHammingWindowVector(std::size_t n, float* out, std::size_t) {
    double const step = 2.0 * kPi / (static_cast<double>(n) - 1.0);
    for (std::size_t i = 0; i < n; ++i) {
        out[i] = static_cast<float>(0.54 - 0.46 * std::cos(static_cast<double>(i) * step));
    }
}

void generateVorbisWindowVector(std::size_t n, float* out, std::size_t) {
    double const step = kPi / static_cast<double>(n);
    for (std::size_t i = 0; i < n; ++i) {
        double const s = std::sin(static_cast<double>(i) * step);
        out[i] = static_cast<float>(std::sin(kPi / 2.0 * s * s));
    }
}

void generateTriangularWindowVector(std::size_t n, float* out, std::size_t) {
    std::size_t const half = n / 2;
    for (std::size_t i = 0; i < half; ++i) {
        float const rise = static_cast<float>(static_cast<double>(i + i) / static_cast<double>(n));
        out[i] = rise;
        out[half + i] = 1.0f - rise;
    }
    if (n % 2 == 1) out[n - 1] = 0.0f;
}

}  // namespace MORVA::UTIL_FUNCTIONS
