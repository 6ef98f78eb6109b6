// Element-wise products and sums over raw arrays. No state; any thread.
#pragma once

#include <array>
#include <cstddef>
#include <span>
#include <vector>

namespace MORVA::UTILS {

// The sum of square(x) over the samples, in double and in a fixed order of eight interleaved
// partial sums: the same value from run to run, and two vector registers wide. `square` maps a
// sample to its square as a double.
template <class Square>
double sumOver(std::span<float const> samples, Square square) {
    constexpr std::size_t kLanes = 8;
    std::array<double, kLanes> partial{};
    std::size_t const whole = samples.size() - samples.size() % kLanes;
    for (std::size_t i = 0; i < whole; i += kLanes) {
        for (std::size_t lane = 0; lane < kLanes; ++lane)
            partial[lane] += square(samples[i + lane]);
    }
    for (std::size_t i = whole; i < samples.size(); ++i) partial[i - whole] += square(samples[i]);
    return ((partial[0] + partial[4]) + (partial[1] + partial[5])) +
           ((partial[2] + partial[6]) + (partial[3] + partial[7]));
}

// Energy of a block: products in double.
inline double sumOfSquares(std::span<float const> samples) {
    return sumOver(samples, [](float x) { return static_cast<double>(x) * x; });
}

}  // namespace MORVA::UTILS

namespace MORVA::UTIL_FUNCTIONS {

// out_i = a_i b_i for i < n; `out` may be either operand.
void multiply(float const* a, float const* b, float* out, std::size_t n);

// sqrt(mean of the squares) + 1e-6: never 0, so that callers may divide by it. Squares are rounded
// to float and summed in double. An empty vector gives NaN.
float vectorRMS(std::vector<float> const& v);

}  // namespace MORVA::UTIL_FUNCTIONS
