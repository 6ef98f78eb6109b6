// Products and sums over raw arrays. No state; any thread.
#pragma once

#include <cstddef>
#include <span>
#include <vector>

namespace MORVA::UTILS {

// Energy of a block: products in double, summed in double in a fixed order.
double sumOfSquares(std::span<float const> samples);

// The sum of a_i b_i for i < n, a multiple of 8, in single precision and in a fixed order.
float dotProduct(float const* a, float const* b, std::size_t n);

}  // namespace MORVA::UTILS

namespace MORVA::UTIL_FUNCTIONS {

// out_i = a_i b_i for i < n; `out` may be either operand.
void multiply(float const* a, float const* b, float* out, std::size_t n);

// sqrt(mean of the squares) + 1e-6: never 0, so that callers may divide by it. Squares are rounded
// to float and summed in double. An empty vector gives NaN.
float vectorRMS(std::vector<float> const& v);

}  // namespace MORVA::UTIL_FUNCTIONS
