// Analysis windows. Each writes exactly n values; `out` must have room for them. Values are
// computed in double and rounded once. Any thread.
#pragma once

#include <cstddef>

namespace MORVA::UTIL_FUNCTIONS {

// Symmetric: 0.08 at both ends. n == 1 gives NaN.
void generateHammingWindowVector(std::size_t n, float* out, std::size_t outSize);

// Power complementary at a hop of n / 2. Sampled without the usual half-sample offset: 0 at index
// 0, peak at n / 2. The trained weights were made with exactly this shape.
void generateVorbisWindowVector(std::size_t n, float* out, std::size_t outSize);

// Periodic triangle: 0 at index 0, peak at n / 2; an odd n ends in an extra 0.
void generateTriangularWindowVector(std::size_t n, float* out, std::size_t outSize);

}  // namespace MORVA::UTIL_FUNCTIONS
