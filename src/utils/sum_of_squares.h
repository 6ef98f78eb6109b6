// Sums of squares in double, in a fixed order of eight interleaved partial sums: the same value
// from run to run, and two vector registers wide.
#pragma once

#include <array>
#include <cstddef>
#include <span>

namespace MORVA::UTILS {

// `square` maps a float sample to its square as a double.
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
