// Element-wise products over raw arrays. No state; any thread.
#pragma once

#include <cstddef>

namespace MORVA::UTIL_FUNCTIONS {

// out_i = a_i b_i for i < n; `out` may be either operand.
void multiply(float const* a, float const* b, float* out, std::size_t n);

}  // namespace MORVA::UTIL_FUNCTIONS
